// The document of a task, as text and as a record. Pure.
#ifndef VEXO_LINUX_TASK_DOCUMENT_H
#define VEXO_LINUX_TASK_DOCUMENT_H

#include <json/value.h>

#include <cstddef>
#include <optional>
#include <string>

#include "tasks/task_worker.h"

namespace vexo {

constexpr size_t kMaxTaskDocument = size_t{1} << 20;

struct TaskDocument {
    long long created = 0;  // seconds since the epoch
    bool finished = false;
    Worker worker;
    Json::Value properties{Json::objectValue};
};

// The text of a document; nothing when it would not be read again: longer than kMaxTaskDocument, or nested too deeply.
std::optional<std::string> buildTaskDocument(const TaskDocument& document);

// Nothing for anything but a whole document. A member that is missing or of another kind is as in a new record.
std::optional<TaskDocument> parseTaskDocument(const std::string& text);

}  // namespace vexo

#endif
