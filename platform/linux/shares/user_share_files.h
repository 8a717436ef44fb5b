// The files of the shares that users define for themselves, and whether they are to be trusted.
#ifndef VEXO_LINUX_USER_SHARE_FILES_H
#define VEXO_LINUX_USER_SHARE_FILES_H

#include <sys/stat.h>

#include <string>
#include <vector>

#include "io/file_io.h"
#include "shares/share_definitions.h"
#include "shares/user_share.h"

namespace vexo {

// What user shares were made from.
class UserShareFiles {
 public:
    // Adds a section for each of them. `isSambas`: Samba's own defaults count, else there are none where no folder is
    // stated.
    void addTo(Definitions& definitions, bool isSambas);
    // Whether nothing of it changed since, or at a recent look.
    [[nodiscard]] bool isUnchanged() const;
    // Whether both saw the same.
    [[nodiscard]] bool isSameAs(const UserShareFiles& other) const;

 private:
    struct Look {
        std::string path;
        bool whole;  // of a file, or the folder of files; else only which folder it is, and whose
        bool found;
        struct stat status;
        [[nodiscard]] bool isSameAs(const Look& other) const;
    };
    static Look lookAt(const std::string& path, bool whole);
    void readFolder(Definitions& definitions, const UserShareRules& rules);
    std::string readFile(int folder, const std::string& name, const UserShareRules& rules, DefinitionSection& section);
    std::string judgeTarget(const std::string& path, uid_t owner, bool ownerOnly);

    std::vector<Look> looks_;
    bool settled_ = true;  // no later change can leave the same times
    mutable RecentLook recent_;
};

}  // namespace vexo

#endif
