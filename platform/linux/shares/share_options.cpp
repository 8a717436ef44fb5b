#include "shares/share_options.h"

#include <algorithm>
#include <charconv>
#include <climits>
#include <cstddef>
#include <iterator>
#include <utility>

#include "shares/definition_lines.h"
#include "vexo/share.h"

namespace vexo {
namespace {

constexpr size_t kMaxName = sizeof(VEXOSHARE::szName) - 1;
constexpr size_t kMaxPath = sizeof(VEXOSHARE::szPath) - 1;
constexpr size_t kMaxComponent = 255;
constexpr std::string_view kEverybody = "*";
// The first component of a path that means the user's own folder, so no share can be reached by it.
constexpr std::string_view kReservedName = "home";
constexpr std::string_view kHome = "%H";
constexpr std::string_view kSambasBin = ".recycle";
constexpr std::string_view kPathVariables = "SuUDgGH";
constexpr size_t kMaxPairs = 4096;

bool isHomesName(std::string_view name) {
    return foldedName(name) == "homes";
}

std::string withoutBlanks(std::string_view name) {
    std::string key;
    std::copy_if(name.begin(), name.end(), std::back_inserter(key), [](char c) { return !isDefinitionBlank(c); });
    return key;
}

// A path as far as it is known yet: a home folder at its beginning is absolute.
std::string templateOf(const std::string& path) {
    return path.starts_with(kHome) ? "/" + path : path;
}

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
    // The bits of a mode, in octal digits; nothing when there are none.
    std::optional<unsigned> mode(ShareOption option) {
        const std::string& text = section_.value(option).text;
        if (text.empty()) return std::nullopt;
        unsigned value = 0;
        const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value, 8);
        if (error == std::errc() && end == text.data() + text.size() && value <= 07777) return value;
        fault_ = "\"" + text + "\" is no mode";
        return std::nullopt;
    }
    [[nodiscard]] const OptionValue& value(ShareOption option) const { return section_.value(option); }
    [[nodiscard]] const std::string& fault() const { return fault_; }

 private:
    const DefinitionSection& section_;
    std::string fault_;
};

// "" when the section can be a share, as far as its text goes.
std::string faultOf(const DefinitionSection& section) {
    if (!section.fault.empty()) return section.fault;
    if (!isShareName(section.name)) return "no name for a share";
    for (const OptionValue& value : section.values) {
        const bool control = std::any_of(value.text.begin(), value.text.end(),
                                         [](char c) { return c == '\0' || (c >= kListId && c <= kListAnd); });
        if (control) return "a zero or control byte in a value";
    }
    const std::string& path = section.value(ShareOption::path).text;
    if (path.empty()) return isHomesName(section.name) ? "" : "no path";
    if (!normalRoot(templateOf(path))) return "the path \"" + path + "\" is not that of a folder below \"/\"";
    return {};
}

// Entries that Samba asks NIS about alone; nobody is asked here.
bool isNetgroup(std::string_view entry) {
    return entry.starts_with('&') && entry.find_first_of("@+") > entry.find_first_not_of("@+&");
}

// The lists of a section, with what closes it since it cannot be honoured.
struct Lists {
    std::vector<std::string> valid, invalid, read, write;
    std::vector<Closing> closings;
};

Lists listsOf(const DefinitionSection& section, const std::vector<std::string>& ignored) {
    Lists lists;
    const struct {
        ShareOption option;
        const char* name;
        std::vector<std::string>& list;
        bool takesAway;
    } all[] = {{ShareOption::validUsers, "valid users", lists.valid, false},
               {ShareOption::invalidUsers, "invalid users", lists.invalid, true},
               {ShareOption::readList, "read list", lists.read, true},
               {ShareOption::writeList, "write list", lists.write, false}};
    for (const auto& [option, name, list, takesAway] : all) {
        const OptionValue& value = section.value(option);
        const bool isIgnored = std::find(ignored.begin(), ignored.end(), withoutBlanks(name)) != ignored.end();
        if (isIgnored) continue;
        const std::optional<std::string> variable = unknownVariable(value.text, "S");
        if (variable) {
            lists.closings.push_back({name, value.text, *variable + " stands for nothing here", value.place});
        }
        for (std::string& entry : splitList(value.text)) {
            if (takesAway && isNetgroup(entry)) {
                lists.closings.push_back({name, value.text, "netgroups are not asked here", value.place});
            }
            list.push_back(isNetgroup(entry) || entry == kEverybody ? std::string() : std::move(entry));
        }
    }
    return lists;
}

