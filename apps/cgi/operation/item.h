// Files and folders as the operations handle them: a name in a folder that is open, and the path to show people.
#ifndef ORVEL_CGI_OPERATION_ITEM_H
#define ORVEL_CGI_OPERATION_ITEM_H

#include <sys/stat.h>

#include <string>

#include "operation/judge.h"
#include "operation/progress.h"
#include "orvel/file_info.h"
#include "request.h"
#include "shown_search.h"
#include "target.h"

namespace orvel::cgi {

// Somewhere in a tree that is worked on.
struct Entry {
    int folder;        // open; not owned
    std::string name;  // need not exist
    std::string path;  // share-relative
    // The name as an entry of `inside`, the same folder opened.
    [[nodiscard]] Entry child(int inside, const std::string& childName) const {
        return {inside, childName, path + "/" + childName};
    }
    // A path for the platform that cannot be led elsewhere.
    [[nodiscard]] std::string handle() const { return "/proc/self/fd/" + std::to_string(folder) + "/" + name; }
};

// What a request names.
struct Item {
    PathInfo info;
    Target place;
    std::string realFolder;  // where that is, free of links
    struct stat status {};   // a link's own
    [[nodiscard]] Entry entry() const { return {place.folder.get(), place.name, info.path}; }
    [[nodiscard]] ChangedFile changed() const { return {info, place.folder, place.name}; }
    [[nodiscard]] std::string realPath() const { return realFolder + "/" + place.name; }
};

// Whether what is needed may be done in that folder: 0, or 411 for a change in a snapshot.
int checkChangeable(std::initializer_list<Need> needs, const Descriptor& folder, const std::string& name);

// Resolves `path`, asks the share's rules (`needs` one after the other) and looks, as the user. 0 or a library code.
int openItem(const User& user, const std::string& path, std::initializer_list<Need> needs, Item& item);

// The same for a folder that is worked in, also a share's root.
int openFolder(const User& user, const std::string& path, PathInfo& info, Descriptor& folder);

// To whom new files and folders are handed: to nobody (-1), unless the process acts as root.
struct Owner {
    uid_t uid = static_cast<uid_t>(-1);
    gid_t gid = static_cast<gid_t>(-1);
};
Owner ownerFor(const std::string& user);

// Expects the item, and all that lies below it.
void measure(const Item& item, Progress& progress);
// The same for work that does not depend on sizes.
void countItems(const Item& item, Progress& progress);

}  // namespace orvel::cgi

#endif
