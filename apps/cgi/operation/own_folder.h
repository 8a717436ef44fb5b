// A folder that an archive gets for itself.
#ifndef ORVEL_CGI_OPERATION_OWN_FOLDER_H
#define ORVEL_CGI_OPERATION_OWN_FOLDER_H

#include <string>

#include "base/descriptor.h"

namespace orvel::cgi {

// An archive's name without its endings, which is the folder's: "a.tar.gz" gives "a". Pure.
std::string folderNameOf(const std::string& archive);

class OwnFolder {
 public:
    // In the open `folder`, which must outlive it.
    explicit OwnFolder(const Descriptor& folder) : above_(folder) {}

    // Makes it under `wanted` or the next numbered name that is free. 0 or a library code.
    int make(const std::string& wanted, const std::string& user);
    [[nodiscard]] const Descriptor& folder() const { return folder_; }

    // To be called once it is filled. It goes when it is empty, and, where all of the archive has come (`whole`), when
    // it holds one folder and nothing else: that takes its place, under its own name or the next numbered one.
    void settle(bool whole);
    [[nodiscard]] bool isThere() const { return !name_.empty(); }
    [[nodiscard]] const std::string& name() const { return name_; }

 private:
    bool moveAside(const std::string& wanted);

    const Descriptor& above_;
    Descriptor folder_;
    std::string name_;
};

}  // namespace orvel::cgi

#endif
