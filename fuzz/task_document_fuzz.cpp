// Any document of a task: what can be read can be written, and is read back the same.
#include "check.h"
#include "tasks/task_document.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const auto document = vexo::parseTaskDocument(std::string(fuzz::text(data, size)));
    if (!document) return 0;
    const auto built = vexo::buildTaskDocument(*document);
    if (!built) return 0;  // written with every byte escaped it may be too long
    fuzz::require(built->size() <= vexo::kMaxTaskDocument);
    const auto again = vexo::parseTaskDocument(*built);
    fuzz::require(again && again->created == document->created && again->finished == document->finished);
    fuzz::require(vexo::buildTaskDocument(*again) == built);
    return 0;
}
