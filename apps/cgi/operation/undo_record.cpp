#include "operation/undo_record.h"

#include <fcntl.h>

#include <array>
#include <cerrno>
#include <charconv>
#include <cstdlib>

#include "base/file.h"
#include "base/hex.h"
#include "base/new_file.h"
#include "file_system.h"
#include "orvel/error_state.h"
#include "user_folder.h"

namespace orvel::cgi {
namespace {

constexpr std::string_view kPrefix = "Quorvane_";
constexpr size_t kDigits = 16;
constexpr long long kMostBytes = 16LL * 1024 * 1024;  // of one record, some 100,000 items
constexpr OwnStore kStore = {"/var/lib/vexo/undo", 100, 64LL * 1024 * 1024, 2LL * 24 * 60 * 60, isOperationId};
constexpr std::string_view kBeginning("ORVUNDO2\0", 9);
constexpr size_t kFacts = 8;

std::array<long long, kFacts> factsOf(const UndoItem& item) {
    const struct stat& status = item.status;
    return {static_cast<long long>(item.fileSystem),       static_cast<long long>(status.st_ino),
            static_cast<long long>(status.st_mode),        static_cast<long long>(status.st_size),
            static_cast<long long>(status.st_mtim.tv_sec), static_cast<long long>(status.st_mtim.tv_nsec),
            static_cast<long long>(status.st_ctim.tv_sec), static_cast<long long>(status.st_ctim.tv_nsec)};
}

void takeFacts(const std::array<long long, kFacts>& facts, UndoItem& item) {
    struct stat& status = item.status;
    item.fileSystem = static_cast<std::uint64_t>(facts[0]);
    status.st_ino = static_cast<ino_t>(facts[1]);
    status.st_mode = static_cast<mode_t>(facts[2]);
    status.st_size = facts[3];
    status.st_mtim = {static_cast<time_t>(facts[4]), static_cast<long>(facts[5])};
    status.st_ctim = {static_cast<time_t>(facts[6]), static_cast<long>(facts[7])};
}

std::string lineOf(const UndoItem& item) {
    std::string line(1, static_cast<char>(item.deed));
    for (const long long fact : factsOf(item)) line += " " + std::to_string(fact);
    return line + '\0' + item.path + '\0' + item.other + '\0';
}

bool parseFacts(std::string_view text, UndoItem& item) {
    if (text.empty() || std::string_view("mcdrp").find(text[0]) == std::string_view::npos) return false;
    item.deed = static_cast<Deed>(text[0]);
    text.remove_prefix(1);
    std::array<long long, kFacts> facts{};
    for (long long& fact : facts) {
        if (!text.starts_with(' ')) return false;
        text.remove_prefix(1);
        const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), fact);
        if (error != std::errc()) return false;
        text.remove_prefix(static_cast<size_t>(end - text.data()));
    }
    takeFacts(facts, item);
    return text.empty();
}

// Up to the next NUL, which is passed; nothing when there is none.
std::optional<std::string_view> pieceOf(std::string_view& text) {
    const size_t end = text.find('\0');
    if (end == std::string_view::npos) return std::nullopt;
    const std::string_view piece = text.substr(0, end);
    text.remove_prefix(end + 1);
    return piece;
}

bool isTime(const timespec& a, const timespec& b) {
    return a.tv_sec == b.tv_sec && a.tv_nsec == b.tv_nsec;
}

}  // namespace

// What is mounted over the item can neither be moved nor removed, so the folder speaks for it.
bool isItem(const UndoItem& left, int folder, const struct stat& now) {
    return left.status.st_ino == now.st_ino && left.fileSystem != 0 && left.fileSystem == fileSystemOf(folder);
}

bool isUntouched(const UndoItem& left, int folder, const struct stat& now) {
    const struct stat& then = left.status;
    const bool sameKind = (then.st_mode & S_IFMT) == (now.st_mode & S_IFMT);
    const bool same =
        isItem(left, folder, now) && sameKind && isTime(then.st_ctim, now.st_ctim) && isTime(then.st_mtim, now.st_mtim);
    return same && (S_ISDIR(now.st_mode) || then.st_size == now.st_size);
}

bool isOperationId(std::string_view text) {
    if (!text.starts_with(kPrefix)) return false;
    text.remove_prefix(kPrefix.size());
    const size_t end = text.find('_');
    const bool named = end != std::string_view::npos && end > 0 && end <= kDigits &&
                       text.substr(0, end).find_first_not_of("abcdefghijklmnopqrstuvwxyz") == std::string_view::npos;
    return named && text.size() == end + 1 + kDigits &&
           text.find_first_not_of(kLowerHex, end + 1) == std::string_view::npos;
}

bool UndoRecord::open() {
    const Descriptor folder = openUserFolder(kStore.path, user_, true);
    if (!folder || !isOperationId(id_)) return false;
    // Locked before it has its name, so that nobody takes what is still written for the whole.
    NewFile file(folder.get());
    if (!file.create(id_, 0600) || !lockFile(file.get(), LOCK_EX) || !writeAll(file.get(), kBeginning)) return false;
    if (!lockFile(folder.get(), LOCK_EX) || !makeRoom(kStore, folder, 0) || !file.publish(id_, false)) return false;
    file_ = Descriptor(fcntl(file.get(), F_DUPFD_CLOEXEC, 0));
    bytes_ = static_cast<long long>(kBeginning.size());
    return static_cast<bool>(file_);
}

