// Owners and permissions of the files that everything relies on.
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>

#include "doctor_checks.h"
#include "vexo/system_root.h"

namespace orvel::ctl {
namespace {

struct Place {
    const char* path;  // "" for the share definitions
    bool isFolder;
    mode_t forbidden;  // permissions that nobody else may have
    mode_t needed;     // permissions that those must have who act as users
};

constexpr mode_t kWritable = S_IWGRP | S_IWOTH;
constexpr mode_t kAll = S_IRWXG | S_IRWXO;

constexpr Place kPlaces[] = {
    {"/etc/vexoinfo.conf", false, kWritable, S_IROTH},
    {"/etc.defaults/vexoinfo.conf", false, kWritable, S_IROTH},
    {"", false, kWritable, S_IROTH},
    {"/etc/vexo/applications", false, kWritable, S_IROTH},
    {"/etc/vexo/ddns.conf", false, kWritable, S_IROTH},
    {"/etc/vexo/volumes", false, kWritable, S_IROTH},
    {"/etc/orvel/web.conf", false, kWritable, 0},
    {"/usr/vexo/etc/vexosharing.conf", false, kWritable, S_IROTH},
    {"/usr/vexo/etc/pexlander", true, kWritable, S_IXOTH},
    {"/usr/vexo/etc/pexlander/pxsharing.db", false, kWritable, S_IROTH},
    {"/run/vexo", true, kWritable, S_IXOTH},
    {"/run/vexo/sessions", true, kAll, 0},
    {"/var/lib/vexo", true, kWritable, S_IXOTH},
    {"/var/lib/vexo/tasks", true, kAll, 0},
    {"/var/lib/vexo/index", true, kAll, 0},
    {"/var/lib/vexo/autoblock.db", false, kAll, 0},
    {"/var/log/vexo", true, kWritable, 0},
    {"/var/log/vexo/xfer.log", false, kWritable, 0},
};

Finding problem(const std::string& path, const std::string& text, const std::string& advice) {
    return {.severity = Severity::kProblem, .text = text, .advice = advice, .file = path};
}

// What is wrong with a place that is there.
void judge(const Place& place, const std::string& path, const struct stat& status, Findings& findings) {
    const bool kind = place.isFolder ? S_ISDIR(status.st_mode) : S_ISREG(status.st_mode);
    if (!kind) {
        findings.push_back(problem(path, place.isFolder ? "is not a folder" : "is not a file",
                                   "move it away; what is missing is made when it is needed"));
        return;
    }
    if (status.st_uid != 0 && status.st_uid != geteuid()) {
        findings.push_back(problem(path, "belongs to uid " + std::to_string(status.st_uid) + ", who could change it",
                                   "chown root " + path));
    }
    const mode_t open = status.st_mode & place.forbidden;
    if (open != 0) {
        const bool writable = (open & kWritable) != 0;
        findings.push_back(problem(path,
                                   writable ? "can be changed by others than root" : "can be read by others than root",
                                   std::string(place.forbidden == kAll ? "chmod go= " : "chmod go-w ") + path));
    }
    if ((status.st_mode & place.needed) != place.needed) {
        const char* missing = place.isFolder ? "cannot be entered by users" : "cannot be read by users";
        findings.push_back(problem(path, std::string(missing) + ", as whom the programs act",
                                   std::string(place.isFolder ? "chmod a+x " : "chmod a+r ") + path));
    }
}

}  // namespace

void checkFiles(Findings& findings) {
    int looked = 0;
    for (const Place& place : kPlaces) {
        const bool isDefinitions = *place.path == '\0';
        const std::string path = isDefinitions ? definitionsFile() : VEXO::SystemPath(place.path);
        struct stat status {};
        // The definitions may be a link, as Samba's file sometimes is.
        const int result = isDefinitions ? stat(path.c_str(), &status) : lstat(path.c_str(), &status);
        if (result == 0) {
            ++looked;
            judge(place, path, status, findings);
        } else if (errno != ENOENT && errno != ENOTDIR) {
            findings.push_back({.severity = Severity::kNote,
                                .text = std::string("cannot be looked at (") + strerror(errno) + ")",
                                .file = path});
        }
    }
    if (findings.empty())
        findings.push_back({.text = std::to_string(looked) + " files and folders are as they should be"});
}

}  // namespace orvel::ctl
