// The file that a copy fills before it takes the target's place.
#ifndef VEXO_LINUX_PART_FILE_H
#define VEXO_LINUX_PART_FILE_H

#include <sys/types.h>

#include <string>

#include "io/file_io.h"

namespace vexo {

// Has no name where the file system can do that, so that not even a killed process leaves anything behind; else a
// hidden one, drawn anew for each. Unless it was published it is gone with its owner.
class PartFile {
 public:
    // `folder` must outlive it.
    explicit PartFile(int folder) : folder_(folder) {}
    ~PartFile() { removeName(); }
    PartFile(const PartFile&) = delete;
    PartFile& operator=(const PartFile&) = delete;

    // Creates it, open for reading and writing. False with errno.
    [[nodiscard]] bool create(mode_t mode);
    // Takes the open file `fd` for it, whatever its name: publishing gives it one more. False with errno.
    [[nodiscard]] bool adopt(int fd);
    [[nodiscard]] int get() const { return fd_.get(); }
    // Gives it the name `name` in the folder, in place of the file of that name when `replace`; else EEXIST when there
    // is one. False with errno.
    [[nodiscard]] bool publish(const char* name, bool replace);

 private:
    [[nodiscard]] bool createNamed(mode_t mode);
    [[nodiscard]] bool linkNameless(const char* name);
    [[nodiscard]] bool moveToFreeName(const char* name);
    void removeName();

    int folder_;
    Descriptor fd_;
    std::string name_;  // "" while it has none
};

}  // namespace vexo

#endif
