// What the kernel offers, and what is mounted where the shares lie.
#include <fcntl.h>
#include <linux/landlock.h>
#include <linux/openat2.h>
#include <mntent.h>
#include <sys/fanotify.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>
#include <set>

#include "base/descriptor.h"
#include "base/owner.h"
#include "doctor_checks.h"
#include "orvel/mount_status.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"

namespace orvel::ctl {
namespace {

int openBeneathFolder() {
    open_how how = {};
    how.flags = O_PATH | O_DIRECTORY | O_CLOEXEC;
    how.resolve = RESOLVE_BENEATH;
    return static_cast<int>(syscall(SYS_openat2, AT_FDCWD, ".", &how, sizeof how));
}

int openOwnProcess() {
    return static_cast<int>(syscall(SYS_pidfd_open, getpid(), 0));
}

// Without privileges a group that reports names of files is allowed since Linux 5.13.
int openFanotify() {
    return fanotify_init(FAN_CLASS_NOTIF | FAN_CLOEXEC | FAN_REPORT_FID | FAN_REPORT_DFID_NAME, 0);
}

struct Feature {
    const char* name;
    int (*open)();
    bool needed;
    const char* use;
};

constexpr Feature kFeatures[] = {
    {"openat2", openBeneathFolder, true, "paths are confined to their share by it: nothing can be opened without"},
    {"pidfd_open", openOwnProcess, true, "searches are ended through it: they could not be stopped without"},
    {"fanotify", openFanotify, false, "\"orvelctl index watch\" cannot work"},
};

void judge(const Feature& feature, Findings& findings) {
    const Descriptor opened(feature.open());
    Finding finding = {.text = std::string("the kernel has ") + feature.name};
    if (!opened) {
        finding.severity = feature.needed ? Severity::kProblem : Severity::kNote;
        finding.text = std::string(feature.name) + " does not work (" + strerror(errno) + "); " + feature.use;
        if (feature.needed)
            finding.advice = "Linux 5.6 or later is needed; in a container its filter must allow the call";
    }
    findings.push_back(finding);
}

void judgeLandlock(Findings& findings) {
    const long version = syscall(SYS_landlock_create_ruleset, nullptr, 0, LANDLOCK_CREATE_RULESET_VERSION);
    if (version > 0) {
        findings.push_back({.text = "the kernel has Landlock, version " + std::to_string(version)});
    } else {
        findings.push_back({.severity = Severity::kNote,
                            .text = std::string("Landlock does not work (") + strerror(errno) +
                                    "): what draws small pictures has one barrier less"});
    }
}

bool holds(const std::string& folder, const std::string& path) {
    return path == folder || path.starts_with(folder == "/" ? folder : folder + "/");
}

// A volume that was not mounted looks like an empty share, and takes what is meant for it.
void findUnmounted(const OpenShare& share, Findings& findings) {
    const std::unique_ptr<FILE, Releaser<endmntent>> table(setmntent(VEXO::SystemPath("/etc/fstab").c_str(), "re"));
    mntent entry{};
    char text[8192];
    while (table != nullptr && getmntent_r(table.get(), &entry, text, sizeof text) != nullptr) {
        const std::string folder = entry.mnt_dir;
        if (folder == "/" || !holds(folder, share.root) || hasmntopt(&entry, "noauto") != nullptr) continue;
        if (VEXOFSIsInMountTable(folder.c_str()) >= 0) continue;
        findings.push_back({.severity = Severity::kProblem,
                            .text = "[" + share.name + "] lies on " + folder + ", which is not mounted",
                            .advice = "mount " + folder + " before anybody stores something in the folder below it",
                            .file = VEXO::SystemPath("/etc/fstab"),
                            .share = share.name});
    }
}

bool holdsNamelessFiles(const std::string& folder) {
    return static_cast<bool>(Descriptor(open(folder.c_str(), O_TMPFILE | O_RDWR | O_CLOEXEC, 0600)));
}

void judgeMount(const OpenShare& share, OrvelMountStatus& mounts, std::set<dev_t>& tried, Findings& findings) {
    const int type = VEXOGetFSType(share.root.c_str(), 0);
    const bool known = type >= 0 && type <= 8;
    const std::string name = known ? rgszFsType[type] : "a file system of another type";
    const auto note = [&](Severity severity, const std::string& text, const std::string& advice) {
        findings.push_back(
            {.severity = severity, .text = "[" + share.name + "] " + text, .advice = advice, .share = share.name});
    };
    if (VEXOFSIsRemoteFS(type) == 1) {  // its server may be dead, so it is not looked at
        note(Severity::kNote, "lies on a network mount (" + name + "): no index holds its files, searches walk", "");
        return;
    }
    if (type == VEXO_FS_FAT) note(Severity::kNote, "lies on FAT, which keeps no owners and permissions", "");
    if (mounts.IsReadOnly(share.root.c_str())) {
        note(Severity::kNote, "lies on a read-only mount: nothing can be changed there", "");
        return;
    }
    struct stat status {};
    if (stat(share.root.c_str(), &status) != 0) return;  // the check of the shares says so
    if (!tried.insert(status.st_dev).second || geteuid() != 0) return;
    if (holdsNamelessFiles(share.root)) {
        note(Severity::kGood, "lies on " + name + ", which holds files without a name", "");
    } else {
        note(Severity::kNote,
             "lies on " + name + ", where files cannot be made without a name (" + strerror(errno) +
                 "): what is not whole yet has a hidden one",
             "");
    }
}

}  // namespace

void checkKernel(Findings& findings) {
    for (const Feature& feature : kFeatures) judge(feature, findings);
    judgeLandlock(findings);
}

void checkMounts(Findings& findings) {
    OrvelMountStatus mounts;
    std::set<dev_t> tried;
    for (const OpenShare& share : openShares()) {
        findUnmounted(share, findings);
        judgeMount(share, mounts, tried, findings);
    }
}

}  // namespace orvel::ctl
