// A file that is written before it has its name.
#ifndef ORVEL_CGI_OPERATION_NEW_FILE_H
#define ORVEL_CGI_OPERATION_NEW_FILE_H

#include <string>

#include "base/descriptor.h"

namespace orvel::cgi {

// A hidden name for what is not finished, drawn anew each time; "" with errno when there are no random bytes.
std::string partName();

// Makes a symbolic link, in place of what has that name when `replace`; else EEXIST when there is something. False with
// errno.
bool putLink(int folder, const std::string& name, const char* text, bool replace);

// Gives the file `from` in the open folder `fromFolder` one more name, in place of what has that name when `replace`.
// As above.
bool putHardLink(int fromFolder, const std::string& from, int folder, const std::string& name, bool replace);

// Has no name at all where the file system can do that, so that not even a killed process leaves anything behind; else
// a hidden one. Unless it was published it is gone with its owner.
class NewFile {
 public:
    // In the open `folder`, which must outlive it.
    explicit NewFile(int folder) : folder_(folder) {}
    ~NewFile();
    NewFile(const NewFile&) = delete;
    NewFile& operator=(const NewFile&) = delete;

    // Creates it, closed to others, for writing. False with errno.
    bool create();
    [[nodiscard]] int get() const { return file_.get(); }
    // Gives it its name, in place of what has that name when `replace` (once it is on the disk); else EEXIST when there
    // is something. False with errno; it can be tried again.
    bool publish(const std::string& name, bool replace);

 private:
    bool giveName(const std::string& name);

    int folder_;
    Descriptor file_;
    std::string name_;  // "" while it has none
};

}  // namespace orvel::cgi

#endif
