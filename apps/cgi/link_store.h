// The link database: which paths are published under which identifiers. The library only reads it.
#ifndef ORVEL_CGI_LINK_STORE_H
#define ORVEL_CGI_LINK_STORE_H

#include <sys/types.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

struct sqlite3;

namespace orvel::cgi {

// One row. Dates are seconds since 1970; see OrvelLogin::IsLinkOpen for what they mean.
struct Link {
    std::string id;
    std::string owner;
    uid_t uid = 0;             // of the owner, so that an account made anew under the name is another one
    std::string path;          // share-relative, as the owner names it
    std::string passwordHash;  // "" for none
    std::int64_t available = 0;
    std::int64_t expires = 0;
    std::int64_t created = 0;
};

// Its operations answer whether the database could be used; error() then says why not. Everything happens as root where
// the process can become root: the file holds hashes of passwords and is root's alone.
class LinkStore {
 public:
    LinkStore();
    ~LinkStore();
    LinkStore(const LinkStore&) = delete;
    LinkStore& operator=(const LinkStore&) = delete;

    // Adds a link under a new identifier, which it fills in with the time; the database is made when missing.
    [[nodiscard]] bool add(Link& link);
    // The link with this identifier; empty when there is none.
    [[nodiscard]] bool find(const std::string& id, std::optional<Link>& link);
    // All links of `owner`, or of everybody for "", the oldest first.
    [[nodiscard]] bool list(const std::string& owner, std::vector<Link>& links);
    // Removes a link; `owner` other than "" must be its own. `removed` tells whether there was one.
    [[nodiscard]] bool remove(const std::string& id, const std::string& owner, bool& removed);

    [[nodiscard]] const std::string& error() const { return error_; }

 private:
    bool open(bool make);
    bool fail();
    bool query(const char* sql, const std::string& value, std::vector<Link>& links);

    sqlite3* database_ = nullptr;
    std::string error_;
};

// What is stored of a password, "" when none can be made of it (longer than 511 bytes).
std::string hashPassword(const std::string& password);
bool passwordMatches(const std::string& password, const std::string& hash);

// Whether the owner is still there under his id, and his account has not ended.
bool ownerIsThere(const Link& link);

// Where a visitor opens the link: the appliance's outside address and the program, or without an address the program.
std::string linkAddress(const std::string& id);

}  // namespace orvel::cgi

#endif
