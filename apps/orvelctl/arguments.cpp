#include "arguments.h"

#include "command.h"
#include "request.h"

namespace orvel::ctl {
namespace {

const Option& optionOf(std::string_view command, std::string_view form, const std::string& word) {
    for (const Option& option : findCommand(command)->options) {
        if (option.name == word && takes(option, form)) return option;
    }
    throw UsageError("unknown option " + word);
}

}  // namespace

Arguments::Arguments(const std::vector<std::string>& words, std::string_view command, std::string_view form,
                     size_t positions, bool orMore) {
    for (size_t i = 0; i < words.size(); ++i) {
        if (!words[i].starts_with("--")) {
            positions_.push_back(words[i]);
        } else if (*optionOf(command, form, words[i]).value == '\0') {
            options_[words[i]] = "";
        } else {
            if (i + 1 == words.size()) throw UsageError(words[i] + " needs a value");
            options_[words[i]] = words[i + 1];
            ++i;
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