std::string negated(const std::vector<std::string>& entries) {
    std::string all;
    for (const std::string& entry : entries) {
        if (!all.empty()) all += kListAnd;
        (all += kListNot) += entry;
    }
    return all;
}

// Those of `some` whom `all` names, too.
void addBoth(const std::vector<std::string>& some, const std::vector<std::string>& all, std::vector<std::string>& out) {
    for (const std::string& one : some) {
        for (const std::string& user : all) {
            std::string& entry = out.emplace_back(one);
            if (user != kEverybody && user != one) (entry += kListAnd) += user;
        }
    }
}

// Whom `valid users` names, or everybody without it, may read; whom `write list` names, and without `read only` who is
// not on `read list`, may write. `valid users` counts for all of them.
void fillLists(Lists&& lists, bool readOnly, ShareDefinition& share) {
    share.noAccess = std::move(lists.invalid);
    std::vector<std::string>& valid = lists.valid;
    const size_t pairs = (lists.write.size() + lists.read.size()) * valid.size();
    if (pairs > kMaxPairs) share.noAccess.push_back(negated(std::exchange(valid, {})));
    if (valid.empty()) valid.emplace_back(kEverybody);
    addBoth(lists.write, valid, share.readWrite);
    if (readOnly) {
        share.readOnly = valid;
        return;
    }
    const std::string except = negated(lists.read);
    for (const std::string& user : valid) {
        std::string& entry = share.readWrite.emplace_back(user);
        if (!except.empty()) (entry += kListAnd) += except;
    }
    addBoth(lists.read, valid, share.readOnly);
}

// Who may enter the share of a user is who may by both its access list and what it is made after.
bool limitToTerms(const UserShareTerms& terms, ShareDefinition& share) {
    const size_t lists = share.readWrite.size() + share.readOnly.size();
    if (terms.entries.size() * lists > kMaxPairs) return false;
    std::vector<std::string> denied, write, read;
    for (const UserShareEntry& entry : terms.entries) {
        if (entry.right == 'D') {
            if (entry.who == kEverybody) break;
            denied.push_back(entry.who);
            continue;
        }
        std::string& who = (entry.right == 'F' ? write : read).emplace_back(entry.who);
        if (!denied.empty()) (who += kListAnd) += negated(denied);
    }
    const auto readWrite = std::exchange(share.readWrite, {}), readOnly = std::exchange(share.readOnly, {});
    addBoth(readWrite, write, share.readWrite);
    addBoth(readWrite, read, share.readOnly);
    addBoth(readOnly, write, share.readOnly);
    addBoth(readOnly, read, share.readOnly);
    return true;
}

void replaceShare(std::vector<std::string>& list, const std::string& name) {
    for (std::string& entry : list) {
        for (size_t at = 0; (at = entry.find("%S", at)) != std::string::npos; at += name.size()) {
            entry.replace(at, 2, name);
        }
    }
}

void replaceShare(ShareDefinition& share, const std::string& name) {
    for (auto* list : {&share.noAccess, &share.readWrite, &share.readOnly}) replaceShare(*list, name);
}

std::vector<std::string> ignoredOptions(const DefinitionSection& section) {
    std::vector<std::string> keys;
    std::string_view rest = section.value(ShareOption::ignore).text;
    while (!rest.empty()) {
        const std::string_view name = rest.substr(0, rest.find_first_of(",;"));
        rest.remove_prefix(std::min(name.size() + 1, rest.size()));
        const std::string key = withoutBlanks(foldedName(name));
        keys.push_back(limitKey(key).empty() ? key : limitKey(key));
    }
    return keys;
}

// Homes are each user's own, to read and to write; what takes that away closes them.
void judgeHomes(Values& values, const Place& place, const std::vector<std::string>& ignored, ShareReading& reading) {
    const bool ignores = std::find(ignored.begin(), ignored.end(), "readonly") != ignored.end();
    const OptionValue& readOnly = values.value(ShareOption::readOnly);
    reading.isHomes = true;
    if (ignores || !values.boolean(ShareOption::readOnly, true)) return;
    reading.closings.push_back({"read only", readOnly.stated ? readOnly.text : "yes (not stated)",
                                "a user's home is always to read and write here",
                                readOnly.stated ? readOnly.place : place});
}

