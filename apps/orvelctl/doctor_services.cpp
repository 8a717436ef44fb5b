// Whether orveld answers, how old the file indexes are, and when was swept last.
#include <pwd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <memory>
#include <sstream>

#include "base/owner.h"
#include "command.h"
#include "doctor_checks.h"
#include "load_limits.h"
#include "request.h"
#include "vexo/error.h"
#include "vexo/index.h"
#include "vexo/settings.h"
#include "vexo/share.h"
#include "vexo/sweep.h"

namespace orvel::ctl {
namespace {

constexpr long long kHour = 3600, kDay = 24 * kHour;
constexpr long long kOldSweep = 2 * kDay;
constexpr long long kOldIndex = 8 * kDay;

std::string ageText(long long seconds) {
    if (seconds < 2 * kHour) return std::to_string(std::max(seconds / 60, 0LL)) + " minutes ago";
    if (seconds < 2 * kDay) return std::to_string(seconds / kHour) + " hours ago";
    return std::to_string(seconds / kDay) + " days ago";
}

// What is no number keeps a recycle bin to nothing.
void judgeBinLimit(const std::string& setting, Findings& findings) {
    const std::string text = VexoConf::Info().Get(setting, "");
    if (text.empty() || cgi::parseNumber(text)) return;
    findings.push_back({.severity = Severity::kProblem,
                        .text = "the setting " + setting + " is no number: nothing goes by it",
                        .advice = "write digits alone: " + setting + "=\"30\"",
                        .file = "/etc/vexoinfo.conf"});
}

// A name that is not known is passed over by orveld, and the web server is turned away.
void judgeUsers(const char* setting, Findings& findings) {
    std::string text = VexoConf::Info().Get(setting, "");
    std::replace(text.begin(), text.end(), ',', ' ');
    std::istringstream names(text);
    for (std::string name; names >> name;) {
        const bool isNumber = name.find_first_not_of("0123456789") == std::string::npos;
        if (isNumber || getpwnam(name.c_str()) != nullptr) continue;
        findings.push_back({.severity = Severity::kProblem,
                            .text = std::string("the setting ") + setting + " names " + name + ", who is no user here",
                            .advice = "name the user as whom the web server runs"});
    }
}

void judgeIndex(const OpenShare& share, Findings& findings) {
    FIINDEXSTATUS found = {};
    std::unique_ptr<VEXOSHARE, Releaser<VEXOShareFree>> record;
    const bool known = VEXOShareGet(share.name.c_str(), acquire(record)) == 0;
    const bool wanted = known && record->index != 0;
    Finding finding = {.text = "[" + share.name + "] ", .share = share.name};
    if (FILEIDXIndexStatus(share.name.c_str(), &found) < 0) {
        if (!wanted) return;
        const bool missing = VLIBCErrGet() == VEXO_ERR_MISSING;
        finding.severity = Severity::kProblem;
        finding.text +=
            missing ? "has no index, so searches walk" : "has an index that cannot be used, so searches walk";
        finding.advice = "orvelctl index build " + share.name;
    } else {
        const long long age = time(nullptr) - found.updated;
        finding.text += std::to_string(found.records) + " entries, updated " + ageText(age);
        if (age > kOldIndex) {
            finding.severity = Severity::kNote;
            finding.advice = "files that changed since are found as they were; orvelctl index update " + share.name;
        }
        if (!wanted) {
            finding.severity = Severity::kNote;
            finding.text += ", and not used";
            finding.advice = "say vexo:index = yes in the share, or: orvelctl index drop " + share.name;
        }
    }
    findings.push_back(finding);
}

}  // namespace

void checkOrveld(Findings& findings) {
    std::string body, error;
    const std::string socket = orveld::defaultSocket();
    if (askFigures(socket, body, error)) {
        findings.push_back({.text = "orveld answers", .file = socket});
    } else {
        findings.push_back({.severity = Severity::kProblem,
                            .text = "orveld does not answer: " + error,
                            .advice = "systemctl start orveld.socket; \"journalctl -u orveld\" says why it ended",
                            .file = socket});
    }
    judgeUsers("orveld_web_servers", findings);
    judgeUsers("orveld_trusted_logins", findings);
}

void checkIndexes(Findings& findings) {
    for (const OpenShare& share : openShares()) judgeIndex(share, findings);
    if (findings.empty()) findings.push_back({.text = "no share has an index"});
}

void checkSweep(Findings& findings) {
    VEXOSWEEP last = {};
    const int swept = VEXOSweepLast(&last);
    Finding finding;
    if (swept < 0) {
        finding = {.severity = Severity::kNote, .text = std::string("cannot be looked at: ") + strerror(errno)};
    } else if (swept == 0) {
        finding = {.severity = Severity::kProblem, .text = "nothing was ever swept: what is over stays on the disk"};
    } else {
        const long long age = time(nullptr) - last.time;
        finding.text = "swept " + ageText(age);
        if (age > kOldSweep) finding.severity = Severity::kProblem;
    }
    if (finding.severity == Severity::kProblem) {
        finding.advice = "let the machine call \"orvelctl sweep\" every day; the unit orvel-sweep.timer does";
    } else if (last.failures > 0) {
        finding.severity = Severity::kProblem;
        finding.text += ", without success in " + std::to_string(last.failures) + " of its parts";
        finding.advice = "\"orvelctl sweep\" says which";
    }
    findings.push_back(finding);
    std::vector<std::string> names = {"", "_home"};
    for (const OpenShare& share : openShares()) names.push_back("_" + share.name);
    for (const std::string& name : names) {
        for (const char* setting : {"recycle_days", "recycle_mib"}) judgeBinLimit(setting + name, findings);
    }
}

}  // namespace orvel::ctl
