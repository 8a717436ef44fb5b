#include "shares/user_share.h"

#include <algorithm>
#include <charconv>
#include <utility>

#include "shares/share_options.h"

namespace vexo {
namespace {

constexpr std::string_view kEverybody = "*";
// Names that mean something else wherever they stand.
constexpr std::string_view kTaken[] = {"global", "globals", "homes", "home", "printers", "print$", "ipc$"};
// What lies below these is the system's, whoever owns it.
constexpr std::string_view kSystem[] = {"/proc", "/sys", "/dev", "/run"};

bool isBelow(std::string_view path, std::string_view folder) {
    return path.starts_with(folder) && (path.size() == folder.size() || path[folder.size()] == '/');
}

// The next line behind what it has to begin with; false when it begins otherwise.
bool takeLine(std::string_view& text, std::string_view begin, std::string_view& rest) {
    std::string_view line = text.substr(0, text.find('\n'));
    text.remove_prefix(std::min(line.size() + 1, text.size()));
    if (line.ends_with('\r')) line.remove_suffix(1);
    if (!line.starts_with(begin)) return false;
    rest = line.substr(begin.size());
    return true;
}

bool isNumber(std::string_view text) {
    return !text.empty() && text.find_first_not_of("0123456789") == std::string_view::npos;
}

// Whom a security identifier means, as an entry of a share's lists; "" for whom nobody here knows.
std::string entryOf(std::string_view sid) {
    if (sid == "S-1-1-0" || sid == "S-1-5-11") return std::string(kEverybody);
    for (const auto& [begin, mark] : {std::pair<std::string_view, char>{"S-1-22-1-", 'u'}, {"S-1-22-2-", 'g'}}) {
        if (!sid.starts_with(begin) || !isNumber(sid.substr(begin.size()))) continue;
        return std::string{kListId, mark}.append(sid.substr(begin.size()));
    }
    return {};
}

// "SID:F,SID:R,SID:D" in the order in which they are asked. The fault, or "".
std::string readEntries(std::string_view text, std::vector<UserShareEntry>& entries) {
    if (text.empty()) entries.push_back({std::string(kEverybody), 'R'});
    bool more = !text.empty();
    while (more) {
        const std::string_view item = text.substr(0, text.find(','));
        more = item.size() < text.size();
        text.remove_prefix(std::min(item.size() + 1, text.size()));
        const size_t colon = item.find(':');
        constexpr std::string_view kLetters = "RFDrfd";
        if (colon == std::string_view::npos || colon + 2 != item.size() ||
            kLetters.find(item.back()) == std::string_view::npos) {
            return "its access list cannot be read";
        }
        const char letter = kLetters[kLetters.find(item.back()) % 3];
        std::string who = entryOf(item.substr(0, colon));
        if (who.empty() && letter == 'D') {
            return "its access list keeps out " + std::string(item.substr(0, colon)) + ", whom nobody knows here";
        }
        if (!who.empty()) entries.push_back({std::move(who), letter});
    }
    const auto grants = [](const UserShareEntry& entry) { return entry.right != 'D'; };
    return std::any_of(entries.begin(), entries.end(), grants) ? ""
                                                               : "its access list lets in nobody who is known here";
}

bool beginsWithAny(const std::string& path, const std::vector<std::string>& beginnings) {
    return std::any_of(beginnings.begin(), beginnings.end(),
                       [&](const std::string& beginning) { return path.starts_with(beginning); });
}

std::string judgePath(const std::string& path, const UserShareRules& rules) {
    if (normalRoot(path) != path) return "its path is not that of a folder below \"/\"";
    if (hasVariables(path)) return "its path has a percent sign";
    for (const std::string_view folder : kSystem) {
        if (isBelow(path, folder)) return "its path lies in " + std::string(folder);
    }
    if (beginsWithAny(path, rules.denied)) return "\"usershare prefix deny list\" names its path";
    const bool allowed = rules.allowed.empty() || beginsWithAny(path, rules.allowed);
    return allowed ? "" : "\"usershare prefix allow list\" does not name its path";
}

std::string judgeName(std::string_view file, const std::string& name) {
    const std::string folded = foldedName(file);
    if (folded != foldedName(name)) return "it names another share than its file";
    const bool taken = std::find(std::begin(kTaken), std::end(kTaken), folded) != std::end(kTaken);
    return taken ? "its name means something else" : "";
}

// The fault, or "".
std::string readLines(std::string_view file, std::string_view text, UserShare& share) {
    constexpr const char* kMalformed = "it is not what \"net usershare\" writes";
    std::string_view version, path, comment, entries, guests, name = file;
    if (text.find('\0') != std::string_view::npos || !takeLine(text, "#VERSION ", version) ||
        (version != "1" && version != "2") || !takeLine(text, "path=", path) || !takeLine(text, "comment=", comment) ||
        !takeLine(text, "usershare_acl=", entries)) {
        return kMalformed;
    }
    if (version == "2" && !takeLine(text, "guest_ok=", guests)) return kMalformed;
    if (version == "2" && !text.empty() && !takeLine(text, "sharename=", name)) return kMalformed;
    share.path = path;
    share.name = name;
    const std::string fault = judgeName(file, share.name);
    return fault.empty() ? readEntries(entries, share.entries) : fault;
}

}  // namespace

UserShareRules userShareRules(const OptionValues& global, std::string_view byDefault) {
    const auto value = [&](ShareOption option) -> const OptionValue& { return global[static_cast<size_t>(option)]; };
    UserShareRules rules;
    const OptionValue& folder = value(ShareOption::usersharePath);
    rules.folder = folder.stated ? folder.text : byDefault;
    rules.place = folder.place;
    rules.likeShare = value(ShareOption::usershareTemplate).text;
    rules.allowed = splitList(value(ShareOption::usershareAllow).text);
    rules.denied = splitList(value(ShareOption::usershareDeny).text);
    const OptionValue& most = value(ShareOption::usershareMost);
    const char* const end = most.text.data() + most.text.size();
    if (most.stated && (!isNumber(most.text) || std::from_chars(most.text.data(), end, rules.most).ec != std::errc())) {
        rules.fault = "\"usershare max shares\" is no number";
    }
    const OptionValue& owner = value(ShareOption::usershareOwnerOnly);
    const auto says = parseBoolean(owner.text);
    if (owner.stated && !says) rules.fault = "\"usershare owner only\" is neither yes nor no";
    rules.ownerOnly = says.value_or(true);
    if (rules.most == 0) rules.folder.clear();
    return rules;
}

UserShare readUserShare(std::string_view file, std::string_view text, const UserShareRules& rules) {
    UserShare share;
    share.name = file;
    share.fault = readLines(file, text, share);
    if (share.fault.empty()) share.fault = judgePath(share.path, rules);
    return share;
}

}  // namespace vexo