bool UndoRecord::add(UndoItem item, int folder) {
    if (off_) return false;
    item.fileSystem = folder < 0 ? 0 : fileSystemOf(folder);
    const std::string line = lineOf(item);
    const auto size = static_cast<long long>(line.size());
    failed_ = failed_ || (!file_ && !open()) || bytes_ + size > kMostBytes;
    if (!failed_ && !writeAll(file_.get(), line)) failed_ = true;  // what follows half a line could not be read
    bytes_ += size;
    if (failed_) ++leftOut_;
    return !failed_;
}

void UndoRecord::moved(int folder, const std::string& name, const std::string& path, const std::string& other,
                       const struct stat& before) {
    struct stat now {};
    if (off_) return;
    const bool there = fstatat(folder, name.c_str(), &now, AT_SYMLINK_NOFOLLOW) == 0;
    const bool renamed = before.st_dev == now.st_dev;
    const bool whole = renamed ? isSameFile(before, now) : (before.st_mode & S_IFMT) == (now.st_mode & S_IFMT);
    if (!there || !whole) return leaveOut();  // by now it is something else
    if (add({Deed::kMoved, path, other, now}, folder)) ++count_;
}

void UndoRecord::copied(int folder, const std::string& name, const std::string& path, const std::string& other,
                        const struct stat& source) {
    struct stat now {};
    if (off_) return;
    const bool there = fstatat(folder, name.c_str(), &now, AT_SYMLINK_NOFOLLOW) == 0;
    const bool whole = there && (source.st_mode & S_IFMT) == (now.st_mode & S_IFMT) && source.st_size == now.st_size &&
                       std::abs(source.st_mtim.tv_sec - now.st_mtim.tv_sec) <= 2;  // as some file systems count
    if (!whole) return leaveOut();
    if (add({Deed::kCopied, path, other, now}, folder)) ++count_;
}

void UndoRecord::made(int folder, const std::string& name, const std::string& path) {
    struct stat now {};
    if (off_) return;
    if (fstatat(folder, name.c_str(), &now, AT_SYMLINK_NOFOLLOW) != 0 || !S_ISDIR(now.st_mode)) return leaveOut();
    if (add({Deed::kMade, path, "", now}, folder)) ++count_;
}

void UndoRecord::removed(const std::string& path, const struct stat& before) {
    add({Deed::kRemoved, path, "", before}, -1);
}

void UndoRecord::permitted(int folder, const std::string& name, const std::string& path, const std::string& change) {
    struct stat now {};
    if (off_) return;
    if (fstatat(folder, name.c_str(), &now, AT_SYMLINK_NOFOLLOW) != 0) return leaveOut();
    if (add({Deed::kPermitted, path, change, now}, folder)) ++count_;
}

int UndoFile::open(const std::string& user, const std::string& id) {
    if (!isOperationId(id)) return ORV_ERR_MISSING;
    id_ = id;
    folder_ = openUserFolder(kStore.path, user, false);
    file_ = folder_ ? openOwnFile(folder_, id) : Descriptor();
    if (!file_) return errno == ENOENT ? ORV_ERR_MISSING : ORV_ERR_GENERAL;
    if (!lockFile(file_.get(), LOCK_EX | LOCK_NB)) return errno == EWOULDBLOCK ? ORV_ERR_BUSY : ORV_ERR_GENERAL;
    return read();
}

int UndoFile::read() {
    struct stat status {};
    if (fstat(file_.get(), &status) != 0 || !S_ISREG(status.st_mode)) return ORV_ERR_GENERAL;
    if (status.st_nlink == 0 || kStore.isOver(status)) return ORV_ERR_MISSING;
    if (!readAll(file_.get(), text_, static_cast<size_t>(kMostBytes))) return ORV_ERR_GENERAL;
    if (!text_.starts_with(kBeginning)) return ORV_ERR_MISSING;  // another version's
    std::string_view rest = text_;
    rest.remove_prefix(kBeginning.size());
    // What a killed process left unfinished is the last one.
    for (;;) {
        const auto facts = pieceOf(rest), path = pieceOf(rest), other = pieceOf(rest);
        if (!facts || !path || !other) return ORV_ERR_NONE;
        items_.push_back({*facts, *path, *other});
    }
}

bool UndoFile::item(size_t position, UndoItem& item) const {
    const Piece& piece = items_[position];
    item.path = piece.path;
    item.other = piece.other;
    return parseFacts(piece.facts, item);
}

void UndoFile::keep(const std::function<bool(size_t position)>& isLeft) {
    std::string text(kBeginning);
    for (size_t i = 0; i < items_.size(); ++i) {
        if (!isLeft(i)) continue;
        for (const std::string_view piece : {items_[i].facts, items_[i].path, items_[i].other}) {
            text.append(piece).push_back('\0');
        }
    }
    if (text.size() == kBeginning.size()) {
        unlinkat(folder_.get(), id_.c_str(), 0);
        return;
    }
    // Without it all is asked for again, and what is back is found to be.
    NewFile file(folder_.get());
    static_cast<void>(file.create(id_, 0600) && writeAll(file.get(), text) && file.publish(id_, true));
}

OwnSweep sweepUndoRecords() {
    return sweepOwn(kStore);
}

}  // namespace orvel::cgi
