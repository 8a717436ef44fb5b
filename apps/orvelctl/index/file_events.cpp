#include "index/file_events.h"

#include <fcntl.h>
#include <sys/fanotify.h>
#include <sys/statfs.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <memory>

#include "vexo/filesystem.h"

namespace orvel::ctl {
namespace {

constexpr uint64_t kChanges =
    FAN_CREATE | FAN_DELETE | FAN_MOVED_FROM | FAN_MOVED_TO | FAN_ATTRIB | FAN_MODIFY | FAN_CLOSE_WRITE | FAN_ONDIR;
constexpr size_t kBlock = 1 << 16;
constexpr int kBlocks = 16;  // read in one go; what is left waits in the kernel
constexpr const char* kElsewhere = "/";

NoFileEvents failure(const std::string& what) {
    return NoFileEvents(what + ": " + strerror(errno));
}

// Paths in the mount table have "\040" for a blank and so on.
std::string unescaped(const std::string& text) {
    std::string out;
    for (size_t i = 0; i < text.size(); ++i) {
        if (text[i] == '\\' && i + 3 < text.size()) {
            out += static_cast<char>(std::stoi(text.substr(i + 1, 3), nullptr, 8));
            i += 3;
        } else {
            out += text[i];
        }
    }
    return out;
}

// The kernel gives paths so.
std::string withoutLinks(const std::string& path) {
    const std::unique_ptr<char, decltype(&free)> resolved(realpath(path.c_str(), nullptr), free);
    if (resolved == nullptr) throw failure(path);
    return resolved.get();
}

std::vector<std::string> mountsBelow(const std::string& root) {
    std::vector<std::string> found;
    std::ifstream table("/proc/self/mounts");
    std::string device, point, rest;
    while (table >> device >> point && std::getline(table, rest)) {
        point = unescaped(point);
        if (point.starts_with(root + "/")) found.push_back(point);
    }
    return found;
}

}  // namespace

FileEvents::FileEvents(const std::string& root)
    : root_(withoutLinks(root)),
      queue_(fanotify_init(FAN_CLASS_NOTIF | FAN_REPORT_DFID_NAME | FAN_CLOEXEC | FAN_NONBLOCK, O_RDONLY)) {
    if (!queue_) throw failure("the kernel reports no changes");
    points_ = mountsBelow(root_);
    watch(root_);
    for (const std::string& point : points_) {
        // No index holds what lies on a network mount, and its server may be dead.
        if (VEXOFSIsInMountTable(point.c_str()) >= 0 && VEXOFSIsRemoteFS() == 1) continue;
        watch(point);
    }
}

void FileEvents::watch(const std::string& mountPoint) {
    Mount mount{Descriptor(open(mountPoint.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)), {}};
    struct statfs status {};
    if (!mount.folder || fstatfs(mount.folder.get(), &status) != 0) throw failure(mountPoint);
    static_assert(sizeof status.f_fsid == sizeof mount.fileSystem);
    memcpy(mount.fileSystem, &status.f_fsid, sizeof mount.fileSystem);
    if (fanotify_mark(queue_.get(), FAN_MARK_ADD | FAN_MARK_FILESYSTEM, kChanges, mount.folder.get(), nullptr) != 0) {
        throw failure(mountPoint + ": its file system reports no changes");
    }
    mounts_.push_back(std::move(mount));
}

bool FileEvents::mountsChanged() const {
    return mountsBelow(root_) != points_;
}

bool FileEvents::read(Touched& touched, size_t& count) {
    resolved_.clear();
    std::string block(kBlock, '\0');
    for (int i = 0; i < kBlocks; ++i) {
        const ssize_t got = ::read(queue_.get(), block.data(), block.size());
        if (got < 0 && errno == EINTR) continue;
        if (got < 0 && errno != EAGAIN) throw failure("reading what changed");
        if (got <= 0) return true;
        if (!take(std::string_view(block).substr(0, static_cast<size_t>(got)), touched, count)) return false;
    }
    return true;
}

bool FileEvents::take(std::string_view events, Touched& touched, size_t& count) {
    while (events.size() >= sizeof(fanotify_event_metadata)) {
        fanotify_event_metadata event;
        memcpy(&event, events.data(), sizeof event);
        if (event.vers != FANOTIFY_METADATA_VERSION || event.event_len < sizeof event ||
            event.event_len > events.size()) {
            throw NoFileEvents("the kernel reports changes in an unknown form");
        }
        if ((event.mask & FAN_Q_OVERFLOW) != 0) return false;
        if (event.event_len >= event.metadata_len + sizeof(fanotify_event_info_fid) + sizeof(file_handle)) {
            note(events.data() + event.metadata_len, event.mask, touched);
        }
        ++count;
        events.remove_prefix(event.event_len);
    }
    return true;
}

// Behind the handle of the folder stands the name.
void FileEvents::note(const char* folderInfo, unsigned long long changes, Touched& touched) {
    fanotify_event_info_header header;
    file_handle handle;
    memcpy(&header, folderInfo, sizeof header);
    memcpy(&handle, folderInfo + sizeof(fanotify_event_info_fid), sizeof handle);
    std::string folder;
    if (header.info_type != FAN_EVENT_INFO_TYPE_DFID_NAME || !resolve(folderInfo, folder)) return;
    const char* name = folderInfo + sizeof(fanotify_event_info_fid) + sizeof handle + handle.handle_bytes;
    bool& replaced = touched[folder][strcmp(name, ".") == 0 ? "" : name];
    replaced = replaced || (changes & (FAN_MOVED_FROM | FAN_MOVED_TO | FAN_DELETE)) != 0;
}

bool FileEvents::resolve(const char* folderInfo, std::string& path) {
    __kernel_fsid_t fileSystem;
    memcpy(&fileSystem, folderInfo + offsetof(fanotify_event_info_fid, fsid), sizeof fileSystem);
    const char* start = folderInfo + sizeof(fanotify_event_info_fid);
    file_handle header;
    memcpy(&header, start, sizeof header);
    const std::string key(folderInfo + offsetof(fanotify_event_info_fid, fsid),
                          start + sizeof header + header.handle_bytes);
    const auto [known, isNew] = resolved_.try_emplace(key, kElsewhere);
    path = known->second;
    if (!isNew) return path != kElsewhere;
    std::vector<char> handle(start, start + sizeof header + header.handle_bytes);
    for (const Mount& mount : mounts_) {
        if (memcmp(mount.fileSystem, &fileSystem, sizeof mount.fileSystem) != 0) continue;
        const Descriptor folder(
            open_by_handle_at(mount.folder.get(), reinterpret_cast<file_handle*>(handle.data()), O_PATH | O_CLOEXEC));
        char text[PATH_MAX];
        const ssize_t length = folder ? readlink(folder.path().c_str(), text, sizeof text) : -1;
        if (length < 0) continue;  // gone: the folder above reports it
        const std::string_view at(text, static_cast<size_t>(length));
        if (at == root_ || at.starts_with(root_ + "/")) {
            known->second = at.substr(std::min(root_.size() + 1, at.size()));
            break;
        }
    }
    path = known->second;
    return path != kElsewhere;
}

}  // namespace orvel::ctl
