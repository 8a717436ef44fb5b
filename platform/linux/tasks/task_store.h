// The files of one user's tasks. A central store: every function is called with root's identity (see raise.h).
// Functions that return bool leave errno on failure.
#ifndef VEXO_LINUX_TASK_STORE_H
#define VEXO_LINUX_TASK_STORE_H

#include <string>
#include <vector>

#include "io/file_io.h"
#include "tasks/task_document.h"

namespace vexo {

// Opens the folder of a user's tasks; `user` as a file name. Made when it is missing and `make`. Empty with errno,
// EACCES for one that others could fill.
[[nodiscard]] Descriptor openTaskFolder(const std::string& user, bool make);

// Reads the document `file` as it stands at one moment. One that makes no sense is an empty record, made when the file
// was last written. False when there is none that may be trusted.
[[nodiscard]] bool readTask(int folder, const std::string& file, TaskDocument& document);

// Locks the document against other updates until the result is closed. Empty with errno, ENOENT when it is gone.
[[nodiscard]] Descriptor lockTask(int folder, const std::string& file);

// Makes a new one; EEXIST when the name is taken.
[[nodiscard]] bool createTask(int folder, const std::string& file, const TaskDocument& document);
// Replaces a locked one. EFBIG for a document that would not be read again.
[[nodiscard]] bool replaceTask(int folder, const std::string& file, const TaskDocument& document);
// Removes it; true even if it is gone already.
[[nodiscard]] bool removeTask(int folder, const std::string& file);

// The files in the folder that could be tasks.
[[nodiscard]] bool listTaskFiles(int folder, std::vector<std::string>& files);

}  // namespace vexo

#endif
