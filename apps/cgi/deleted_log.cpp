#include "deleted_log.h"

#include <sys/stat.h>

#include <cerrno>
#include <charconv>
#include <ctime>
#include <optional>
#include <string_view>

#include "base/file.h"
#include "base/hex.h"
#include "base/new_file.h"
#include "base/raised_identity.h"
#include "folder_names.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"

namespace orvel::cgi {
namespace {

constexpr const char* kStore = "/var/lib/vexo/deleted";
constexpr std::string_view kMagic = "ORVDEL01";
constexpr size_t kMostBytes = size_t{16} * 1024 * 1024;  // of a bin, some 100,000 records
constexpr int kTries = 5;

// The file's name: FNV-1a of the path, which stands in it.
std::string nameOf(const std::string& bin) {
    uint64_t hash = 0xcbf29ce484222325U;
    for (const char byte : bin) hash = (hash ^ static_cast<unsigned char>(byte)) * 0x100000001b3U;
    std::string name;
    for (int shift = 56; shift >= 0; shift -= 8) appendHex(static_cast<char>(hash >> shift), name);
    return name;
}

std::string headOf(const RecordedBin& bin) {
    return std::string(kMagic) + '\0' + bin.share + '\0' + bin.path + '\0';
}

std::string lineOf(const std::string& path, const Deletion& deletion) {
    return std::to_string(deletion.time) + " " + std::to_string(deletion.inode) + '\0' + deletion.user + '\0' + path +
           '\0';
}

// Up to the next NUL, which is passed; nothing when there is none.
std::optional<std::string> pieceOf(std::string_view& text) {
    const size_t end = text.find('\0');
    if (end == std::string_view::npos) return std::nullopt;
    std::string piece(text.substr(0, end));
    text.remove_prefix(end + 1);
    return piece;
}

bool parseHead(std::string_view& text, RecordedBin& bin) {
    const auto magic = pieceOf(text), share = pieceOf(text), path = pieceOf(text);
    if (!magic || *magic != kMagic || !share || !path) return false;
    bin = {*share, *path};
    return true;
}

bool parseFacts(const std::string& text, Deletion& deletion) {
    const char *begin = text.data(), *end = begin + text.size();
    const auto time = std::from_chars(begin, end, deletion.time);
    if (time.ec != std::errc() || time.ptr == end || *time.ptr != ' ') return false;
    const auto inode = std::from_chars(time.ptr + 1, end, deletion.inode);
    return inode.ec == std::errc() && inode.ptr == end;
}

Descriptor openStore(bool make) {
    constexpr int flags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW;
    const std::string path = VEXO::SystemPath(kStore);
    Descriptor store = openFile(path, flags);
    if (store || errno != ENOENT || !make) return store;
    constexpr uid_t keep = static_cast<uid_t>(-1);
    if (VEXOFSMkdirP(path.c_str(), nullptr, 1, keep, keep, 0700) != 0) return store;
    return openFile(path, flags);
}

// Opens the bin's file for appending, locked. One that was replaced or removed meanwhile is opened anew.
Descriptor openLog(const Descriptor& store, const RecordedBin& bin) {
    const std::string name = nameOf(bin.path);
    for (int i = 0; i < kTries; ++i) {
        Descriptor file = openFile(store.get(), name.c_str(), O_RDWR | O_APPEND | O_NOFOLLOW);
        struct stat status {};
        if (file && lockFile(file.get(), LOCK_EX) && fstat(file.get(), &status) == 0 && status.st_nlink > 0)
            return file;
        if (!file && errno != ENOENT) return file;
        NewFile made(store.get());
        const bool written = !file && made.create(name, 0600) && writeAll(made.get(), headOf(bin));
        if (!file && (!written || (!made.publish(name, false) && errno != EEXIST))) return file;
    }
    errno = EAGAIN;
    return Descriptor();
}

// Whether it is the file of this bin, and no other one's with the same hash.
bool isOf(const Descriptor& file, const RecordedBin& bin) {
    const std::string head = headOf(bin);
    std::string found(head.size(), '\0');
    return pread(file.get(), found.data(), found.size(), 0) == static_cast<ssize_t>(head.size()) && found == head;
}

}  // namespace

bool noteDeletion(const RecordedBin& bin, const std::string& path, uint64_t inode, const std::string& user) {
    const RaisedIdentity root;
    const Descriptor store = openStore(true);
    const Descriptor file = store ? openLog(store, bin) : Descriptor();
    struct stat status {};
    if (!file || fstat(file.get(), &status) != 0) return false;
    const std::string line = lineOf(path, {time(nullptr), inode, user});
    if (!isOf(file, bin) || static_cast<size_t>(status.st_size) + line.size() > kMostBytes) {
        errno = ENOSPC;
        return false;
    }
    if (writeAll(file.get(), line)) return true;
    const int error = errno;
    [[maybe_unused]] const int ignored = ftruncate(file.get(), status.st_size);
    errno = error;
    return false;
}

Deletions deletionsIn(const std::string& bin) {
    const RaisedIdentity root;
    Deletions found;
    const Descriptor store = openStore(false);
    const Descriptor file = store ? openFile(store.get(), nameOf(bin).c_str(), O_RDONLY | O_NOFOLLOW) : Descriptor();
    std::string text;
    RecordedBin head;
    if (!file || !readAll(file.get(), text, kMostBytes)) return found;
    std::string_view rest = text;
    if (!parseHead(rest, head) || head.path != bin) return found;
    for (;;) {
        const auto facts = pieceOf(rest), user = pieceOf(rest), path = pieceOf(rest);
        Deletion deletion;
        // What a power cut left behind a broken record cannot be told apart.
        if (!facts || !user || !path || !parseFacts(*facts, deletion)) return found;
        deletion.user = *user;
        found[*path] = deletion;
    }
}

bool recordedBins(std::vector<RecordedBin>& bins) {
    const Descriptor store = openStore(false);
    if (!store) return errno == ENOENT;
    std::vector<std::string> names;
    if (!namesIn(store.get(), Hidden::kLeaveOut, names)) return false;
    for (const std::string& name : names) {
        const Descriptor file = openFile(store.get(), name.c_str(), O_RDONLY | O_NOFOLLOW);
        std::string text;
        RecordedBin bin;
        if (!file || !readAll(file.get(), text, kMostBytes)) continue;
        std::string_view rest = text;
        if (parseHead(rest, bin) && nameOf(bin.path) == name) bins.push_back(bin);
    }
    return true;
}

bool keepDeletions(const RecordedBin& bin, const Deletions& kept) {
    const Descriptor store = openStore(false);
    const Descriptor file = store ? openLog(store, bin) : Descriptor();
    const std::string name = nameOf(bin.path);
    if (!file || !isOf(file, bin)) return false;
    // What was added since it was looked at stays.
    Deletions now = deletionsIn(bin.path);
    std::string text = headOf(bin);
    for (const auto& [path, deletion] : now) {
        const auto found = kept.find(path);
        const bool since = deletion.time >= time(nullptr) - 3600;
        if (since || (found != kept.end() && found->second.inode == deletion.inode)) text += lineOf(path, deletion);
    }
    if (text.size() == headOf(bin).size()) return unlinkat(store.get(), name.c_str(), 0) == 0;
    NewFile anew(store.get());
    return anew.create(name, 0600) && writeAll(anew.get(), text) && anew.publish(name, true);
}

}  // namespace orvel::cgi
