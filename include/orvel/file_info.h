// What a listed entry looks like in a reply, and what a share-relative path resolves to.
#ifndef ORVEL_FILE_INFO_H
#define ORVEL_FILE_INFO_H

#include <json/forwards.h>

#include <string>

#include "orvel/export.h"

struct DIRENTRY_INFO;

// A share-relative path resolved for a user.
struct PathInfo {
    std::string path;        // as given, without trailing "/"
    std::string realPath;    // where it lies in the file system
    std::string shareName;   // its first component
    std::string volumePath;  // the volume that holds the share root
    std::string shareRoot;   // root of the share, or the user's home folder
};

class ORVEL_API PathInfoFactory {
 public:
    // Resolves `path` for `user`; "home" creates the user's home folder on first use. Returns true with `info` filled.
    // False with 400 and the platform error 0x0D00 for a null user or an empty path; with the code of OrvFullPathGet
    // and the platform error 0x0D00, 0xBE00 (missing) or 0x8000 when it fails, which is logged. Fields filled before a
    // failure keep their new values.
    static bool create(const char* user, const std::string& path, PathInfo& info);
};

// Writes the entry into the JSON object `out`: "name", "path", "isdir" and, below "additional", the properties whose
// ADDITIONAL_... bits are set. Members that exist are overwritten, others stay; an "additional"/"perm" object that is
// there already keeps its other members. A value in the way that is no object becomes one. Fails only
// when memory is out: 401 is stored, `out` holds a part.
ORVEL_API void DumpFileInfo(int additional, const DIRENTRY_INFO& info, Json::Value& out);

// Appends to `out` the compact text of the object that DumpFileInfo makes, byte for byte as jsoncpp writes it (no
// indentation, UTF-8 as it stands, keys sorted) without building the object: for lists too long to hold as a tree.
// Names that are no UTF-8 are the caller's business: their bytes pass through. When memory is out `out` is unchanged
// and 401 is stored.
ORVEL_API void AppendFileInfoText(int additional, const DIRENTRY_INFO& info, std::string& out);

// Joins the paths of a JSON array with ", ": each from its first "/" on, or whole when it has none; elements that are
// no text are passed over. True; false with 401 (logged) when `paths` is no array, `out` unchanged.
ORVEL_API bool ParseJsonPathToString(const Json::Value& paths, std::string& out);

#endif
