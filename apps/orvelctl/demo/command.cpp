#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <stdexcept>

#include "arguments.h"
#include "command.h"
#include "demo/record.h"
#include "demo/shares.h"

namespace fs = std::filesystem;

namespace orvel::ctl {
namespace {

using appliance::Record;

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

void writeSystem(const std::string& folder, const std::string& tag, const Record& record,
                 const appliance::Identities& ids) {
    appliance::writeNew(folder + "/etc/passwd", passwdText(ids, record.people), 0644);
    appliance::writeNew(folder + "/etc/group", groupText(ids, record.people), 0644);
    appliance::writeNew(folder + "/etc/shadow", appliance::shadowText(record.people), 0600);
    appliance::writeNew(folder + "/etc/vexo/users.htpasswd", appliance::loginText(record.people), 0600);
    appliance::writeNew(folder + "/etc/vexo/shares.conf", appliance::sharesText(tag), 0644);
    appliance::writeNew(folder + "/etc/vexoinfo.conf",
                        "userhome_enable=\"yes\"\nadmin_group=\"administrators\"\nsession_timeout=\"60\"\n", 0644);
    appliance::writeNew(folder + "/etc.defaults/vexoinfo.conf", "support_s2s=\"yes\"\n", 0644);
    for (const char* made : {"/run", "/tmp", "/var/lib/vexo", "/usr/vexo/etc/pexlander", "/usr/vexo/vexoman/webman"}) {
        fs::create_directories(folder + made);
    }
    chmod((folder + "/tmp").c_str(), 01777);
}

void make(const std::string& folder) {
    umask(022);
    const appliance::Identities ids = appliance::identitiesFor(geteuid(), getegid());
    if (ids.real) requireReachable(folder);
    const std::string tag = appliance::randomDigits();
    Record record = {.whole = false,
                     .folderMade = fs::create_directories(folder),
                     .roots = appliance::shareRoots(tag),
                     .people = people(ids)};
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
    for (const appliance::Person& person : record.people) {
        printf("  user %-6s password %s  (%s)\n", person.name.c_str(), person.password.c_str(), person.about.c_str());
    }
}

}  // namespace

int demo(const std::vector<std::string>& words) {
    const Arguments arguments(words, {}, {"--keep", "--remove"}, 1);
    const fs::path given = fs::absolute(arguments.position(0));
    const std::string folder = fs::weakly_canonical(given.has_filename() ? given : given.parent_path());
    const auto found = appliance::readRecord(folder);
    if (arguments.has("--remove")) {
        if (!found) throw std::runtime_error(folder + " holds no demo of yours");
        removeDemo(folder, *found);
        printf("demo appliance in %s removed\n", folder.c_str());
        return 0;
    }
    if (!found || !arguments.has("--keep") || !isWhole(*found)) {
        if (found) removeDemo(folder, *found);
        make(folder);
    }
    print(folder, *appliance::readRecord(folder));
    return 0;
}

}  // namespace orvel::ctl
