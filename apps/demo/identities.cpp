#include "identities.h"

#include <crypt.h>

#include <stdexcept>

#include "base/random.h"

namespace orvel::demo {
namespace {

// Out of the way of a machine's own users, and of each other.
constexpr uid_t kAlice = 30001, kBob = 30002, kAdmin = 30003;
constexpr gid_t kUsers = 30100, kAdministrators = 30101;

std::string hashed(const std::string& password) {
    crypt_data data = {};
    char salt[CRYPT_GENSALT_OUTPUT_SIZE];
    const char* setting = crypt_gensalt_rn("$6$", 0, nullptr, 0, salt, sizeof salt);
    const char* hash = setting != nullptr ? crypt_r(password.c_str(), setting, &data) : nullptr;
    if (hash == nullptr || hash[0] == '*') throw std::runtime_error("a password could not be hashed");
    return hash;
}

}  // namespace

Identities identitiesFor(uid_t maker, gid_t makerGroup) {
    if (maker == 0) return {true, kAlice, kBob, kAdmin, kUsers, kAdministrators};
    // Membership of the administrators must not come with the group that all share.
    return {false, maker, maker, maker, makerGroup, kAdministrators};
}

std::vector<Person> people(const Identities& ids) {
    return {{"alice", "read-write on most shares", ids.alice, randomDigits()},
            {"bob", "read-only on some, shut out of projects", ids.bob, randomDigits()},
            {"admin", "administrator", ids.admin, randomDigits()}};
}

std::string passwdText(const Identities& ids, const std::vector<Person>& people) {
    std::string text = ids.real ? "root:x:0:0::/root:/usr/sbin/nologin\n" : "";
    for (const Person& person : people) {
        text += person.name + ":x:" + std::to_string(person.uid) + ":" + std::to_string(ids.users) + ":" +
                person.about + ":/nonexistent:/usr/sbin/nologin\n";
    }
    return text;
}

std::string groupText(const Identities& ids, const std::vector<Person>& people) {
    std::string members;
    for (const Person& person : people) members += (members.empty() ? "" : ",") + person.name;
    return std::string(ids.real ? "root:x:0:\n" : "") + "users:x:" + std::to_string(ids.users) + ":" + members +
           "\nadministrators:x:" + std::to_string(ids.administrators) + ":admin\n";
}

std::string shadowText(const std::vector<Person>& people) {
    std::string text;
    for (const Person& person : people) text += person.name + ":" + hashed(person.password) + ":19000:0:99999:7:::\n";
    return text;
}

std::string loginText(const std::vector<Person>& people) {
    std::string text;
    for (const Person& person : people) text += person.name + ":" + hashed(person.password) + "\n";
    return text;
}

std::string randomDigits() {
    std::string digits = draw<6>();
    if (digits.empty()) throw std::runtime_error("no random numbers");
    return digits;
}

}  // namespace orvel::demo
