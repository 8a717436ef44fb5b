// Whether users of the machine can log in: the PAM service.
#include <glob.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "doctor_checks.h"
#include "vexo/system_root.h"

namespace orvel::ctl {
namespace {

constexpr const char* kService = "orvel";
constexpr const char* kFolders[] = {"/etc/pam.d/", "/usr/lib/pam.d/"};
constexpr const char* kModules[] = {"/lib/security/", "/lib/*/security/", "/usr/lib/security/", "/usr/lib/*/security/"};
constexpr int kDeepest = 16;

// "" where there is none.
std::string fileOf(const std::string& service) {
    for (const char* folder : kFolders) {
        std::string path = service.starts_with('/') ? service : VEXO::SystemPath(folder + service);
        if (access(path.c_str(), F_OK) == 0) return path;
    }
    return "";
}

// Modules are the machine's own, whatever the system root.
bool isModuleThere(const std::string& module) {
    if (module.starts_with('/')) return access(module.c_str(), F_OK) == 0;
    for (const char* folder : kModules) {
        glob_t found = {};
        const bool there = glob((folder + module).c_str(), 0, nullptr, &found) == 0;
        globfree(&found);
        if (there) return true;
    }
    return false;
}

class Service {
 public:
    explicit Service(Findings& findings) : findings_(findings) {}

    void read(const std::string& path, int depth) {
        std::ifstream file(path);
        std::string line, rest;
        for (int number = 1; std::getline(file, line); ++number, rest.clear()) {
            while (line.ends_with('\\') && std::getline(file, rest)) {
                line.back() = ' ';
                line += rest;
            }
            judge(line.substr(0, line.find('#')), path, number, depth);
        }
    }
    [[nodiscard]] bool asks(const char* kind) const { return kinds_.count(kind) != 0; }

 private:
    void judge(const std::string& line, const std::string& path, int number, int depth) {
        std::istringstream words(line);
        std::string kind, control, module;
        if (!(words >> kind >> control)) return;
        if (kind == "@include") return include(control, path, number, depth);
        if (control.starts_with('[')) {
            while (!control.ends_with(']') && words >> control) {
            }
        }
        words >> module;
        const bool optional = kind.starts_with('-');
        kinds_.insert(optional ? kind.substr(1) : kind);
        if (control == "include" || control == "substack") return include(module, path, number, depth);
        if (!optional && !isModuleThere(module)) report("the module " + module + " is not installed", path, number);
    }
    void include(const std::string& name, const std::string& path, int number, int depth) {
        const std::string file = fileOf(name);
        if (file.empty()) return report("includes " + name + ", which is not there", path, number);
        if (depth < kDeepest) read(file, depth + 1);
    }
    void report(const std::string& text, const std::string& path, int number) {
        findings_.push_back({.severity = Severity::kProblem,
                             .text = text,
                             .advice = "without it every log-in fails; \"pam-auth-update\" mends the common files",
                             .file = path,
                             .line = number});
    }

    Findings& findings_;
    std::set<std::string> kinds_;
};

}  // namespace

void checkLogIn(Findings& findings) {
    const std::string path = fileOf(kService);
    const bool own = VEXO::SystemPath("/etc") == "/etc";
    if (path.empty()) {
        findings.push_back({.severity = own ? Severity::kProblem : Severity::kNote,
                            .text = own ? "PAM has no service orvel, so nobody can log in by a password of the machine"
                                        : "this system root is not the machine's own, so PAM judges no log-ins",
                            .advice = own ? "write /etc/pam.d/orvel: @include common-auth, @include common-account, "
                                            "@include common-password, a line each"
                                          : ""});
        return;
    }
    Service service(findings);
    service.read(path, 0);
    for (const char* kind : {"auth", "account"}) {
        if (service.asks(kind)) continue;
        findings.push_back({.severity = Severity::kProblem,
                            .text = std::string("has no line of the kind ") + kind,
                            .advice = std::string("add: @include common-") + kind,
                            .file = path});
    }
    struct stat status {};
    if (stat(path.c_str(), &status) == 0 && (status.st_uid != 0 || (status.st_mode & (S_IWGRP | S_IWOTH)) != 0)) {
        findings.push_back({.severity = Severity::kProblem,
                            .text = "can be changed by others than root, who could then log in as anybody",
                            .advice = "chown root " + path + "; chmod go-w " + path,
                            .file = path});
    }
    if (findings.empty()) findings.push_back({.text = "the PAM service and its modules are there", .file = path});
}

}  // namespace orvel::ctl
