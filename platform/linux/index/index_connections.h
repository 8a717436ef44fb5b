// The databases that this process has open.
#ifndef VEXO_LINUX_INDEX_CONNECTIONS_H
#define VEXO_LINUX_INDEX_CONNECTIONS_H

#include <memory>
#include <mutex>
#include <optional>

#include "base/raised_identity.h"
#include "index/index_database.h"

namespace vexo::fileindex {

// A database for one operation: held against the thread that commits batches which grew old, with the identity to
// reach it. None outlives a call of its caller's functions.
class Lease {
 public:
    // Empty with the slot filled on failure, even if it is only that the last batch could not be committed behind the
    // scenes.
    explicit Lease(const char* path);
    explicit operator bool() const { return database_ != nullptr; }
    Database* operator->() const { return database_; }
    Database& operator*() const { return *database_; }

 private:
    std::unique_lock<std::mutex> lock_;
    std::optional<orvel::RaisedIdentity> raised_;
    Database* database_ = nullptr;
};

// From now on the database at `path`, in the central store, is opened in this mode and reached as root.
void admitDatabase(const std::string& path, OpenMode mode);
// Commits and closes the database and takes that back. False with the slot filled when it could not be committed.
[[nodiscard]] bool dismissDatabase(const std::string& path);
// Commits and closes everything.
void closeDatabases();

}  // namespace vexo::fileindex

#endif
