#include "settings/settings_file.h"

#include <algorithm>
#include <charconv>
#include <cstdio>
#include <utility>

#include "failure.h"
#include "io/trusted_file.h"

namespace vexo {
namespace {

constexpr size_t kMaxFile = size_t{16} << 20;
constexpr int kMaxReadings = 100;

std::string pendingPath(const std::string& path) {
    return path + ".pending";
}

// The change that was begun and not ended, if any.
std::optional<PendingChange> readPending(const std::string& path) {
    const KeepErrno keep;
    const Descriptor fd = openTrusted(pendingPath(path), O_RDONLY);
    std::string text;
    if (!fd || !readAll(fd.get(), text, 2 * kMaxFile + 32)) return {};
    return parsePendingChange(text);
}

bool writeFromStart(int fd, std::string_view text) {
    off_t at = 0;
    while (!text.empty()) {
        const ssize_t written = pwrite(fd, text.data(), text.size(), at);
        if (written < 0 && errno == EINTR) continue;
        if (written < 0) return false;
        at += written;
        text.remove_prefix(static_cast<size_t>(written));
    }
    return true;
}

// A change with all that it takes, so that memory cannot run out half-way.
struct Change {
    Change(const std::string& path, PendingChange texts)
        : pending(pendingPath(path)),
          temporary(pending + ".new"),
          announcement(buildPendingChange(texts.before, texts.after)),
          padded(texts.after),
          before(std::move(texts.before)),
          newSize(static_cast<off_t>(texts.after.size())) {
        padded.resize(std::max(padded.size(), before.size()), '\n');
    }
    [[nodiscard]] bool grows() const { return newSize > static_cast<off_t>(before.size()); }

    std::string pending;
    std::string temporary;
    std::string announcement;
    std::string padded;  // with newlines: no reader sees the end of the old text behind the new one
    std::string before;
    off_t newSize;
};

bool overwrite(int fd, std::string_view text, off_t size) {
    return writeFromStart(fd, text) && ftruncate(fd, size) == 0;
}

// Makes the announced change; one that the disk does not hold is taken back.
bool carryOut(int fd, const Change& change) {
    const bool done = overwrite(fd, change.padded, change.newSize);
    const KeepErrno keep;
    RecentLook::forgetAll();
    if (done || overwrite(fd, change.before, static_cast<off_t>(change.before.size()))) unlink(change.pending.c_str());
    return done;
}

// Lays the change beside the file, as readable as the file. The temporary has one name, since the caller's lock keeps
// others out: what a killed process left is made use of.
bool announce(int fd, const Change& change) {
    struct stat status {};
    if (fstat(fd, &status) != 0) return false;
    unlink(change.temporary.c_str());
    const Descriptor beside = openFile(change.temporary, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW, 0600);
    if (beside && writeAll(beside.get(), change.announcement) && fchmod(beside.get(), status.st_mode & 0777) == 0 &&
        rename(change.temporary.c_str(), change.pending.c_str()) == 0) {
        return true;
    }
    const KeepErrno keep;
    if (beside) unlink(change.temporary.c_str());
    // A full disk must not keep anybody from taking a right away: what does not grow goes without.
    return (errno == ENOSPC || errno == EDQUOT) && !change.grows();
}

Descriptor openToChange(const std::string& path, bool create) {
    Descriptor fd = openTrusted(path, O_RDWR);
    if (fd || errno != ENOENT || !create) return fd;
    fd = openTrusted(path, O_RDWR | O_CREAT | O_EXCL, 0644);
    if (!fd && errno == EEXIST) return openTrusted(path, O_RDWR);
    if (fd && fchmod(fd.get(), 0644) != 0) fd.reset();  // whatever the umask
    return fd;
}

}  // namespace

std::string buildPendingChange(std::string_view before, std::string_view after) {
    std::string text = std::to_string(before.size()) + ' ' + std::to_string(after.size()) + '\n';
    return text.append(before).append(after);
}

std::optional<PendingChange> parsePendingChange(std::string_view text) {
    size_t before = 0;
    size_t after = 0;
    const char* const end = text.data() + text.size();
    const auto first = std::from_chars(text.data(), end, before);
    if (first.ec != std::errc() || first.ptr == end || *first.ptr != ' ') return {};
    const auto second = std::from_chars(first.ptr + 1, end, after);
    if (second.ec != std::errc() || second.ptr == end || *second.ptr != '\n') return {};
    text.remove_prefix(static_cast<size_t>(second.ptr + 1 - text.data()));
    if (before > text.size() || after != text.size() - before) return {};
    return PendingChange{std::string(text.substr(0, before)), std::string(text.substr(before))};
}

bool isOnTheWay(std::string_view text, const PendingChange& change) {
    const auto& [before, after] = change;
    if (text.size() < std::min(before.size(), after.size())) return false;
    if (text.size() > std::max(before.size(), after.size())) return false;
    for (size_t i = 0; i < text.size(); ++i) {
        const bool isOld = i < before.size() && text[i] == before[i];
        if (!isOld && text[i] != (i < after.size() ? after[i] : '\n')) return false;
    }
    return true;
}

bool readSettingsFile(const std::string& path, std::string& text, FileVersion& version) {
    // Asked before and after: a change that begins or ends while the file is read is seen in one of the two answers,
    // and one that does both shows in the time of modification.
    auto pending = readPending(path);
    for (int readings = 0; readings < kMaxReadings; ++readings) {
        if (!readRegularFile(path, kMaxFile, text, version)) return false;
        const auto before = std::exchange(pending, readPending(path));
        for (const auto& change : {before, pending}) {
            if (change && isOnTheWay(text, *change)) {
                text = change->after;
                return true;
            }
        }
        struct stat status {};
        if (before == pending && stat(path.c_str(), &status) == 0 && version.isSame(status)) return true;
    }
    return true;
}

bool changeSettingsFile(const std::string& path, bool create,
                        const std::function<std::string(std::string_view)>& edit) {
    const Descriptor fd = openToChange(path, create);
    std::string text;
    if (!fd || !readAll(fd.get(), text, kMaxFile)) return false;
    if (auto unfinished = readPending(path); unfinished && isOnTheWay(text, *unfinished)) {
        text = unfinished->after;
        if (!carryOut(fd.get(), Change(path, std::move(*unfinished)))) return false;
    }
    std::string after = edit(text);
    if (after == text) return true;
    const Change change(path, {std::move(text), std::move(after)});
    return announce(fd.get(), change) && carryOut(fd.get(), change);
}

}  // namespace vexo
