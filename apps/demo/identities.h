// The people of the demo appliance.
#ifndef ORVEL_DEMO_IDENTITIES_H
#define ORVEL_DEMO_IDENTITIES_H

#include <sys/types.h>

#include <string>
#include <vector>

namespace orvel::demo {

struct Person {
    std::string name;
    std::string about;
    uid_t uid;
    std::string password;
};

// Made by root, everybody has ids of his own; made by anybody else, all are that user, and switching to one of them
// changes nothing.
struct Identities {
    bool real;
    uid_t alice, bob, admin;
    gid_t users, administrators;
};
Identities identitiesFor(uid_t maker, gid_t makerGroup);

// alice, bob and admin, with fresh random passwords.
std::vector<Person> people(const Identities& ids);

// The files that describe them: passwd(5), group(5), shadow(5), and the web server's list of names and crypt(3) hashes.
std::string passwdText(const Identities& ids, const std::vector<Person>& people);
std::string groupText(const Identities& ids, const std::vector<Person>& people);
std::string shadowText(const std::vector<Person>& people);
std::string loginText(const std::vector<Person>& people);

// Twelve random hexadecimal digits.
std::string randomDigits();

}  // namespace orvel::demo

#endif
