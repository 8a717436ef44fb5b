#include "index/index_vfs.h"

#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string_view>

#include "io/file_io.h"

namespace vexo::fileindex {
namespace {

constexpr const char* kName = "vexo-index";

// Whether the file may be opened. A missing one may: SQLite answers for it.
bool mayOpen(const char* path) {
    struct stat status {};
    if (lstat(path, &status) != 0) return errno == ENOENT;
    return isTrusted(status, S_IFREG);
}

bool isOurHeader(const std::array<unsigned char, kHeaderSize>& header) {
    static constexpr std::string_view magic("SQLite format 3\0", 16);
    constexpr size_t writeFormat = 18;  // 1 is a rollback journal, 2 a write-ahead log
    constexpr size_t readFormat = 19;
    constexpr size_t encoding = 56;  // 1 is UTF-8, which leaves bytes as they are
    constexpr size_t application = 68;
    const auto number = [&](size_t at) {
        unsigned value = 0;
        for (size_t i = at; i < at + 4; ++i) value = (value << 8) | header[i];
        return value;
    };
    return memcmp(header.data(), magic.data(), magic.size()) == 0 && header[writeFormat] == 1 &&
           header[readFormat] == 1 && number(encoding) == 1 && number(application) == kApplicationId;
}

// An empty file is a database that is being made.
int checkDatabase(sqlite3_file* file) {
    int moved = 1;
    if (file->pMethods->xFileControl(file, SQLITE_FCNTL_HAS_MOVED, &moved) != SQLITE_OK || moved != 0) {
        return SQLITE_CANTOPEN;
    }
    sqlite3_int64 size = 0;
    if (file->pMethods->xFileSize(file, &size) != SQLITE_OK) return SQLITE_IOERR;
    if (size == 0) return SQLITE_OK;
    std::array<unsigned char, kHeaderSize> header{};
    if (file->pMethods->xRead(file, header.data(), kHeaderSize, 0) != SQLITE_OK) return SQLITE_NOTADB;
    return isOurHeader(header) ? SQLITE_OK : SQLITE_NOTADB;
}

sqlite3_vfs* plainFileSystem() {
    return sqlite3_vfs_find("unix");
}

// The checks stand around the opening, since SQLite gives no descriptor to ask.
int openTrusted(sqlite3_vfs* own, const char* path, sqlite3_file* file, int flags, int* given) {
    constexpr int guarded = SQLITE_OPEN_MAIN_DB | SQLITE_OPEN_MAIN_JOURNAL;
    file->pMethods = nullptr;
    const bool isGuarded = path != nullptr && (flags & guarded) != 0;
    if (isGuarded && !mayOpen(path)) return SQLITE_CANTOPEN;
    int result = plainFileSystem()->xOpen(own, path, file, flags, given);
    if (result != SQLITE_OK || !isGuarded) return result;
    if (!mayOpen(path)) result = SQLITE_CANTOPEN;
    if (result == SQLITE_OK && (flags & SQLITE_OPEN_MAIN_DB) != 0) result = checkDatabase(file);
    if (result != SQLITE_OK) {
        file->pMethods->xClose(file);
        file->pMethods = nullptr;
    }
    return result;
}

// Asked for journals alone.
int existsTrusted(sqlite3_vfs* own, const char* path, int flags, int* answer) {
    *answer = 0;
    if (flags == SQLITE_ACCESS_EXISTS) {
        if (std::string_view(path).ends_with("-wal")) return SQLITE_OK;
        if (!mayOpen(path)) return SQLITE_CANTOPEN;
    }
    return plainFileSystem()->xAccess(own, path, flags, answer);
}

bool registerFileSystem() {
    static sqlite3_vfs trusted;
    if (plainFileSystem() == nullptr) return false;
    trusted = *plainFileSystem();
    trusted.pNext = nullptr;
    trusted.zName = kName;
    trusted.xOpen = openTrusted;
    trusted.xAccess = existsTrusted;
    return sqlite3_vfs_register(&trusted, 0) == SQLITE_OK;
}

}  // namespace

const char* trustedFileSystem() {
    static const bool registered = registerFileSystem();
    return registered ? kName : nullptr;
}

std::string resolveFolder(const std::string& path) {
    const size_t slash = path.rfind('/');
    const std::string folder = slash == std::string::npos ? "." : path.substr(0, slash + 1);
    std::array<char, PATH_MAX> resolved{};
    if (realpath(folder.c_str(), resolved.data()) == nullptr) return {};
    std::string out = resolved.data();
    if (out.back() != '/') out += '/';
    return out + path.substr(slash == std::string::npos ? 0 : slash + 1);
}

}  // namespace vexo::fileindex
