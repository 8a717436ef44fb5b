// orvel-demo: makes and removes a demo appliance. It is not installed.
//
//   orvel-demo FOLDER [--keep | --remove]
//
// FOLDER becomes the appliance's system root; --keep keeps a demo that is whole, --remove removes one.
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <exception>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <string_view>

#include "record.h"
#include "shares.h"

namespace fs = std::filesystem;

namespace orvel::demo {
namespace {

// Programs that have taken on a user's identity still read the appliance's settings.
void requireReachable(const fs::path& folder) {
    for (fs::path parent = folder.parent_path();; parent = parent.parent_path()) {
        struct stat status = {};
        if (stat(parent.c_str(), &status) == 0 && (status.st_mode & S_IXOTH) == 0) {
            throw std::runtime_error("other users cannot enter " + parent.string() +
                                     ": choose a folder they can reach");
        }
        if (parent == parent.parent_path()) return;
    }
}

void writeSystem(const std::string& folder, const std::string& tag, const Record& record, const Identities& ids) {
    writeNew(folder + "/etc/passwd", passwdText(ids, record.people), 0644);
    writeNew(folder + "/etc/group", groupText(ids, record.people), 0644);
    writeNew(folder + "/etc/shadow", shadowText(record.people), 0600);
    writeNew(folder + "/etc/vexo/users.htpasswd", loginText(record.people), 0600);
    writeNew(folder + "/etc/vexo/shares.conf", sharesText(tag), 0644);
    writeNew(folder + "/etc/vexoinfo.conf",
             "userhome_enable=\"yes\"\nadmin_group=\"administrators\"\nsession_timeout=\"60\"\n"
             "trusted_log_in=\"yes\"\n",
             0644);
    writeNew(folder + "/etc.defaults/vexoinfo.conf", "support_s2s=\"yes\"\n", 0644);
    for (const char* made : {"/run", "/tmp", "/var/lib/vexo", "/usr/vexo/etc/pexlander", "/usr/vexo/vexoman/webman"}) {
        fs::create_directories(folder + made);
    }
    chmod((folder + "/tmp").c_str(), 01777);
}

void make(const std::string& folder) {
    umask(022);
    const Identities ids = identitiesFor(geteuid(), getegid());
    if (ids.real) requireReachable(folder);
    const std::string tag = randomDigits();
    Record record = {
        .whole = false, .folderMade = fs::create_directories(folder), .roots = shareRoots(tag), .people = people(ids)};
    if (!fs::is_empty(folder)) throw std::runtime_error(folder + " is not empty, and no demo of yours");
    chmod(folder.c_str(), 0755);
    // The record comes first, so that a demo that was never finished can be removed.
    writeRecord(folder, record);
    writeSystem(folder, tag, record, ids);
    const mode_t before = umask(0);
    makeShares(tag, ids);
    umask(before);
    record.whole = true;
    writeRecord(folder, record);
}

void print(const std::string& folder, const Record& record) {
    printf("demo appliance in %s\n", folder.c_str());
    for (const Person& person : record.people) {
        printf("  user %-6s password %s  (%s)\n", person.name.c_str(), person.password.c_str(), person.about.c_str());
    }
}

int demo(const fs::path& given, bool keep, bool remove) {
    const fs::path absolute = fs::absolute(given);
    const std::string folder = fs::weakly_canonical(absolute.has_filename() ? absolute : absolute.parent_path());
    const auto found = readRecord(folder);
    if (remove) {
        if (!found) throw std::runtime_error(folder + " holds no demo of yours");
        removeDemo(folder, *found);
        printf("demo appliance in %s removed\n", folder.c_str());
        return 0;
    }
    if (!found || !keep || !isWhole(*found)) {
        if (found) removeDemo(folder, *found);
        make(folder);
    }
    print(folder, *readRecord(folder));
    return 0;
}

}  // namespace
}  // namespace orvel::demo

int main(int count, char** words) {
    const std::string_view option = count == 3 ? words[2] : "";
    if (count < 2 || count > 3 || words[1][0] == '-' || (count == 3 && option != "--keep" && option != "--remove")) {
        fputs("usage: orvel-demo FOLDER [--keep | --remove]\n", stderr);
        return 2;
    }
    try {
        const int status = orvel::demo::demo(words[1], option == "--keep", option == "--remove");
        return fflush(stdout) == 0 ? status : 1;
    } catch (const std::exception& error) {
        fprintf(stderr, "orvel-demo: %s\n", error.what());
        return 1;
    }
}
