// Small pictures that were made before. They lie below the system's root in folders that are root's alone, so that no
// user can put anything there; whoever reads one has opened its source as the user first.
#ifndef ORVEL_CGI_THUMBNAIL_CACHE_H
#define ORVEL_CGI_THUMBNAIL_CACHE_H

#include <optional>
#include <string>
#include <string_view>

#include "base/descriptor.h"

namespace orvel::cgi {

// The name under which the small picture of what is open is kept: the file system, inode, change time and size decide,
// so it is another name after any change. "" with errno.
[[nodiscard]] std::string thumbnailKey(int source, unsigned edge);

class ThumbnailCache {
 public:
    // Opens it, made where it is missing. Check with operator bool; errno then.
    ThumbnailCache();
    explicit operator bool() const { return static_cast<bool>(root_); }

    // What is kept under `key`: "" for a source of which no picture can be made; nothing when there is none.
    [[nodiscard]] std::optional<std::string> get(const std::string& key) const;
    // Keeps it. A failure only costs the making once more; now and then the oldest go, so that all of it keeps to the
    // setting "thumbnail_cache_mib" (1024).
    void put(const std::string& key, std::string_view picture) const;

    // One of as many seats as there are processors, for whoever makes a picture; empty after `patience` ms in vain.
    [[nodiscard]] Descriptor takeSeat(int patience) const;

 private:
    [[nodiscard]] Descriptor openShelf(const std::string& key, bool make) const;
    Descriptor root_;
};

}  // namespace orvel::cgi

#endif
