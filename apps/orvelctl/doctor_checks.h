// What `orvelctl doctor` looks at.
#ifndef ORVEL_ORVELCTL_DOCTOR_CHECKS_H
#define ORVEL_ORVELCTL_DOCTOR_CHECKS_H

#include <string>
#include <vector>

namespace orvel::ctl {

enum class Severity { kGood, kNote, kProblem };

struct Finding {
    Severity severity = Severity::kGood;
    std::string text;
    std::string advice = {};  // what to do; "" when there is nothing to do
    std::string file = {};    // where it stands, "" for nowhere
    int line = 0;
    std::string share = {};   // the one it is about
    std::string option = {};  // the one that it is about
};

using Findings = std::vector<Finding>;

// A share that is open, as far as its root is one path for everybody.
struct OpenShare {
    std::string name;
    std::string root;
};
const std::vector<OpenShare>& openShares();
// The main file of the share definitions.
const std::string& definitionsFile();

void checkShares(Findings& findings);
void checkVolumes(Findings& findings);
void checkKernel(Findings& findings);
void checkMounts(Findings& findings);
void checkFiles(Findings& findings);
void checkLogIn(Findings& findings);
void checkCertificate(Findings& findings);
void checkOrveld(Findings& findings);
void checkIndexes(Findings& findings);
void checkSweep(Findings& findings);
void checkPictures(Findings& findings);

struct Check {
    const char* name;
    void (*run)(Findings& findings);
};

// A further check is a further row. The names are also the words of the command line.
constexpr Check kChecks[] = {
    {"kernel", checkKernel},   {"shares", checkShares}, {"mounts", checkMounts},     {"volumes", checkVolumes},
    {"files", checkFiles},     {"log-in", checkLogIn},  {"orveld", checkOrveld},     {"certificate", checkCertificate},
    {"indexes", checkIndexes}, {"sweep", checkSweep},   {"pictures", checkPictures},
};

}  // namespace orvel::ctl

#endif