// The entries stand between slashes; names that are never shown here need none.
std::vector<std::string> vetoOf(std::string_view text) {
    std::vector<std::string> patterns;
    while (!text.empty()) {
        const std::string_view name = text.substr(0, text.find('/'));
        text.remove_prefix(std::min(name.size() + 1, text.size()));
        if (!trimmed(name).empty() && name != "@tmp") patterns.emplace_back(name);
    }
    return patterns;
}

NewFiles newFilesOf(Values& values) {
    NewFiles files;
    files.createMask = values.mode(ShareOption::createMask);
    files.directoryMask = values.mode(ShareOption::directoryMask);
    files.forceCreateMode = values.mode(ShareOption::forceCreateMode).value_or(0);
    files.forceDirectoryMode = values.mode(ShareOption::forceDirectoryMode).value_or(0);
    files.inheritPermissions = values.boolean(ShareOption::inheritPermissions, false);
    files.inheritAcls = values.boolean(ShareOption::inheritAcls, false);
    files.group = values.value(ShareOption::forceGroup).text;
    return files;
}

// Where the share has Samba's module, as a path within the share.
std::string recycleOf(const DefinitionSection& section) {
    const auto objects = section.limits.find("vfsobjects");
    if (objects == section.limits.end()) return {};
    const std::vector<std::string> modules = splitList(objects->second.text);
    const bool loaded = std::any_of(modules.begin(), modules.end(), [](const std::string& module) {
        return std::string_view(module).substr(0, module.find(':')) == "recycle";
    });
    const OptionValue& repository = section.value(ShareOption::recycleRepository);
    if (!loaded) return {};
    const auto path = normalRoot("/" + (repository.stated ? repository.text : std::string(kSambasBin)));
    return path ? path->substr(1) : std::string();
}

Snapshots snapshotsOf(const DefinitionSection& section) {
    Snapshots snapshots;
    // Nothing stated leaves `path` as it is; what is no path makes all of it unknown.
    const auto takePath = [&](ShareOption option, std::string& path, bool relative) {
        const OptionValue& value = section.value(option);
        if (!value.stated) return;
        snapshots.stated = true;
        const bool isAbsolute = value.text.starts_with('/');
        const auto found = normalRoot(isAbsolute ? value.text : "/" + value.text);
        if (!found || (!isAbsolute && !relative) || hasVariables(value.text)) snapshots.known = false;
        if (found) path = isAbsolute ? *found : found->substr(1);
    };
    const auto isOn = [&](ShareOption option) {
        const OptionValue& value = section.value(option);
        return value.stated && parseBoolean(value.text).value_or(false);
    };
    takePath(ShareOption::shadowFolder, snapshots.folder, true);
    takePath(ShareOption::shadowBase, snapshots.base, false);
    takePath(ShareOption::shadowMount, snapshots.mount, false);
    takePath(ShareOption::shadowInside, snapshots.inside, true);
    if (snapshots.inside.starts_with('/')) snapshots.inside.erase(0, 1);
    const OptionValue& format = section.value(ShareOption::shadowFormat);
    if (format.stated) snapshots.format = format.text;
    snapshots.isLocalTime = isOn(ShareOption::shadowLocal);
    snapshots.isEverywhere = isOn(ShareOption::shadowEverywhere);
    snapshots.stated = snapshots.stated || format.stated || snapshots.isEverywhere;
    // Names by these are read otherwise than by the format alone.
    for (const ShareOption option : {ShareOption::shadowPrefix, ShareOption::shadowDelimiter}) {
        if (!section.value(option).text.empty()) snapshots.stated = true, snapshots.known = false;
    }
    if (isOn(ShareOption::shadowScan)) snapshots.stated = true, snapshots.known = false;
    return snapshots;
}

std::string offReason(const DefinitionSection& section, Values& values) {
    const std::string key = foldedName(section.name);
    if (!values.boolean(ShareOption::available, true)) return "available = no";
    if (!values.boolean(ShareOption::valid, true)) return "-valid = no";
    if (values.boolean(ShareOption::printable, false)) return "a printer";
    return key == "printers" || key == "print$" ? "what belongs to printers" : "";
}

