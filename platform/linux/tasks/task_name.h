// Names of users and tasks as names of files. Pure.
#ifndef VEXO_LINUX_TASK_NAME_H
#define VEXO_LINUX_TASK_NAME_H

#include <optional>
#include <string>
#include <string_view>

namespace vexo {

// `name` with "/", "%" and a leading "." as "%XX"; nothing for "", ".", ".." and for a name that comes out longer than
// 200 bytes. Other bytes stay, so different names give different files, none of them hidden.
std::optional<std::string> fileNameOfTask(std::string_view name);

// The name that gives this file name; nothing when none does.
std::optional<std::string> taskNameOfFile(std::string_view file);

}  // namespace vexo

#endif
