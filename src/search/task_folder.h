// The folders that tasks lie in.
#ifndef ORVEL_SEARCH_TASK_FOLDER_H
#define ORVEL_SEARCH_TASK_FOLDER_H

#include <string>

namespace orvel {

// The folder of a volume that holds the task folders of all owners.
[[nodiscard]] std::string searchRoot(const std::string& volume);

// Makes the search root of the volume and, below it, `taskFolder`, as root where the process may become root; what it
// makes has mode 0777. Failures are logged.
void makeTaskFolders(const std::string& volume, const std::string& taskFolder);

}  // namespace orvel

#endif
