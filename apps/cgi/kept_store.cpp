#include "kept_store.h"

#include <sys/stat.h>

#include <cerrno>

#include "base/file.h"
#include "base/new_file.h"
#include "base/random.h"
#include "user_folder.h"

namespace orvel::cgi {
namespace {

constexpr size_t kIdLength = 32;
constexpr OwnStore kStore = {"/var/lib/vexo/listings", kMostKept, kMostKeptBytes, kKeptSeconds, isKeptId};

}  // namespace

bool isKeptId(std::string_view text) {
    return text.size() == kIdLength && text.find_first_not_of(kLowerHex) == std::string_view::npos;
}

KeptResult keepBytes(const std::string& user, std::string_view bytes, std::string& id) {
    const auto size = static_cast<long long>(bytes.size());
    if (size > kMostKeptBytes) return KeptResult::kFull;
    const Descriptor folder = openUserFolder(kStore.path, user, true);
    id = draw<kIdLength / 2>();
    if (!folder || id.empty()) return KeptResult::kFailed;
    NewFile file(folder.get());
    if (!file.create(id, 0600) || !writeAll(file.get(), bytes)) return KeptResult::kFailed;
    // What comes at the same time is counted, too.
    if (!lockFile(folder.get(), LOCK_EX)) return KeptResult::kFailed;
    if (!makeRoom(kStore, folder, size)) return KeptResult::kFull;
    return file.publish(id, false) ? KeptResult::kDone : KeptResult::kFailed;
}

Descriptor openKept(const std::string& user, const std::string& id) {
    errno = ENOENT;
    const Descriptor folder = isKeptId(id) ? openUserFolder(kStore.path, user, false) : Descriptor();
    Descriptor file = folder ? openOwnFile(folder, id) : Descriptor();
    struct stat status {};
    const bool there = file && fstat(file.get(), &status) == 0 && S_ISREG(status.st_mode) && !kStore.isOver(status) &&
                       lockFile(file.get(), LOCK_SH | LOCK_NB) && fstat(file.get(), &status) == 0 &&
                       status.st_nlink > 0;
    if (!there || futimens(file.get(), nullptr) != 0) return Descriptor();
    return file;
}

void dropKept(const std::string& user, const std::string& id) {
    const Descriptor folder = isKeptId(id) ? openUserFolder(kStore.path, user, false) : Descriptor();
    if (folder) static_cast<void>(removeUnheld(folder, id));
}

OwnSweep sweepKeptListings() {
    return sweepOwn(kStore);
}

}  // namespace orvel::cgi
