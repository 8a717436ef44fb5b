// How SQLite reaches the files of an index: only those that may be trusted, in folders where anybody can make some.
#ifndef VEXO_LINUX_INDEX_VFS_H
#define VEXO_LINUX_INDEX_VFS_H

#include <sqlite3.h>

#include <string>

namespace vexo::fileindex {

// The size of SQLite's header of a database file.
constexpr int kHeaderSize = 100;
// What the header calls a database of ours.
constexpr unsigned kApplicationId = 0x56464958;

// The name of SQLite's file system with these rules, registered at the first call; null when that fails. A database and
// its journal are opened only as regular files of one name, owned by root or the effective user and writable by nobody
// else, no link followed. Other journals are no file at all, and a write-ahead log is never looked at: a journal that
// somebody else left would be played back. A database that is not empty must carry our header.
[[nodiscard]] const char* trustedFileSystem();

// `path` with every link in its folder resolved: what SQLite opens without following any. "" with errno.
[[nodiscard]] std::string resolveFolder(const std::string& path);

}  // namespace vexo::fileindex

#endif
