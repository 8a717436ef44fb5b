#include "operation/unpack.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <climits>

#include "archive_library.h"
#include "archive_reader.h"
#include "base/new_file.h"
#include "free_names.h"
#include "operation/member_path.h"
#include "orvel/error_state.h"
#include "vexo/filesystem.h"
#include "vexo/settings.h"
#include "vexo/share_files.h"

namespace orvel::cgi {
namespace {

constexpr long long kMiB = 1024LL * 1024;
constexpr long long kNeverMeasured = 64 * kMiB;
constexpr int kMostNumbers = 9999;
constexpr int kSkipped = -1;  // beside library codes
constexpr int kStopped = -2;

int codeOf(int error) {
    return OrvParseErrnoToError(error, nullptr, nullptr);
}

long long setting(const char* key, long long fallback) {
    const std::string text = VexoConf::Info().Get(key, "");
    long long value = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    return error == std::errc() && end == text.data() + text.size() && value > 0 ? value : fallback;
}

// The product, or the largest number.
long long times(long long a, long long b) {
    long long product = 0;
    return __builtin_mul_overflow(a, b, &product) ? LLONG_MAX : product;
}

std::string joined(const std::vector<std::string>& components) {
    std::string path = ".";
    for (const std::string& component : components) path += "/" + component;
    return path;
}

}  // namespace

struct Unpacker::Member {
    archive_entry* entry;
    std::vector<std::string> folders;
    std::string name;
    std::string path;   // share-relative
    Descriptor folder;  // that holds it
    // Archives do not give the type of a further name.
    [[nodiscard]] mode_t type() const {
        return libarchive.archive_entry_hardlink(entry) != nullptr ? mode_t{AE_IFREG}
                                                                   : libarchive.archive_entry_filetype(entry);
    }
    [[nodiscard]] bool isEncrypted() const { return libarchive.archive_entry_is_encrypted(entry) != 0; }
    [[nodiscard]] mode_t mode() const { return libarchive.archive_entry_perm(entry); }
    [[nodiscard]] timespec modified() const {
        if (libarchive.archive_entry_mtime_is_set(entry) == 0) return {0, UTIME_NOW};
        return {libarchive.archive_entry_mtime(entry), libarchive.archive_entry_mtime_nsec(entry)};
    }
    [[nodiscard]] bool isThere(struct stat& status) const {
        return fstatat(folder.get(), name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0;
    }
};

UnpackLimits UnpackLimits::of(long long archiveSize) {
    const long long byRatio = times(archiveSize, setting("extract_max_ratio", 200));
    const long long most = times(setting("extract_max_size", kMiB), kMiB);
    return {std::min(std::max(byRatio, kNeverMeasured), most), setting("extract_max_members", 1000000)};
}

int Unpacker::run(int file, const UnpackLimits& limits) {
    limits_ = limits;
    bytes_ = members_ = folders_ = consumed_ = 0;
    skippedBytes_ = 0;
    exceeded_ = torn_ = locked_ = false;
    missing_ = target_.chosen;
    int code = ORV_ERR_NONE;
    const auto source = openArchive(file, target_.password, code);
    if (source != nullptr) code = readAll(source.get());
    finishFolders();
    return code;
}

int Unpacker::readAll(archive* source) {
    for (;;) {
        if (progress_.stopped()) return ORV_ERR_NONE;
        archive_entry* entry = nullptr;
        const int result = libarchive.archive_read_next_header(source, &entry);
        if (result == ARCHIVE_EOF) return ORV_ERR_NONE;
        if (result == ARCHIVE_RETRY) continue;
        if (result < ARCHIVE_WARN) return codeOfEnd(source);
        if (++members_ > limits_.members) return ORV_ERR_FILE_TOO_BIG;
        take(source, entry);
        if (exceeded_) return ORV_ERR_FILE_TOO_BIG;
        if (locked_) return takesPassword(source) ? static_cast<int>(ORV_ERR_ARCHIVE_PASSWORD) : kArchiveLocked.code;
        if (torn_) return codeOfEnd(source);
        tellConsumed(source);
    }
}

// Why the archive could not be read to its end.
int Unpacker::codeOfEnd(archive* source) const {
    if (wantsTooMuchMemory(source)) return kArchiveDemanding.code;
    if (members_ == 0 && hidesNames(source)) return kArchiveLocked.code;
    return members_ == 0 ? ORV_ERR_ARCHIVE : ORV_ERR_ARCHIVE_DATA;
}

// How much of the archive was read.
void Unpacker::tellConsumed(archive* source) {
    const long long consumed = libarchive.archive_filter_bytes(source, -1);
    progress_.bytes(std::max(consumed - consumed_, 0LL));
    consumed_ = std::max(consumed, consumed_);
}

void Unpacker::take(archive* source, archive_entry* entry) {
    const std::string name = nameOfMember(source, entry);
    auto components = memberComponents(name);
    if (!target_.inside.empty() || !target_.chosen.empty()) {
        if (!components || !isChosen(*components)) return skip(source);
        const std::string path = target_.path + joined(*components).substr(1);
        return give(source, entry, path, std::move(*components));
    }
    const std::string shown = target_.path + "/" + name;
    if (components) return give(source, entry, shown, std::move(*components));
    // The top itself, as archives of "." have it, is no failure.
    const bool top = libarchive.archive_entry_filetype(entry) == AE_IFDIR && !name.empty() && name.front() != '/' &&
                     name.find_first_not_of("./") == std::string::npos && name.find("..") == std::string::npos;
    progress_.expect(1, 0);
    progress_.begin(shown);
    if (top) return progress_.done();
    progress_.failed(shown, ORV_ERR_ILLEGAL_NAME);
}

// Whether the member of these components was chosen; they are then those below the folder that it was chosen in.
bool Unpacker::isChosen(std::vector<std::string>& components) {
    const std::vector<std::string>& inside = target_.inside;
    if (components.size() <= inside.size() || !std::equal(inside.begin(), inside.end(), components.begin()))
        return false;
    components.erase(components.begin(), components.begin() + static_cast<std::ptrdiff_t>(inside.size()));
    if (target_.chosen.count(components.front()) == 0) return target_.chosen.empty();
    missing_.erase(components.front());
    return true;
}

// What has to be read to reach the next member is read in pieces, so that it can be stopped, and ends as what is
// unpacked does.
void Unpacker::skip(archive* source) {
    while (readsThrough(source) && !progress_.stopped()) {
        const void* block = nullptr;
        size_t size = 0;
        la_int64_t offset = 0;
        const int result = libarchive.archive_read_data_block(source, &block, &size, &offset);
        if (result == ARCHIVE_RETRY) continue;
        if (result == ARCHIVE_EOF || result < ARCHIVE_WARN) return;  // the next member says what is wrong
        skippedBytes_ += static_cast<long long>(size);
        exceeded_ = skippedBytes_ > limits_.bytes;
        if (exceeded_) return;
        tellConsumed(source);
    }
}

void Unpacker::give(archive* source, archive_entry* entry, const std::string& shown,
                    std::vector<std::string> components) {
    progress_.expect(1, 0);
    progress_.begin(shown);
    Member member = {
        .entry = entry, .folders = std::move(components), .name = {}, .path = shown, .folder = Descriptor()};
    member.name = std::move(member.folders.back());
    member.folders.pop_back();
    const int code = place(source, member);
    if (code == ORV_ERR_NONE) {
        names_.insert(member.folders.empty() ? member.name : member.folders.front());
        progress_.done();
    } else if (code == kSkipped) {
        progress_.skipped();
    } else if (code == ORV_ERR_ARCHIVE_PASSWORD) {
        locked_ = true;  // it is the archive that wants one
        progress_.skipped();
    } else if (code != kStopped) {
        progress_.failed(shown, code);
    }
}

int Unpacker::place(archive* source, Member& member) {
    if (member.path.size() >= PATH_MAX) return ORV_ERR_LONG_PATH;
    int code = enter(member.folders, member.folder);
    if (code == ORV_ERR_NONE) code = checkNewName(member.folder, member.name);
    if (code != ORV_ERR_NONE) return code;
    if (libarchive.archive_entry_hardlink(member.entry) != nullptr) return makeHardLink(member);
    if (member.isEncrypted() && (target_.password.empty() || !takesPassword(source))) return ORV_ERR_ARCHIVE_PASSWORD;
    switch (libarchive.archive_entry_filetype(member.entry)) {
        case AE_IFREG:
            return makeFile(source, member);
        case AE_IFDIR:
            return makeFolder(member);
        case AE_IFLNK:
            return makeLink(member);
        default:
            return ORV_ERR_DENIED;  // devices, pipes
    }
}

// Opens the folder, creating missing parts. Links in it are not followed.
int Unpacker::enter(const std::vector<std::string>& folders, Descriptor& folder) {
    constexpr int flags = O_PATH | O_DIRECTORY;
    // The system's own folders are refused even if they exist.
    const auto isHidden = [](const std::string& name) { return VEXOEAIsHiddenFile(name.c_str()) != 0; };
    VEXOShareNamesOf(target_.folder.get());
    if (std::any_of(folders.begin(), folders.end(), isHidden)) return ORV_ERR_RESERVED_NAME;
    folder = openBeneath(target_.folder, joined(folders), LinkPolicy::kNone, flags);
    if (folder) return ORV_ERR_NONE;
    if (errno != ENOENT) return refusalCode(errno, "");
    folder = openBeneath(target_.folder, ".", LinkPolicy::kNone, flags);
    for (const std::string& name : folders) {
        Descriptor next = openBeneath(folder, name, LinkPolicy::kNone, flags);
        if (!next && errno == ENOENT) {
            const int code = checkNewName(folder, name);
            if (code != ORV_ERR_NONE) return code;
            exceeded_ = ++folders_ > limits_.members;  // one member may lie in thousands
            if (exceeded_) return ORV_ERR_FILE_TOO_BIG;
            if (mkdirat(folder.get(), name.c_str(), 0755) != 0) return codeOf(errno);
            next = openBeneath(folder, name, LinkPolicy::kNone, flags);
            if (next &&
                VEXOShareGiveNew(folder.get(), next.get(), 0777, 0, target_.owner.uid, target_.owner.gid) != 0) {
                return codeOf(errno);
            }
        }
        if (!next) return refusalCode(errno, "");
        folder = std::move(next);
    }
    return ORV_ERR_NONE;
}

int Unpacker::makeFolder(const Member& member) {
    struct stat there {};
    if (member.isThere(there)) return S_ISDIR(there.st_mode) ? ORV_ERR_NONE : ORV_ERR_EXISTS;
    std::vector<std::string> all = member.folders;
    all.push_back(member.name);
    Descriptor made;
    const int code = enter(all, made);
    if (code == ORV_ERR_NONE) madeFolders_.push_back({joined(all), member.mode(), member.modified()});
    return code;
}

// Gives what was made its name, by the policy: `give` takes the name and whether to replace what has it. 0, kSkipped or
// a library code.
template <class Give>
int Unpacker::nameIt(Member& member, Give give) {
    const std::string wanted = member.name;
    bool given = give(wanted, false);
    if (given || errno != EEXIST) return given ? static_cast<int>(ORV_ERR_NONE) : codeOf(errno);
    switch (target_.conflict) {
        case Conflict::kError:
            return ORV_ERR_EXISTS;
        case Conflict::kSkip:
            return kSkipped;
        case Conflict::kOverwrite:
            if (struct stat there{}; member.isThere(there) && (there.st_mode & S_IFMT) != member.type()) {
                return ORV_ERR_EXISTS;
            }
            return give(wanted, true) ? static_cast<int>(ORV_ERR_NONE) : codeOf(errno);
        case Conflict::kKeepBoth:
            break;
    }
    Numbered& last = numbered_[joined(member.folders) + "/" + wanted];
    while (!given && last.number < kMostNumbers) {
        member.name = numberedName(wanted, ++last.number, false);
        given = give(member.name, false);
        if (!given && errno != EEXIST) break;
    }
    if (given) last.name = member.name;
    return given ? static_cast<int>(ORV_ERR_NONE) : codeOf(errno);
}

int Unpacker::makeFile(archive* source, Member& member) {
    struct stat there {};
    if (target_.conflict == Conflict::kSkip && member.isThere(there)) return kSkipped;
    if (libarchive.archive_entry_size(member.entry) > limits_.bytes - bytes_) {
        exceeded_ = true;
        return ORV_ERR_FILE_TOO_BIG;
    }
    NewFile file(member.folder.get());
    if (!file.create(member.name, 0600)) return codeOf(errno);
    const int code = fill(source, member, file.get());
    if (code != ORV_ERR_NONE) return code;
    // A file that its owner could not read or write would be of no use to him.
    if (VEXOShareGiveNew(member.folder.get(), file.get(), (member.mode() & 0755) | 0600, VEXO_NEW_OWN_MODE,
                         target_.owner.uid, target_.owner.gid) != 0) {
        return codeOf(errno);
    }
    const std::array<timespec, 2> when = {timespec{0, UTIME_NOW}, member.modified()};
    futimens(file.get(), when.data());
    struct stat made {};
    if (fstat(file.get(), &made) != 0) return codeOf(errno);
    const int named =
        nameIt(member, [&file](const std::string& name, bool replace) { return file.publish(name, replace); });
    if (named == ORV_ERR_NONE) unpacked_.insert({made.st_dev, made.st_ino});
    return named;
}

// Writes the member's data; what the archive leaves out stays a hole.
int Unpacker::fill(archive* source, const Member& member, int file) {
    long long end =
        libarchive.archive_entry_size_is_set(member.entry) != 0 ? libarchive.archive_entry_size(member.entry) : 0;
    end = std::max(end, 0LL);
    const long long before = bytes_;
    for (;;) {
        const void* block = nullptr;
        size_t size = 0;
        la_int64_t offset = 0;
        const int result = libarchive.archive_read_data_block(source, &block, &size, &offset);
        if (result == ARCHIVE_EOF) break;
        if (result == ARCHIVE_RETRY) continue;
        if (result < ARCHIVE_WARN) {
            torn_ = result == ARCHIVE_FATAL;
            // One password in a few hundred passes for the right one until the data does not fit.
            return member.isEncrypted() && !torn_ ? ORV_ERR_ARCHIVE_PASSWORD : ORV_ERR_ARCHIVE_DATA;
        }
        if (progress_.stopped()) return kStopped;
        if (offset < 0 || offset > limits_.bytes - before - static_cast<long long>(size)) {
            exceeded_ = true;
            return ORV_ERR_FILE_TOO_BIG;
        }
        for (size_t done = 0; done < size;) {
            const ssize_t put =
                pwrite(file, static_cast<const char*>(block) + done, size - done, offset + static_cast<off_t>(done));
            if (put < 0 && errno == EINTR) continue;
            if (put <= 0) return codeOf(put < 0 ? errno : ENOSPC);
            done += static_cast<size_t>(put);
        }
        end = std::max(end, static_cast<long long>(offset) + static_cast<long long>(size));
        bytes_ = before + end;
        tellConsumed(source);
    }
    bytes_ = before + end;
    return ftruncate(file, end) == 0 ? static_cast<int>(ORV_ERR_NONE) : codeOf(errno);
}

int Unpacker::makeLink(Member& member) {
    const char* text = libarchive.archive_entry_symlink(member.entry);
    if (text == nullptr || !staysInside(text, member.folders.size())) return ORV_ERR_DENIED;
    return nameIt(member, [&](const std::string& name, bool replace) {
        return putLink(member.folder.get(), name, text, replace);
    });
}

// Opens the folder of the file that this unpacking made for the member of that path, and reports the name that it got.
// What else has the member's name is the user's. False with the library code.
bool Unpacker::findUnpacked(std::vector<std::string> components, Descriptor& folder, std::string& name,
                            int& code) const {
    const auto numbered = numbered_.find(joined(components));
    std::vector<std::string> names = {components.back()};
    if (numbered != numbered_.end()) names.push_back(numbered->second.name);
    components.pop_back();
    folder = openBeneath(target_.folder, joined(components), LinkPolicy::kNone, O_PATH | O_DIRECTORY);
    code = folder ? static_cast<int>(ORV_ERR_MISSING) : refusalCode(errno, "");
    for (const std::string& candidate : names) {
        struct stat status {};
        if (!folder || fstatat(folder.get(), candidate.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) continue;
        name = candidate;
        if (unpacked_.count({status.st_dev, status.st_ino}) != 0) return true;
    }
    return false;
}

// One more name of a member that was unpacked before.
int Unpacker::makeHardLink(Member& member) {
    auto other = memberComponents(libarchive.archive_entry_hardlink(member.entry));
    if (!other) return ORV_ERR_ILLEGAL_NAME;
    if (!isChosen(*other)) return ORV_ERR_MISSING;
    struct stat there {};
    if (member.isThere(there) && target_.conflict == Conflict::kSkip) return kSkipped;
    Descriptor from;
    std::string unpacked;
    int code = ORV_ERR_NONE;
    if (!findUnpacked(*other, from, unpacked, code)) return code;
    return nameIt(member, [&](const std::string& name, bool replace) {
        return putHardLink(from.get(), unpacked, member.folder.get(), name, replace);
    });
}

// Folders get their permissions and times last: they were to be written in.
void Unpacker::finishFolders() {
    for (auto folder = madeFolders_.rbegin(); folder != madeFolders_.rend(); ++folder) {
        const Descriptor opened =
            openBeneath(target_.folder, folder->path, LinkPolicy::kNone, O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
        if (!opened) continue;
        const Descriptor above(openat(opened.get(), "..", O_PATH | O_DIRECTORY | O_CLOEXEC));
        constexpr uid_t keep = static_cast<uid_t>(-1);
        if (above) {
            VEXOShareGiveNew(above.get(), opened.get(), (folder->mode & 0755) | 0700, VEXO_NEW_OWN_MODE, keep, keep);
        }
        const std::array<timespec, 2> when = {timespec{0, UTIME_NOW}, folder->modified};
        futimens(opened.get(), when.data());
    }
    madeFolders_.clear();
}

}  // namespace orvel::cgi
