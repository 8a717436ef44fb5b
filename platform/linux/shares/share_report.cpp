#include "vexo/share_report.h"

#include <cerrno>
#include <exception>
#include <string>

#include "accounts/account_source.h"
#include "failure.h"
#include "fault_gate.h"
#include "shares/share_store.h"

namespace vexo {
namespace {

std::string nameOf(uid_t uid) {
    Account account;
    const bool found = AccountSource::instance().user(uid, account) == Lookup::found;
    return found ? account.name : std::to_string(uid);
}

class Reporter {
 public:
    Reporter(const DefinitionsReport& report, void (*take)(const VEXOSHARENOTE*, void*), void* argument)
        : report_(report), take_(take), argument_(argument) {}

    void problem(const Problem& problem) { give(VEXO_NOTE_PROBLEM, problem.place, "", {.why = problem.text}); }

    void section(const DefinitionSection& section, const ShareReading& reading) {
        const std::string& stated = section.value(ShareOption::path).text;
        const std::string path = reading.isHomes ? (stated.empty() ? "%H" : stated)
                                 : reading.share ? reading.share->path
                                                 : stated;
        if (reading.share) {
            give(reading.isHomes ? VEXO_NOTE_HOMES : VEXO_NOTE_SHARE, section.place, path,
                 {.share = section.name,
                  .option = "veto files",
                  .text = section.value(ShareOption::vetoFiles).text,
                  .why = section.user ? nameOf(section.user->owner) : ""});
        } else if (!reading.off.empty()) {
            give(VEXO_NOTE_OFF, section.place, path, {.share = section.name, .why = reading.off});
        } else if (!reading.fault.empty()) {
            const Place& place = section.fault.empty() ? section.place : section.faultPlace;
            give(VEXO_NOTE_LEFT_OUT, place, path, {.share = section.name, .why = reading.fault});
        } else {
            for (const Closing& closing : reading.closings) {
                give(VEXO_NOTE_CLOSED, closing.place, path,
                     {.share = section.name, .option = closing.option, .text = closing.text, .why = closing.why});
            }
        }
    }

 private:
    struct Texts {
        std::string share = {}, option = {}, text = {}, why = {};
    };
    void give(int kind, const Place& place, const std::string& path, const Texts& texts) {
        const VEXOSHARENOTE note = {.kind = kind,
                                    .share = texts.share.c_str(),
                                    .path = path.c_str(),
                                    .file = report_.paths.at(static_cast<size_t>(place.file)).c_str(),
                                    .line = place.line,
                                    .option = texts.option.c_str(),
                                    .text = texts.text.c_str(),
                                    .why = texts.why.c_str()};
        take_(&note, argument_);
    }

    const DefinitionsReport& report_;
    void (*take_)(const VEXOSHARENOTE*, void*);
    void* argument_;
};

}  // namespace
}  // namespace vexo

int VEXOShareReport(char* file, int size, void (*take)(const VEXOSHARENOTE*, void*), void* argument) try {
    VEXO_GATE("VEXOShareReport", -1);
    if (file == nullptr || size <= 0 || take == nullptr) return vexo::fail(VEXO_ERR_PARAMETER, EINVAL);
    const vexo::DefinitionsReport report = vexo::reportDefinitions();
    const std::string& path = report.paths.front();
    if (path.size() >= static_cast<size_t>(size)) return vexo::fail(VEXO_ERR_GENERAL, ENAMETOOLONG);
    file[path.copy(file, path.size())] = '\0';
    if (report.error != 0) return vexo::fail(VEXO_ERR_GENERAL, report.error);
    vexo::Reporter reporter(report, take, argument);
    for (const vexo::Problem& problem : report.definitions.problems) reporter.problem(problem);
    // Also where no section stands below it: the shares are elsewhere then.
    for (const vexo::Closing& closing : vexo::closingsOf({}, report.definitions.global, {})) {
        reporter.problem({closing.option + " = " + closing.text + ": " + closing.why, closing.place});
    }
    for (size_t i = 0; i < report.readings.size(); ++i) {
        reporter.section(report.definitions.sections[i], report.readings[i]);
    }
    return 0;
} catch (const std::exception&) {
    return vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
}
