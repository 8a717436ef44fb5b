// What a section of the share definitions means: a share, or the reason why it is not one. Pure.
#ifndef VEXO_LINUX_SHARE_OPTIONS_H
#define VEXO_LINUX_SHARE_OPTIONS_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "shares/share_definitions.h"

namespace vexo {

// What new files and folders of a share get. A mask that is not stated is Samba's own.
struct NewFiles {
    std::optional<unsigned> createMask, directoryMask;
    unsigned forceCreateMode = 0;
    unsigned forceDirectoryMode = 0;
    bool inheritPermissions = false;
    bool inheritAcls = false;  // where a folder has a default ACL, nothing but the mask limits it
    std::string group;         // "" for none; behind "+" for its members alone
};

// Where the snapshots of a share lie, as the options of Samba's shadow_copy2 say.
struct Snapshots {
    bool stated = false;
    bool known = true;  // false: it says none, or says it in a way that is not known here
    bool isLocalTime = false;
    bool isEverywhere = false;
    std::string folder = ".snapshots";  // absolute, or below the mount point
    std::string format = "@GMT-%Y.%m.%d-%H.%M.%S";
    std::string base;    // which folder a snapshot is of; "" for the mount point
    std::string mount;   // "" to find it
    std::string inside;  // where the share lies in a snapshot; "" to find it
};

struct ShareDefinition {
    std::string name;
    std::string path;     // absolute, possibly with variables
    unsigned status = 0;  // VEXO_SHARE_...
    unsigned mask = 0;    // restriction
    int ftp = 0;
    bool acl = false;
    bool synced = false;
    bool index = false;
    bool isUsers = false;  // a user has defined it
    std::vector<std::string> noAccess;
    std::vector<std::string> readWrite;
    std::vector<std::string> readOnly;
    NewFiles newFiles;
    std::vector<std::string> veto;  // patterns of names that it keeps out
    std::string recycle;            // where Samba's recycle bin lies in it, possibly with variables; "" without one
    Snapshots snapshots;
};

struct ShareReading {
    std::optional<ShareDefinition> share;
    // The section [homes] of homes that are in no share: `share` is what each user has, with the variables of its path.
    bool isHomes = false;
    std::string fault;              // why the section is malformed
    std::string off;                // why it is not meant to be a share here: switched off, or a printer
    std::vector<Closing> closings;  // the options that close it
};

// `global` is what [global] says in the end. Without a share one of the reasons is given.
[[nodiscard]] ShareReading readShare(const DefinitionSection& section, const LimitValues& global = {});

// The definition of homes for one user: what stands for the share's name in its lists is the user's.
[[nodiscard]] ShareDefinition homesOf(const ShareDefinition& homes, const std::string& user);

// In an entry of a share's lists, between conditions all of which must hold, and in front of one that must not.
constexpr char kListAnd = '\x1F';
constexpr char kListNot = '\x1E';
// An entry that means an account by its number, behind this and "u", or "g" for a group.
constexpr char kListId = '\x1D';

// `path` without repeated and trailing slashes when it is absolute, has a component or more, and neither "." nor ".."
// is one; else nothing.
[[nodiscard]] std::optional<std::string> normalRoot(std::string_view path);

// What the variables of a path stand for.
struct PathVariables {
    std::string share;   // %S
    std::string user;    // %u, the whole name
    std::string name;    // %U, the name without its domain
    std::string domain;  // %D
    std::string group;   // %g and %G, the primary group
    std::string home;    // %H, the home folder
};

[[nodiscard]] bool hasVariables(std::string_view path);
// Other uses of "%" stay as they are. Nothing when a variable that the path has stands for nothing.
[[nodiscard]] std::optional<std::string> replaceVariables(std::string_view path, const PathVariables& variables);

}  // namespace vexo

#endif
