// Small questions that web programs ask about files and texts.
#include <sys/stat.h>

#include "failure.h"
#include "filesystem/mount_table.h"
#include "vexo/filesystem.h"

namespace WebUtils {
namespace {

const vexo::Mount* find(const std::string& path) {
    const vexo::KeepErrno keep;
    if (path.empty()) return nullptr;
    const vexo::MountTable* table = vexo::mountTable();
    return table == nullptr ? nullptr : vexo::mountAt(*table, path);
}

}  // namespace

bool IsMountPoint(std::string path) {
    return find(path) != nullptr;
}

std::string getMountType(std::string path) {
    const vexo::Mount* mount = find(path);
    return mount == nullptr ? std::string() : mount->typeName;
}

std::string GetModifyTime(const char* path) {
    struct stat status;
    if (path == nullptr || stat(path, &status) != 0) return "0";
    return std::to_string(status.st_mtim.tv_sec);
}

std::vector<std::string> StringExplode(const std::string& text, const std::string& delimiter) {
    std::vector<std::string> pieces;
    size_t begin = 0;
    while (begin < text.size()) {
        const size_t found = delimiter.empty() ? std::string::npos : text.find(delimiter, begin);
        const size_t end = found == std::string::npos ? text.size() : found;
        if (end > begin) pieces.push_back(text.substr(begin, end - begin));
        begin = found == std::string::npos ? end : end + delimiter.size();
    }
    return pieces;
}

}  // namespace WebUtils
