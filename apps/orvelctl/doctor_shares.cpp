#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <map>
#include <set>
#include <string_view>

#include "doctor_checks.h"
#include "vexo/share_report.h"
#include "vexo/system_root.h"

namespace orvel::ctl {
namespace {

constexpr const char* kSambas = "/etc/samba/smb.conf";
constexpr const char* kMend = "mend the line; \"testparm -s\" shows what Samba makes of it";

struct Report {
    std::string file;  // the main one
    int error = 0;     // errno, 0 when it was read
    Findings findings;
    std::set<std::string> roots;    // of the shares that are open, variables as they are written
    std::vector<OpenShare> shares;  // those without variables
    std::string closed;             // the closed share at hand, and the options that close it
    std::string closedBy;
};

Finding findingOf(const VEXOSHARENOTE& note, Severity severity) {
    return {.severity = severity,
            .text = std::string("[") + note.share + "] ",
            .file = note.file,
            .line = note.line,
            .share = note.share,
            .option = note.option};
}

// A volume by itself holds the folder for temporary files, which Samba would show.
void adviseVeto(const VEXOSHARENOTE& note, Findings& findings) {
    const std::string_view root = note.path;
    const bool isVolume = root.find('/', 1) == std::string_view::npos && root.find('%') == std::string_view::npos;
    if (!isVolume || strstr(note.text, "/@tmp/") != nullptr) return;
    Finding finding = findingOf(note, Severity::kProblem);
    finding.text += "holds the folder @tmp for temporary files, which Samba shows there";
    const std::string_view vetoed = note.text;
    const std::string others(vetoed.substr(0, vetoed.find_last_not_of('/') + 1));
    finding.advice = "add to [" + finding.share + "]: veto files = " + others + "/@tmp/";
    finding.option = "veto files";
    findings.push_back(finding);
}

void takeShare(const VEXOSHARENOTE& note, Report& report) {
    Finding finding = findingOf(note, Severity::kGood);
    finding.option.clear();
    struct stat status {};
    const bool variable = strchr(note.path, '%') != nullptr;
    finding.text += note.kind == VEXO_NOTE_HOMES ? "each user's home at " : "at ";
    finding.text += note.path;
    if (*note.why != '\0') finding.text += std::string(", which the user ") + note.why + " shares";
    if (!variable && (stat(note.path, &status) != 0 || !S_ISDIR(status.st_mode))) {
        finding.severity = Severity::kProblem;
        finding.text += ", which is not there";
        finding.advice = std::string("make the folder ") + note.path + ", or change the path";
    }
    report.roots.insert(note.path);
    if (!variable && note.kind == VEXO_NOTE_SHARE) report.shares.push_back({note.share, note.path});
    report.findings.push_back(finding);
    if (note.kind == VEXO_NOTE_SHARE) adviseVeto(note, report.findings);
}

// One line opens the share, so it names all that closes it, and stands with the last of them.
void adviseOpening(const VEXOSHARENOTE& note, Report& report, Finding& finding) {
    if (report.closed == note.share) {
        report.findings.back().advice.clear();
        report.closedBy += std::string(", ") + note.option;
    } else {
        report.closed = note.share;
        report.closedBy = note.option;
    }
    finding.advice = "to open it here all the same, add to [" + report.closed + "]: vexo:ignore = " + report.closedBy;
}

void takeNote(const VEXOSHARENOTE* note, void* argument) {
    auto& report = *static_cast<Report*>(argument);
    Finding finding = findingOf(*note, Severity::kProblem);
    switch (note->kind) {
        case VEXO_NOTE_SHARE:
        case VEXO_NOTE_HOMES:
            return takeShare(*note, report);
        case VEXO_NOTE_OFF:
            finding.severity = Severity::kNote;
            finding.text += std::string("is not a share here: ") + note->why;
            break;
        case VEXO_NOTE_CLOSED:
            finding.text += std::string("is closed by \"") + note->option + " = " + note->text + "\": " + note->why;
            adviseOpening(*note, report, finding);
            break;
        case VEXO_NOTE_LEFT_OUT:
            finding.text += std::string("is left out: ") + note->why;
            finding.advice = kMend;
            break;
        default:
            finding.text = note->why;
            finding.advice = kMend;
            break;
    }
    report.findings.push_back(finding);
}

const Report& shareReport() {
    static const Report& report = *[] {
        auto* made = new Report;
        char file[4096] = {};
        if (VEXOShareReport(file, sizeof file, takeNote, made) != 0) made->error = errno;
        made->file = file;
        return made;
    }();
    return report;
}

Finding unreadable(const Report& report) {
    Finding finding = {.severity = Severity::kProblem, .text = "", .file = report.file};
    const bool missing = report.error == ENOENT;
    finding.text = missing ? "there are no share definitions, so there are no shares"
                           : std::string("the share definitions cannot be read, so there are no shares: ") +
                                 strerror(report.error);
    const bool hasSamba = access(VEXO::SystemPath(kSambas).c_str(), F_OK) == 0;
    if (report.error == EFBIG) {
        finding.advice = "the file may have 1 MiB";
    } else if (missing && hasSamba) {
        finding.advice =
            std::string("to offer what Samba serves, add to /etc/vexoinfo.conf: share_definitions=\"") + kSambas + "\"";
    } else if (missing) {
        const bool isSambas = report.file == VEXO::SystemPath(kSambas);
        finding.advice = std::string(isSambas ? "install Samba, or " : "") +
                         "write the file, a section a share: [photo], path = /srv/photo, read only = no";
    }
    return finding;
}

}  // namespace

const std::vector<OpenShare>& openShares() {
    return shareReport().shares;
}

const std::string& definitionsFile() {
    return shareReport().file;
}

void checkShares(Findings& findings) {
    const Report& report = shareReport();
    if (report.error != 0) {
        findings.push_back(unreadable(report));
        return;
    }
    findings = report.findings;
    if (!report.roots.empty()) return;
    findings.push_back({.severity = Severity::kProblem,
                        .text = "no section is a share, so there are no shares",
                        .advice = "write a section a share: [photo], path = /srv/photo, read only = no",
                        .file = report.file});
}

// The system makes these folders when it starts; uploads and searches need them.
void checkVolumes(Findings& findings) {
    std::set<std::string> volumes;
    for (const std::string& root : shareReport().roots) {
        const std::string volume = root.substr(0, root.find('/', 1));
        if (volume.find('%') == std::string::npos) volumes.insert(volume);
    }
    for (const std::string& volume : volumes) {
        std::string fault;
        for (const char* name : {"/@tmp", "/@tmp/orvel", "/@tmp/orvel/PXSearch"}) {
            struct stat status {};
            const std::string folder = volume + name;
            if (!fault.empty()) break;
            if (lstat(folder.c_str(), &status) != 0) {
                fault = folder + " is not there";
            } else if (!S_ISDIR(status.st_mode) || status.st_uid != 0) {
                fault = folder + " is not a folder of root's";
            } else if ((status.st_mode & 07777) != 01777) {
                fault = folder + " has not the mode 1777";
            }
        }
        Finding finding = {.text = volume + " has its temporary folders"};
        if (!fault.empty())
            finding = {.severity = Severity::kProblem, .text = fault, .advice = "run: orvelctl volumes"};
        findings.push_back(finding);
    }
}

}  // namespace orvel::ctl
