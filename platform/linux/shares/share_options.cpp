#include "shares/share_options.h"

#include <charconv>
#include <climits>
#include <cstddef>

#include "vexo/share.h"

namespace vexo {
namespace {

constexpr size_t kMaxName = sizeof(VEXOSHARE::szName) - 1;
constexpr size_t kMaxPath = sizeof(VEXOSHARE::szPath) - 1;
constexpr size_t kMaxComponent = 255;
constexpr std::string_view kEverybody = "*";
// The first component of a path that means the user's own folder, so no share can be reached by it.
constexpr std::string_view kReservedName = "home";

bool isShareName(std::string_view name) {
    if (name.empty() || name.size() > kMaxName || name == "." || name == "..") return false;
    for (const char c : name) {
        if (c == '/' || static_cast<unsigned char>(c) < 0x20 || c == 0x7F) return false;
    }
    return foldedName(name) != kReservedName;
}

// A whole decimal number, or a hexadecimal one behind 0x, of at most `limit`.
std::optional<unsigned> parseNumber(std::string_view text, unsigned limit) {
    int base = 10;
    if (text.starts_with("0x") || text.starts_with("0X")) {
        text.remove_prefix(2);
        base = 16;
    }
    unsigned value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value, base);
    if (error != std::errc() || end != text.data() + text.size() || value > limit) return std::nullopt;
    return value;
}

// Takes the values of one section; the first that cannot be read is the fault of all.
class Values {
 public:
    explicit Values(const DefinitionSection& section) : section_(section) {}

    bool boolean(ShareOption option, bool byDefault) {
        const OptionValue& value = section_.value(option);
        if (!value.stated) return byDefault;
        const std::optional<bool> says = parseBoolean(value.text);
        if (!says) fault_ = "\"" + value.text + "\" is neither yes nor no";
        return says.value_or(byDefault);
    }
    unsigned number(ShareOption option, unsigned limit) {
        const OptionValue& value = section_.value(option);
        if (!value.stated) return 0;
        const std::optional<unsigned> number = parseNumber(value.text, limit);
        if (!number) fault_ = "\"" + value.text + "\" is no number or too large";
        return number.value_or(0);
    }
    [[nodiscard]] std::vector<std::string> list(ShareOption option) const {
        return splitList(section_.value(option).text);
    }
    [[nodiscard]] const std::string& fault() const { return fault_; }

 private:
    const DefinitionSection& section_;
    std::string fault_;
};

std::string faultOf(const DefinitionSection& section) {
    if (!section.fault.empty()) return section.fault;
    if (!isShareName(section.name)) return "no name for a share";
    for (const OptionValue& value : section.values) {
        if (value.text.find('\0') != std::string::npos) return "a zero byte in a value";
    }
    const std::string& path = section.value(ShareOption::path).text;
    if (path.empty()) return "no path";
    if (!normalRoot(path)) return "the path \"" + path + "\" is not that of a folder below \"/\"";
    return {};
}

void fillLists(Values& values, bool readOnly, ShareDefinition& share) {
    share.noAccess = values.list(ShareOption::invalidUsers);
    share.readWrite = values.list(ShareOption::writeList);
    share.readOnly = values.list(ShareOption::readList);
    std::vector<std::string> users = values.list(ShareOption::validUsers);
    if (users.empty()) users.emplace_back(kEverybody);
    std::vector<std::string>& theirs = readOnly ? share.readOnly : share.readWrite;
    theirs.insert(theirs.end(), users.begin(), users.end());
}

}  // namespace

ShareReading readShare(const DefinitionSection& section) {
    Values values(section);
    if (!values.boolean(ShareOption::available, true) || values.boolean(ShareOption::printable, false)) return {};
    std::string fault = faultOf(section);
    if (!fault.empty()) return {std::nullopt, std::move(fault)};
    ShareDefinition share;
    share.name = section.name;
    share.path = *normalRoot(section.value(ShareOption::path).text);
    if (!values.boolean(ShareOption::browseable, true)) share.status |= VEXO_SHARE_HIDDEN;
    if (values.boolean(ShareOption::encrypted, false)) share.status |= VEXO_SHARE_ENCRYPTED;
    share.mask = values.number(ShareOption::restriction, UINT_MAX);
    share.ftp = static_cast<int>(values.number(ShareOption::ftp, INT_MAX));
    share.acl = values.boolean(ShareOption::acl, false);
    share.synced = values.boolean(ShareOption::synced, false);
    // One index cannot be of as many folders as there are users.
    share.index = values.boolean(ShareOption::index, false) && !hasVariables(share.path);
    fillLists(values, values.boolean(ShareOption::readOnly, true), share);
    if (!values.fault().empty()) return {std::nullopt, values.fault()};
    return {std::move(share), {}};
}

std::optional<std::string> normalRoot(std::string_view path) {
    if (!path.starts_with('/')) return std::nullopt;
    std::string root;
    while (!path.empty()) {
        path.remove_prefix(1);
        const std::string_view component = path.substr(0, path.find('/'));
        path.remove_prefix(component.size());
        if (component.empty()) continue;
        if (component == "." || component == ".." || component.size() > kMaxComponent) return std::nullopt;
        root += '/';
        root += component;
    }
    if (root.empty() || root.size() > kMaxPath) return std::nullopt;
    return root;
}

bool hasVariables(std::string_view path) {
    return path.find('%') != std::string_view::npos;
}

std::string replaceVariables(std::string_view path, const PathVariables& variables) {
    std::string out;
    for (size_t i = 0; i < path.size(); ++i) {
        const char letter = path[i] == '%' && i + 1 < path.size() ? path[i + 1] : '\0';
        const std::string* value = letter == 'S'   ? &variables.share
                                   : letter == 'u' ? &variables.user
                                   : letter == 'U' ? &variables.name
                                   : letter == 'D' ? &variables.domain
                                   : letter == 'g' ? &variables.group
                                                   : nullptr;
        if (value == nullptr) {
            out += path[i];
        } else {
            out += *value;
            ++i;
        }
    }
    return out;
}

}  // namespace vexo
