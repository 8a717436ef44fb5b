// The words of a command line: options by name, the rest by position.
#ifndef ORVEL_ORVELCTL_ARGUMENTS_H
#define ORVEL_ORVELCTL_ARGUMENTS_H

#include <map>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace orvel::ctl {

// The command line is not what the command takes; the text says why.
class UsageError : public std::runtime_error {
 public:
    using std::runtime_error::runtime_error;
};

class Arguments {
 public:
    // The options are those of the command, of its form `form`, in the table (command.h). Throws UsageError for an
    // unknown option, a missing value, or another number of positions than `positions`; with `orMore` there may be more
    // of them.
    Arguments(const std::vector<std::string>& words, std::string_view command, std::string_view form, size_t positions,
              bool orMore = false);

    [[nodiscard]] const std::string& position(size_t index) const { return positions_[index]; }
    [[nodiscard]] const std::vector<std::string>& positions() const { return positions_; }
    [[nodiscard]] bool has(const std::string& option) const { return options_.count(option) != 0; }
    [[nodiscard]] std::string value(const std::string& option, const std::string& fallback) const;
    // Throws UsageError when the option is missing.
    [[nodiscard]] std::string required(const std::string& option) const;
    // Throws UsageError when the value is no number.
    [[nodiscard]] unsigned long number(const std::string& option, unsigned long fallback) const;

 private:
    std::map<std::string, std::string> options_;
    std::vector<std::string> positions_;
};

}  // namespace orvel::ctl

#endif
