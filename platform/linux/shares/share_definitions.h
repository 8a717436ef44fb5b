// The text of share definitions (the grammar of smb.conf) taken apart into sections. Pure: files come in as text.
#ifndef VEXO_LINUX_SHARE_DEFINITIONS_H
#define VEXO_LINUX_SHARE_DEFINITIONS_H

#include <sys/types.h>

#include <array>
#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "shares/share_limits.h"

namespace vexo {

// The options that mean something here. What others may mean: share_limits.h.
enum class ShareOption {
    path,
    available,
    printable,
    browseable,
    readOnly,
    validUsers,
    invalidUsers,
    readList,
    writeList,
    restriction,
    encrypted,
    index,
    synced,
    ftp,
    acl,
    createMask,
    forceCreateMode,
    directoryMask,
    forceDirectoryMode,
    forceGroup,
    inheritPermissions,
    inheritAcls,
    vetoFiles,
    recycleRepository,
    shadowFolder,
    shadowFormat,
    shadowLocal,
    shadowBase,
    shadowMount,
    shadowInside,
    shadowEverywhere,
    shadowPrefix,
    shadowDelimiter,
    shadowScan,
    valid,
    usersharePath,
    usershareMost,
    usershareOwnerOnly,
    usershareAllow,
    usershareDeny,
    usershareTemplate,
    ignore,
};
constexpr size_t kShareOptions = static_cast<size_t>(ShareOption::ignore) + 1;

struct OptionValue {
    std::string text;
    bool stated = false;  // there is a value, be it an empty one
    bool own = false;     // stated by the section itself, so that no `copy` replaces it
    Place place = {};
};
using OptionValues = std::array<OptionValue, kShareOptions>;

// An entry of the access list of a share that a user defines: whom it means, as an entry of a share's lists.
struct UserShareEntry {
    std::string who;
    char right;  // 'R' read, 'F' read and write, 'D' nothing
};

// What only the share of a user has.
struct UserShareTerms {
    uid_t owner;
    std::vector<UserShareEntry> entries;  // the first that decides counts
};

struct DefinitionSection {
    std::string name;  // as first written
    Place place;       // of its first header
    OptionValues values;
    LimitValues limits;
    std::string fault;  // why the section cannot be trusted to mean what its author meant; "" when it can
    Place faultPlace;
    std::optional<UserShareTerms> user;  // whose share it is; nothing for one of the administrator's
    [[nodiscard]] const OptionValue& value(ShareOption option) const { return values[static_cast<size_t>(option)]; }
};

struct Problem {
    std::string text;
    Place place;
};

struct Definitions {
    std::vector<DefinitionSection> sections;  // in order of their first header; [global] is not among them
    std::vector<Problem> problems;            // what is wrong outside every section
    LimitValues global;                       // what [global] says in the end
    OptionValues defaults;                    // the same, of the options that mean something here
    std::vector<std::string> files;           // the names of the included ones, behind "" for the main one
};

// "line 3", or "line 3 of users.conf" for an included file.
[[nodiscard]] std::string placeText(const Definitions& definitions, const Place& place);

// Gives the text of an included file, or nothing when it cannot be read: with errno ENOENT when there is none.
using IncludeReader = std::function<std::optional<std::string>(const std::string& file)>;

// Sections of one name (without case) are one section. A section starts with what [global] said up to its first
// header. An included file continues the section that includes it. `torn`: the text ends within a line, as somebody is
// writing it; its last section is not to be trusted then.
[[nodiscard]] Definitions parseDefinitions(std::string_view text, const IncludeReader& include, bool torn = false);

// The entries of a list: separated by comma, semicolon and blanks, except inside double quotes. "" is an empty entry.
[[nodiscard]] std::vector<std::string> splitList(std::string_view text);

// What a boolean says ("yes", "true", "on", "1" and their opposites, without case); nothing for any other text.
[[nodiscard]] std::optional<bool> parseBoolean(std::string_view text);

// A name as it is compared without case.
[[nodiscard]] std::string foldedName(std::string_view name);

}  // namespace vexo

#endif
