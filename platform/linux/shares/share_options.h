// What a section of the share definitions means: a share, or the reason why it is not one. Pure.
#ifndef VEXO_LINUX_SHARE_OPTIONS_H
#define VEXO_LINUX_SHARE_OPTIONS_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "shares/share_definitions.h"

namespace vexo {

struct ShareDefinition {
    std::string name;
    std::string path;     // absolute, possibly with variables
    unsigned status = 0;  // VEXO_SHARE_...
    unsigned mask = 0;    // restriction
    int ftp = 0;
    bool acl = false;
    bool synced = false;
    bool index = false;
    std::vector<std::string> noAccess;
    std::vector<std::string> readWrite;
    std::vector<std::string> readOnly;
};

struct ShareReading {
    std::optional<ShareDefinition> share;
    std::string fault;  // why the section is malformed; "" without a share: switched off, or a printer
};

[[nodiscard]] ShareReading readShare(const DefinitionSection& section);

// `path` without repeated and trailing slashes when it is absolute, has a component or more, and neither "." nor ".."
// is one; else nothing.
[[nodiscard]] std::optional<std::string> normalRoot(std::string_view path);

// What the variables of a path stand for.
struct PathVariables {
    std::string share;   // %S
    std::string user;    // %u, the whole name
    std::string name;    // %U, the name without its domain
    std::string domain;  // %D
    std::string group;   // %g, the primary group
};

[[nodiscard]] bool hasVariables(std::string_view path);
// Other uses of "%" stay as they are.
[[nodiscard]] std::string replaceVariables(std::string_view path, const PathVariables& variables);

}  // namespace vexo

#endif
