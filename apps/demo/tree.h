// Makes the files of one share root. Until finish() nobody but the maker can enter it.
#ifndef ORVEL_DEMO_TREE_H
#define ORVEL_DEMO_TREE_H

#include <sys/types.h>

#include <cstdint>
#include <ctime>
#include <string>

#include "identities.h"

namespace orvel::demo {

// Throws std::system_error when something cannot be made, even if it is only that it is there already. Modes are exact
// where the process's umask is 0.
class Tree {
 public:
    Tree(const std::string& root, const Identities& ids);
    ~Tree();
    Tree(const Tree&) = delete;
    Tree& operator=(const Tree&) = delete;

    [[nodiscard]] const Identities& ids() const { return ids_; }
    // Whose the things made from now on are; alice at first.
    void owner(uid_t uid) { owner_ = uid; }

    void folder(const std::string& path, mode_t mode = 0775);
    // `size` bytes of zeros that take no room on the disk.
    void file(const std::string& path, int64_t size, time_t modified, mode_t mode = 0664);
    void textFile(const std::string& path, const std::string& text);
    void link(const std::string& path, const std::string& target);
    // Opens the root to the others.
    void finish(uid_t uid, mode_t mode);

 private:
    void own(const std::string& path) const;
    std::string root_;
    Identities ids_;
    uid_t owner_;
    int fd_;
};

}  // namespace orvel::demo

#endif
