// The file of applications, docs/formats/applications.md. Pure: text in, who may use what out.
#ifndef VEXO_LINUX_APPLICATION_LIST_H
#define VEXO_LINUX_APPLICATION_LIST_H

#include <map>
#include <string>
#include <string_view>
#include <vector>

namespace vexo {

struct ApplicationList {
    std::map<std::string, std::vector<std::string>> users;  // of an identifier: names, "@group", "*"
    std::vector<int> malformed;  // numbers of the lines without a colon: their first word is an identifier of nobody's
};

// Lines of one identifier add up.
[[nodiscard]] ApplicationList parseApplications(std::string_view text);

}  // namespace vexo

#endif