ShareDefinition takeOptions(Values& values, const DefinitionSection& section) {
    ShareDefinition share;
    share.name = section.name;
    const std::string& path = section.value(ShareOption::path).text;
    share.path = *normalRoot(templateOf(path.empty() ? std::string(kHome) : path));
    if (!values.boolean(ShareOption::browseable, true)) share.status |= VEXO_SHARE_HIDDEN;
    if (values.boolean(ShareOption::encrypted, false)) share.status |= VEXO_SHARE_ENCRYPTED;
    share.mask = values.number(ShareOption::restriction, UINT_MAX);
    share.ftp = static_cast<int>(values.number(ShareOption::ftp, INT_MAX));
    share.acl = values.boolean(ShareOption::acl, false);
    share.newFiles = newFilesOf(values);
    share.recycle = recycleOf(section);
    share.snapshots = snapshotsOf(section);
    share.synced = values.boolean(ShareOption::synced, false);
    // One index cannot be of as many folders as there are users.
    share.index = values.boolean(ShareOption::index, false) && !hasVariables(share.path) && !section.user;
    share.isUsers = section.user.has_value();
    return share;
}

}  // namespace

ShareReading readShare(const DefinitionSection& section, const LimitValues& global) {
    ShareReading reading;
    Values values(section);
    reading.off = offReason(section, values);
    if (!reading.off.empty()) return reading;
    reading.fault = faultOf(section);
    if (!reading.fault.empty()) return reading;

    ShareDefinition share = takeOptions(values, section);
    const bool readOnly = values.boolean(ShareOption::readOnly, true);
    const std::vector<std::string> ignored = ignoredOptions(section);
    Lists lists = listsOf(section, ignored);
    reading.closings = closingsOf(section.limits, global, ignored);
    std::move(lists.closings.begin(), lists.closings.end(), std::back_inserter(reading.closings));
    const bool ownHomes = isHomesName(section.name) && hasVariables(share.path);
    if (ownHomes) judgeHomes(values, section.place, ignored, reading);
    const OptionValue& veto = section.value(ShareOption::vetoFiles);
    if (std::find(ignored.begin(), ignored.end(), "vetofiles") == ignored.end()) share.veto = vetoOf(veto.text);
    if (const auto variable = unknownVariable(veto.text, ""); variable && !share.veto.empty()) {
        reading.closings.push_back({"veto files", veto.text, *variable + " stands for nothing here", veto.place});
    }
    const OptionValue& path = section.value(ShareOption::path);
    if (const auto variable = unknownVariable(share.path, kPathVariables)) {
        reading.closings.push_back({"path", path.text, *variable + " stands for nothing here", path.place});
    }
    reading.fault = values.fault();
    if (!reading.fault.empty() || !reading.closings.empty()) return reading;
    fillLists(std::move(lists), readOnly && !ownHomes, share);
    if (!ownHomes) replaceShare(share, share.name);
    if (section.user && !limitToTerms(*section.user, share)) {
        reading.fault = "its access list is too long";
        return reading;
    }
    reading.share = std::move(share);
    return reading;
}

ShareDefinition homesOf(const ShareDefinition& homes, const std::string& user) {
    ShareDefinition own = homes;
    replaceShare(own, user);
    return own;
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

std::optional<std::string> replaceVariables(std::string_view path, const PathVariables& variables) {
    std::string out;
    for (size_t i = 0; i < path.size(); ++i) {
        const char letter = path[i] == '%' && i + 1 < path.size() ? path[i + 1] : '\0';
        const std::string* value = letter == 'S'                    ? &variables.share
                                   : letter == 'u'                  ? &variables.user
                                   : letter == 'U'                  ? &variables.name
                                   : letter == 'D'                  ? &variables.domain
                                   : letter == 'g' || letter == 'G' ? &variables.group
                                   : letter == 'H'                  ? &variables.home
                                                                    : nullptr;
        if (value != nullptr && value->empty()) return std::nullopt;
        if (letter == '\0') {
            out += path[i];
            continue;
        }
        if (value != nullptr) {
            out += *value;
        } else {
            out.append(path, i, 2);  // no variable, and what follows does not begin one
        }
        ++i;
    }
    return out;
}

}  // namespace vexo
