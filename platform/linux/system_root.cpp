#include "vexo/system_root.h"

#include <cstdlib>
#include <filesystem>
#include <system_error>

namespace VEXO {
namespace {

std::string readSystemRoot() {
    // Not plain getenv: a program that gained privileges by exec must not read its settings where the caller says.
    const char* value = secure_getenv("VEXO_ROOT");
    if (value == nullptr || *value == '\0') return {};
    std::error_code failure;
    std::string root = std::filesystem::absolute(value, failure);
    // Rather a root that is not found than the machine's own in its place.
    if (failure) root = value;
    while (root.ends_with('/')) root.pop_back();
    return root;
}

}  // namespace

const std::string& SystemRoot() {
    static const std::string root = readSystemRoot();
    return root;
}

std::string SystemPath(std::string_view path) {
    std::string out;
    out.reserve(SystemRoot().size() + path.size() + 1);
    out += SystemRoot();
    if (!path.starts_with('/')) out += '/';
    out += path;
    return out;
}

}  // namespace VEXO
