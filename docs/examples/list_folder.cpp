// Prints as JSON what a folder of a share holds, as one of the machine's users sees it.
//
//   list_folder USER PATH         list_folder alice /photo/2012
//
// Run as root: it becomes the user before it opens anything of theirs. Installed orvel and vexo are all it needs:
//   g++ -std=c++20 list_folder.cpp $(pkg-config --cflags --libs orvel) -o list_folder
#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <list>
#include <string>

#include "orvel/error_state.h"
#include "orvel/file_info.h"
#include "orvel/identity.h"
#include "orvel/listing.h"
#include "orvel/privilege.h"

namespace {

constexpr int kAdditional = ADDITIONAL_SIZE | ADDITIONAL_TIME | ADDITIONAL_OWNER;

// The folder that `info` names, opened beneath its share's root: a link that leads out is refused, whatever it is made
// to point at meanwhile.
int openBeneath(const PathInfo& info) {
    const int root = open(info.shareRoot.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
    if (root < 0) return -1;
    const size_t slash = info.path.find('/', 1);  // behind the share's name
    const std::string rest = slash == std::string::npos ? "." : info.path.substr(slash + 1);
    open_how how = {};
    how.flags = O_RDONLY | O_DIRECTORY | O_CLOEXEC;
    how.resolve = RESOLVE_BENEATH | RESOLVE_NO_MAGICLINKS;
    const auto folder = static_cast<int>(syscall(SYS_openat2, root, rest.c_str(), &how, sizeof how));
    close(root);
    return folder;
}

int fail(const char* path) {
    const int code = OrvLibGetErr();
    std::fprintf(stderr, "list_folder: %s: code %d, %s\n", path, code, OrvParseErrorToKTRString(code, nullptr));
    return 1;
}

}  // namespace

int main(int count, char** words) {
    if (count != 3) {
        std::fputs("usage: list_folder USER PATH\n", stderr);
        return 2;
    }
    const char* user = words[1];
    setenv("REMOTE_USER", user, 1);  // whom "%U" in share definitions stands for
    PathInfo info;
    // Rights first, by the share's lists; then the kernel judges, as the process is the user.
    if (!PathInfoFactory::create(user, words[2], info)) return fail(words[2]);
    if (!CheckShareListPrivilege(user, nullptr, info.path.c_str())) {
        std::fprintf(stderr, "list_folder: %s: the share does not let %s in\n", words[2], user);
        return 1;
    }
    if (OrvLibUGIDSet(nullptr, user) != 0) return fail(words[2]);
    const int folder = openBeneath(info);
    if (folder < 0) {
        std::perror(words[2]);
        return 1;
    }

    OrvEnum enumeration;
    std::list<DIRENTRY_INFO> entries;
    unsigned long total = 0;
    const std::string opened = "/proc/self/fd/" + std::to_string(folder);
    if (!enumeration.OrvLibDirEntryListEnum(info.path.c_str(), opened.c_str(), "name", kAdditional, 0, 0, true,
                                            DIR_ENTRY_TYPE_ALL, {}, entries, &total)) {
        return fail(words[2]);
    }
    std::string text = "[";
    for (const DIRENTRY_INFO& entry : entries) {
        if (text.size() > 1) text += ',';
        AppendFileInfoText(kAdditional, entry, text);
    }
    std::puts((text + "]").c_str());
    return 0;
}
