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

void checkShares(Findings& findings);
void checkVolumes(Findings& findings);

struct Check {
    const char* name;
    void (*run)(Findings& findings);
};

// A further check is a further row.
constexpr Check kChecks[] = {
    {"shares", checkShares},
    {"temporary folders", checkVolumes},
};

}  // namespace orvel::ctl

#endif
