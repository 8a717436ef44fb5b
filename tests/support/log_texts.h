// Captured log lines as whole texts, for tests that compare them exactly.
#ifndef ORVEL_TESTS_SUPPORT_LOG_TEXTS_H
#define ORVEL_TESTS_SUPPORT_LOG_TEXTS_H

#include <algorithm>
#include <string>
#include <vector>

#include "support/appliance.h"

namespace support {

// Takes the lines written so far, the line number behind the source's name written as "#": "orveldir:# error".
inline std::vector<std::string> takeLogTexts() {
    std::vector<std::string> texts;
    for (const LogLine& line : takeLog()) {
        const size_t mark = line.text.find_first_of(":(");
        const size_t number = mark == std::string::npos ? line.text.size() : mark + 1;
        const size_t end = std::min(line.text.find_first_not_of("0123456789", number), line.text.size());
        const std::string hidden = end > number ? "#" : "";
        texts.push_back(line.text.substr(0, number) + hidden + line.text.substr(end));
    }
    return texts;
}

// The same as one text, the lines parted by newlines.
inline std::string takeLogText() {
    std::string all;
    for (const std::string& text : takeLogTexts()) all += (all.empty() ? "" : "\n") + text;
    return all;
}

}  // namespace support

#endif
