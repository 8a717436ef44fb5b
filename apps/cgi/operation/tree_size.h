// A walk through a tree that looks at everything and changes nothing.
#ifndef ORVEL_CGI_OPERATION_TREE_SIZE_H
#define ORVEL_CGI_OPERATION_TREE_SIZE_H

#include <sys/stat.h>

#include <string>
#include <vector>

#include "base/descriptor.h"
#include "operation/progress.h"
#include "operation/size_report.h"

namespace orvel::cgi {

// Counts what listings show: nothing that is hidden or kept out, no link is followed, no other file system that is
// mounted below is entered. Each folder is opened in the one above it. Memory and descriptors follow the depth, and the
// number of folders in each folder on the way down.
class TreeSize {
 public:
    TreeSize(SizeReport& report, Progress& progress) : report_(report), progress_(progress) {}

    // Adds the entry `name` of the open `folder`, with all below it. `path` is share-relative. `ofContent`: what lies
    // directly in it are the parts of the report, else it is one itself. 0, or an errno: it is not counted then.
    int add(int folder, const std::string& name, const std::string& path, bool ofContent);
    // The same for a folder that is open for reading.
    int add(Descriptor folder, const std::string& path, bool ofContent);

 private:
    struct Level {
        Descriptor folder;
        size_t pathLength;
        std::vector<std::string> folders;  // still to be entered
        Amount amount;
    };
    void walk();
    void push(Descriptor folder, long long disk);
    void read();
    void look(const char* name);
    void enter(const std::string& name);
    void leave();
    void count(SizeKind kind, const Amount& amount);
    void note(SizeKind kind, const Amount& amount);
    void miss(int error, const Amount& seen);
    Amount amountOf(const struct statx& status);

    SizeReport& report_;
    Progress& progress_;
    LinkedFiles linked_;
    std::string path_;  // of what is looked at
    std::vector<Level> levels_;
    bool ofContent_ = false;
};

}  // namespace orvel::cgi

#endif
