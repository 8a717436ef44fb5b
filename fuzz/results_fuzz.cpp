// Any bytes in the place of a database of results: refused or read, and no statement of theirs is run.
#include <fstream>

#include "check.h"
#include "index/index_connections.h"
#include "vexo/index.h"

namespace {

BOOL look(__tag_FI_FILE_INFO_DATA* record, void* bytes) {
    for (const char* text : {record->szName, record->szPath, record->szShare, record->szParent, record->szOwner})
        *static_cast<std::size_t*>(bytes) += std::string_view(text == nullptr ? "" : text).size();
    return 1;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string folder = fuzz::folder() + "/results", file = folder + "/results.db";
    std::filesystem::create_directory(folder);
    std::ofstream(file, std::ios::binary | std::ios::trunc) << fuzz::text(data, size);
    std::size_t bytes = 0;
    for (const __tag_FI_SQL_COND_TYPE column : {FI_COL_NAME, FI_COL_SIZE, FI_COL_TYPE, FI_COL_PATH}) {
        const FIQUERY query = {{{column, 1}, {}}, 1, nullptr, 0, 100};
        unsigned long long count = 0;
        static_cast<void>(FILEIDXCountGet(file.c_str(), &query, &count));
        static_cast<void>(FILEIDXDBSelect(file.c_str(), &query, look, &bytes));
    }
    vexo::fileindex::closeDatabases();
    for (const auto& entry : std::filesystem::directory_iterator(folder)) {
        const std::string name = entry.path().filename();
        fuzz::require(name.starts_with("results.db"));
        std::filesystem::remove(entry.path());
    }
    return 0;
}
