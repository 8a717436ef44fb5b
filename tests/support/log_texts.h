// Captured log lines as whole texts, for tests that compare them exactly.
#ifndef ORVEL_TESTS_SUPPORT_LOG_TEXTS_H
#define ORVEL_TESTS_SUPPORT_LOG_TEXTS_H

#include <regex>
#include <string>
#include <vector>

#include "support/appliance.h"

namespace support {

// Takes the lines written so far, the line number behind the source's name written as "#": "orveldir:# error".
inline std::vector<std::string> takeLogTexts() {
    static const std::regex position("^(\\w+ ?[:(])[0-9]+");
    std::vector<std::string> texts;
    for (const LogLine& line : takeLog()) texts.push_back(std::regex_replace(line.text, position, "$1#"));
    return texts;
}

}  // namespace support

#endif
