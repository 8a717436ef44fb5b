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
    std::int64_t lastUse = 0;  // when the last one was; 0: never
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
    // Removes a link; `owner` other than "" must be its own. `removed` says whether there was one.
    [[nodiscard]] bool remove(const std::string& id, const std::string& owner, bool& removed);

    [[nodiscard]] const std::string& error() const;

 private:
    struct Impl;
    std::unique_ptr<Impl> impl_;
};

}  // namespace VEXO

#endif
