// Making a thing whole before it has its name.
//
// A name in a folder of somebody's appears in one step, with all that belongs to it, or not at all. Where that takes a
// name before the name (in the place of a file that exists, or on a file system without nameless files) it is one that
// the file manager never shows. Functions that return bool leave errno on failure.
#ifndef ORVEL_BASE_NEW_FILE_H
#define ORVEL_BASE_NEW_FILE_H

#include <sys/stat.h>
#include <sys/types.h>

#include <functional>
#include <string>
#include <string_view>

#include "base/descriptor.h"

namespace orvel {

// What the names of unfinished things begin with. The platform hides them everywhere.
inline constexpr std::string_view kPartPrefix = ".vexo-part-";
[[nodiscard]] constexpr bool isPartName(std::string_view name) {
    return name.starts_with(kPartPrefix);
}

// Such a name, drawn anew; "" with errno when the kernel gives no random bytes.
[[nodiscard]] std::string drawPartName();

// Removes the unfinished thing `name` from the open folder unless somebody is at work on it: a file or folder is locked
// by its owner; a link cannot be, so it must have been there for a minute. A folder that is not empty stays. True when
// the name is free.
bool removeAbandonedPart(int folder, const std::string& name);

// Gives `from` in the open folder `fromFolder` the name `to` in `toFolder`, in the place of nothing: EEXIST when there
// is such a name already. One that is the same file by another spelling (where case does not count) is no obstacle.
// On a file system that cannot rename so, the name is taken first, by a second name of the file, or an empty file or
// folder where it can have none.
[[nodiscard]] bool renameNew(int fromFolder, const std::string& from, int toFolder, const std::string& to);

// Makes a folder under a hidden name, `part`, which follows from the one that it will have, and opens it. It is locked
// as long as it is open: what a killed process left goes when the name is wanted next. Empty with errno on failure.
[[nodiscard]] Descriptor makeFolderPart(int folder, const std::string& name, mode_t mode, std::string& part);

// Makes a symbolic link, in the place of what has that name when `replace`; else EEXIST when there is something.
[[nodiscard]] bool putLink(int folder, const std::string& name, const char* text, bool replace);

// Gives the file `from` in the open folder `fromFolder` one more name. As above.
[[nodiscard]] bool putHardLink(int fromFolder, const std::string& from, int folder, const std::string& name,
                               bool replace);

// Waits until the name of a file in the open folder (O_PATH will do) is on the disk: by the folder, or by the file
// where the caller may not read the folder. Where that cannot be asked (neither may be read; a file system that does
// not know it) it counts as done.
[[nodiscard]] bool syncName(int folder, const std::string& name);

// A file that is written before it has its name. It has none at all where the file system can do that, so that not even
// a killed process leaves anything behind; else a hidden one. Unless it was published it is gone with this object.
//
// A hidden name follows from the one that is wanted, so whoever wants that next finds what a killed process left and
// removes it: it is locked as long as its owner lives.
class NewFile {
 public:
    // In the open `folder` (O_PATH will do), which must outlive it.
    explicit NewFile(int folder) : folder_(folder) {}
    ~NewFile() { removePart(); }
    NewFile(const NewFile&) = delete;
    NewFile& operator=(const NewFile&) = delete;

    // Creates it, open for reading and writing; `name` is the one it will want.
    [[nodiscard]] bool create(const std::string& name, mode_t mode);
    // Takes the open file `fd` for it, whatever its name: publishing gives it one more.
    [[nodiscard]] bool adopt(int fd);
    [[nodiscard]] int get() const { return fd_.get(); }
    // Gives it its name, in the place of the file of that name when `replace` (once it is on the disk: a power cut must
    // leave the old content or the new one); else EEXIST when there is something. It can be tried again.
    [[nodiscard]] bool publish(const std::string& name, bool replace);
    // The same in the place of a file that `isExpected` accepts, and of no other: ESTALE when the file of that name is
    // another one, or none; ETXTBSY when somebody has it open for writing, as far as the file system says so (leases,
    // of one's own files). It is asked of what was there once nobody finds it under the name any more, which then gets
    // it back: what somebody else puts there or writes meanwhile stays. A file system that cannot exchange two names
    // leaves a moment between the question and the replacing.
    using IsExpected = std::function<bool(const struct stat&)>;
    [[nodiscard]] bool publishInPlaceOf(const std::string& name, const IsExpected& isExpected);

 private:
    [[nodiscard]] bool createNamed(const std::string& name, mode_t mode);
    [[nodiscard]] bool giveName(const std::string& name);
    [[nodiscard]] bool takePart(const std::string& name);
    [[nodiscard]] bool takeDrawnPart();
    void putBack(const std::string& name);
    void removePart();

    int folder_;
    Descriptor fd_;
    std::string part_;  // its hidden name, "" while it has none
};

}  // namespace orvel

#endif
