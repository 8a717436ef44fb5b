// The link database: which paths are published under which identifiers.
#ifndef VEXO_LINK_STORE_H
#define VEXO_LINK_STORE_H

#include <sys/types.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "vexo/export.h"

namespace VEXO {

// A name of the appliance's own. The library reads the table "sharingLinks" there by VEXODBConnect.
inline constexpr const char* kLinkDatabase = "/usr/vexo/etc/pexlander/pxsharing.db";

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
    std::string note{};        // of its owner, for himself
    std::int64_t most = 0;     // downloads; 0: any number
    std::int64_t used = 0;     // downloads that were begun
    std::int64_t lastUse = 0;  // when the last one was, or a file was received; 0: never
    // By a link that receives, visitors send files into `path` and see nothing. The library never meets one.
    bool receives = false;
    std::string folder{};  // which folder it is (see apps/cgi/target.h), whatever bears its name later
    std::int64_t mostFiles = 0, mostBytes = 0;
    std::int64_t files = 0, bytes = 0;  // received
};

// What a visitor sent by a link that receives.
struct SentFile {
    std::string name;  // that it has got
    std::string address;
    std::int64_t size = 0;
    std::int64_t time = 0;
};

enum class LinkTaking {
    kTaken,   // counted, or a part of one that was
    kUsedUp,  // as many were begun as may be
    kGone     // no such link any more
};

// Its operations answer whether the database could be used; error() then says why not. Everything happens as root where
// the process can become root: the file holds hashes of passwords and is root's alone. A file that is not regular, has
// a second name, belongs neither to root nor to the effective user, or can be written by others is not used.
class VEXO_API LinkStore {
 public:
    LinkStore();
    ~LinkStore();
    LinkStore(const LinkStore&) = delete;
    LinkStore& operator=(const LinkStore&) = delete;

    // Adds a link under a new identifier, which it fills in with the time. The database is made when missing: it has
    // its name only once it can be read.
    [[nodiscard]] bool add(Link& link);
    // The link with this identifier; empty when there is none.
    [[nodiscard]] bool find(const std::string& id, std::optional<Link>& link);
    // All links of `owner`, or of everybody for "", the oldest first.
    [[nodiscard]] bool list(const std::string& owner, std::vector<Link>& links);
    // Changes a link of `owner` in one step: `edit` gets it as it is and answers whether to store what it made of its
    // password, dates, note and limit. `link` is then the link; empty when there is none.
    [[nodiscard]] bool change(const std::string& id, const std::string& owner, const std::function<bool(Link&)>& edit,
                              std::optional<Link>& link);
    // Counts a download, unless the link's limit is reached: many at once never exceed it. `partly`: what `who` took of
    // `what` within the last hour counts as one.
    [[nodiscard]] bool take(const std::string& id, const std::string& who, const std::string& what, bool partly,
                            LinkTaking& taking);
    // Begins to receive a file: `link` is what the link is now, empty when it is gone. From here to endReceiving() or
    // the end of the object nobody changes or revokes it, so it must not take long.
    [[nodiscard]] bool beginReceiving(const std::string& id, std::optional<Link>& link);
    // The file has its name: it is counted and listed. Without this nothing has happened.
    [[nodiscard]] bool endReceiving(const std::string& id, const SentFile& file);
    // What was sent by a link of `owner`, the last first.
    [[nodiscard]] bool listSent(const std::string& id, const std::string& owner, std::int64_t offset,
                                std::int64_t limit, std::vector<SentFile>& files);
    // Removes a link; `owner` other than "" must be its own. `removed` says whether there was one.
    [[nodiscard]] bool remove(const std::string& id, const std::string& owner, bool& removed);

    [[nodiscard]] const std::string& error() const;

 private:
    struct Impl;
    std::unique_ptr<Impl> impl_;
};

}  // namespace VEXO

#endif
