#include <json/value.h>

#include <algorithm>
#include <cstdio>

#include "arguments.h"
#include "command.h"
#include "doctor_checks.h"
#include "text.h"

namespace orvel::ctl {
namespace {

const char* wordOf(Severity severity) {
    switch (severity) {
        case Severity::kGood:
            return "good";
        case Severity::kNote:
            return "note";
        case Severity::kProblem:
            return "problem";
    }
    return "?";
}

std::string placeOf(const Finding& finding) {
    if (finding.file.empty()) return "";
    return finding.file + (finding.line > 0 ? ":" + std::to_string(finding.line) : "") + ": ";
}

void print(const Finding& finding) {
    const char* mark = finding.severity == Severity::kProblem ? "!!"
                       : finding.severity == Severity::kNote  ? "--"
                                                              : "ok";
    printf("%s  %s%s\n", mark, terminalText(placeOf(finding)).c_str(), terminalText(finding.text).c_str());
    if (!finding.advice.empty()) printf("      %s\n", terminalText(finding.advice).c_str());
}

Json::Value jsonOf(const char* check, const Finding& finding) {
    Json::Value value;
    value["check"] = check;
    value["severity"] = wordOf(finding.severity);
    value["text"] = cgi::readable(finding.text);
    if (!finding.advice.empty()) value["advice"] = cgi::readable(finding.advice);
    if (!finding.file.empty()) value["file"] = cgi::readable(finding.file);
    if (finding.line > 0) value["line"] = finding.line;
    if (!finding.share.empty()) value["share"] = cgi::readable(finding.share);
    if (!finding.option.empty()) value["option"] = cgi::readable(finding.option);
    return value;
}

std::string checkNames() {
    std::string names;
    for (const Check& check : kChecks) names += std::string(names.empty() ? "" : ", ") + check.name;
    return names;
}

// Those that the command line names, all where it names none.
std::vector<Check> chosen(const std::vector<std::string>& names) {
    std::vector<Check> checks;
    for (const Check& check : kChecks) {
        if (names.empty() || std::find(names.begin(), names.end(), check.name) != names.end()) checks.push_back(check);
    }
    for (const std::string& name : names) {
        const auto isCalled = [&name](const Check& check) { return check.name == name; };
        if (std::none_of(checks.begin(), checks.end(), isCalled)) {
            throw UsageError("there is no check " + name + ", but " + checkNames());
        }
    }
    return checks;
}

}  // namespace

int doctor(const std::vector<std::string>& words) {
    const Arguments arguments(words, "doctor", "", 0, true);
    const bool json = arguments.has("--json");
    Json::Value all(Json::arrayValue);
    int problems = 0;
    for (const Check& check : chosen(arguments.positions())) {
        Findings findings;
        check.run(findings);
        if (findings.empty()) findings.push_back({.severity = Severity::kNote, .text = "nothing to look at"});
        if (!json) printf("%s\n", check.name);
        for (const Finding& finding : findings) {
            if (finding.severity == Severity::kProblem) ++problems;
            if (json) {
                all.append(jsonOf(check.name, finding));
            } else {
                print(finding);
            }
        }
    }
    if (json) {
        Json::Value report;
        report["problems"] = problems;
        report["findings"] = std::move(all);
        std::string text;
        cgi::appendJson(report, text);
        printf("%s\n", text.c_str());
    } else {
        printf("%d %s to see to\n", problems, problems == 1 ? "thing" : "things");
    }
    return problems == 0 ? 0 : 1;
}

}  // namespace orvel::ctl
