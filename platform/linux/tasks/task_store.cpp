#include "tasks/task_store.h"

#include <dirent.h>
#include <sys/stat.h>

#include <memory>

#include "base/new_file.h"
#include "failure.h"
#include "io/file_io.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"

namespace vexo {
namespace {

constexpr const char* kPlatformFolder = "/var/lib/vexo";
constexpr const char* kStoreFolder = "/var/lib/vexo/tasks";
constexpr int kAttempts = 1000;  // at a file that is replaced all the time

struct CloseFolder {
    void operator()(DIR* folder) const {
        const KeepErrno keep;
        closedir(folder);
    }
};

// No file of a task has such a name. One is enough: only who holds the document's lock writes it.
std::string temporaryOf(const std::string& file) {
    return ".new-" + file;
}

Descriptor openTrustedFolder(int parent, const std::string& path) {
    Descriptor folder = openFile(parent, path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
    struct stat status {};
    if (folder && (fstat(folder.get(), &status) != 0 || !isTrusted(status, S_IFDIR))) {
        errno = EACCES;
        return Descriptor();
    }
    return folder;
}

bool makeStore() {
    constexpr uid_t keep = static_cast<uid_t>(-1);
    return VEXOFSMkdirP(VEXO::SystemPath(kPlatformFolder).c_str(), nullptr, 1, keep, keep, 0755) == 0 &&
           (mkdir(VEXO::SystemPath(kStoreFolder).c_str(), 0700) == 0 || errno == EEXIST);
}

// Opens what has the name `file` at one moment. A file that was replaced since it was opened has no name left; `isOurs`
// says whether one with a name may be used.
Descriptor openTask(int folder, const std::string& file, struct stat& status) {
    for (int attempt = 0; attempt < kAttempts; ++attempt) {
        Descriptor fd = openFile(folder, file.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
        if (!fd || fstat(fd.get(), &status) != 0) return Descriptor();
        if (isTrusted(status, S_IFREG)) return fd;
        if (status.st_nlink != 0) break;
    }
    errno = EACCES;
    return Descriptor();
}

bool stillNamed(int folder, const std::string& file, const struct stat& locked) {
    struct stat now {};
    return fstatat(folder, file.c_str(), &now, AT_SYMLINK_NOFOLLOW) == 0 && isSameFile(now, locked);
}

// Written, but not brought to the disk: after a power cut no task runs any more, and a torn document says so, too.
bool writeNew(int folder, const std::string& name, const std::string& text) {
    constexpr int flags = O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW;
    Descriptor fd = openFile(folder, name.c_str(), flags, 0600);
    if (!fd && errno == EEXIST && unlinkat(folder, name.c_str(), 0) == 0) {  // of a writer that was killed
        fd = openFile(folder, name.c_str(), flags, 0600);
    }
    return fd && writeAll(fd.get(), text);
}

bool build(const TaskDocument& document, std::string& text) {
    auto built = buildTaskDocument(document);
    if (!built) {
        errno = EFBIG;
        return false;
    }
    text = std::move(*built);
    return true;
}

}  // namespace

Descriptor openTaskFolder(const std::string& user, bool make) {
    if (make && !makeStore()) return Descriptor();
    const Descriptor store = openTrustedFolder(AT_FDCWD, VEXO::SystemPath(kStoreFolder));
    if (!store) return Descriptor();
    if (make && mkdirat(store.get(), user.c_str(), 0700) != 0 && errno != EEXIST) return Descriptor();
    return openTrustedFolder(store.get(), user);
}

bool readTask(int folder, const std::string& file, TaskDocument& document) {
    struct stat status {};
    const Descriptor fd = openTask(folder, file, status);
    if (!fd) return false;
    std::string text;
    const bool whole = readAll(fd.get(), text, kMaxTaskDocument);
    if (!whole && errno != EFBIG) return false;
    if (auto parsed = parseTaskDocument(text); whole && parsed) {
        document = std::move(*parsed);
    } else {
        document = TaskDocument{};
        document.created = status.st_mtime;
    }
    return true;
}

Descriptor lockTask(int folder, const std::string& file) {
    for (int attempt = 0; attempt < kAttempts; ++attempt) {
        struct stat status {};
        Descriptor fd = openTask(folder, file, status);
        if (!fd || !lockFile(fd.get(), LOCK_EX)) return Descriptor();
        if (stillNamed(folder, file, status)) return fd;
    }
    errno = EAGAIN;
    return Descriptor();
}

bool createTask(int folder, const std::string& file, const TaskDocument& document) {
    std::string text;
    orvel::NewFile part(folder);
    return build(document, text) && part.create(file, 0600) && writeAll(part.get(), text) && part.publish(file, false);
}

bool replaceTask(int folder, const std::string& file, const TaskDocument& document) {
    std::string text;
    if (!build(document, text)) return false;
    const std::string temporary = temporaryOf(file);
    if (writeNew(folder, temporary, text) && renameat(folder, temporary.c_str(), folder, file.c_str()) == 0)
        return true;
    const KeepErrno keep;
    unlinkat(folder, temporary.c_str(), 0);
    return false;
}

bool removeTask(int folder, const std::string& file) {
    const Descriptor lock = lockTask(folder, file);
    if (!lock) return errno == ENOENT;
    unlinkat(folder, temporaryOf(file).c_str(), 0);
    return unlinkat(folder, file.c_str(), 0) == 0;
}

bool listTaskFiles(int folder, std::vector<std::string>& files) {
    Descriptor again = openFile(folder, ".", O_RDONLY | O_DIRECTORY);
    const std::unique_ptr<DIR, CloseFolder> names(again ? fdopendir(again.get()) : nullptr);
    if (!names) return false;
    static_cast<void>(again.release());
    while (true) {
        errno = 0;
        const dirent* entry = readdir(names.get());
        if (entry == nullptr) return errno == 0;
        if (entry->d_name[0] != '.') files.emplace_back(entry->d_name);
    }
}

}  // namespace vexo
