#include "arguments.h"

#include <algorithm>

#include "request.h"

namespace orvel::ctl {
namespace {

bool contains(const std::vector<std::string>& list, const std::string& word) {
    return std::find(list.begin(), list.end(), word) != list.end();
}

}  // namespace

Arguments::Arguments(const std::vector<std::string>& words, const std::vector<std::string>& valued,
                     const std::vector<std::string>& flags, size_t positions, bool orMore) {
    for (size_t i = 0; i < words.size(); ++i) {
        if (!words[i].starts_with("--")) {
            positions_.push_back(words[i]);
        } else if (contains(flags, words[i])) {
            options_[words[i]] = "";
        } else if (contains(valued, words[i])) {
            if (i + 1 == words.size()) throw UsageError(words[i] + " needs a value");
            options_[words[i]] = words[i + 1];
            ++i;
        } else {
            throw UsageError("unknown option " + words[i]);
        }
    }
    const bool fits = positions_.size() == positions || (orMore && positions_.size() > positions);
    if (!fits) throw UsageError("wrong number of arguments");
}

std::string Arguments::value(const std::string& option, const std::string& fallback) const {
    const auto found = options_.find(option);
    return found != options_.end() ? found->second : fallback;
}

std::string Arguments::required(const std::string& option) const {
    if (!has(option)) throw UsageError(option + " is missing");
    return value(option, "");
}

unsigned long Arguments::number(const std::string& option, unsigned long fallback) const {
    if (!has(option)) return fallback;
    const auto number = cgi::parseNumber(value(option, ""));
    if (!number) throw UsageError(option + " takes a number");
    return *number;
}

}  // namespace orvel::ctl
