#include "web/guess_table.h"

#include <fcntl.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <string>
#include <utility>

#include "failure.h"
#include "io/trusted_file.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"

namespace vexo {
namespace {

constexpr const char* kFolder = "/run/vexo";
constexpr const char* kFile = "/run/vexo/guesses";
constexpr const char* kBoot = "/proc/sys/kernel/random/boot_id";
constexpr std::array<char, 8> kFormat = {'g', 'u', 'e', 's', 's', 'e', 's', '1'};

struct Header {
    std::array<char, 8> format{};
    std::array<char, 40> boot{};
    HashKey key{};
};

// Places are found by key in sets of eight.
constexpr size_t kSetSize = 8;
template <class Record>
using Set = std::array<Record, kSetSize>;

// A part of the file: where its sets begin, and how many there are.
struct Part {
    off_t begin;
    std::uint64_t sets;
    size_t setSize;

    [[nodiscard]] constexpr off_t end() const { return begin + static_cast<off_t>(sets * setSize); }
};
constexpr Part kThings = {sizeof(Header), 128, sizeof(Set<Guessed>)};
constexpr Part kPaces = {kThings.end(), 128, sizeof(Set<Guesser>)};
constexpr Part kGuessers = {kPaces.end(), 1024, sizeof(Set<Guesser>)};
constexpr off_t kSize = kGuessers.end();
static_assert(sizeof(Header) == 64 && sizeof(Guessed) == 48 && sizeof(Guesser) == 40, "the format has no gaps");

// Bytes that are locked, behind the content: the table for the microseconds of a change, a seat for a judging.
constexpr off_t kTableLock = kSize;
constexpr std::array<off_t, 2> kSeats = {kSize + 1, kSize + 2};

off_t setAt(const Part& part, std::uint64_t key) {
    return part.begin + static_cast<off_t>(key % part.sets * part.setSize);
}

bool lockByte(int fd, off_t at, short type, bool wait) {
    struct flock lock {};
    lock.l_type = type;
    lock.l_whence = SEEK_SET;
    lock.l_start = at;
    lock.l_len = 1;
    int done = -1;
    do {
        done = fcntl(fd, wait ? F_OFD_SETLKW : F_OFD_SETLK, &lock);
    } while (done != 0 && errno == EINTR);
    return done == 0;
}

// Reads `size` bytes at `at`. False with errno, EIO where the file ends before.
bool readAt(int fd, off_t at, void* bytes, size_t size) {
    ssize_t got = 0;
    do {
        got = pread(fd, bytes, size, at);
    } while (got < 0 && errno == EINTR);
    if (got >= 0 && got != static_cast<ssize_t>(size)) errno = EIO;
    return got == static_cast<ssize_t>(size);
}

bool writeAt(int fd, off_t at, const void* bytes, size_t size) {
    ssize_t done = 0;
    do {
        done = pwrite(fd, bytes, size, at);
    } while (done < 0 && errno == EINTR);
    if (done >= 0 && done != static_cast<ssize_t>(size)) errno = ENOSPC;
    return done == static_cast<ssize_t>(size);
}

bool readBoot(std::array<char, 40>& boot) {
    const Descriptor file = openFile(AT_FDCWD, kBoot, O_RDONLY);
    std::string text;
    if (!file || !readAll(file.get(), text, boot.size() - 1)) return false;
    text.copy(boot.data(), boot.size() - 1);
    return true;
}

// Empties the file and gives it a key of its own. The header comes last: before, the file counts as not begun.
bool beginAnew(int fd, Header& header) {
    if (getrandom(header.key.data(), sizeof header.key, 0) != static_cast<ssize_t>(sizeof header.key)) return false;
    if (ftruncate(fd, 0) != 0) return false;
    const int failure = posix_fallocate(fd, 0, kSize);  // so that a full disk is met now, or never
    if (failure != 0) {
        errno = failure;
        return false;
    }
    return writeAt(fd, 0, &header, sizeof header);
}

bool makeFolder() {
    constexpr uid_t keep = static_cast<uid_t>(-1);
    return VEXOFSMkdirP(VEXO::SystemPath(kFolder).c_str(), nullptr, 1, keep, keep, 0755) == 0;
}

// Reads the set of `key` in a part of the file, and finds the key, or a place that is over, in it; `at` is -1 where
// there is neither. False with errno.
template <class Record>
bool findIn(int fd, const Part& part, std::uint64_t key, std::int64_t now, Set<Record>& set, Slot<Record>& slot) {
    slot = {};
    slot.record.key = key;
    if (!readAt(fd, setAt(part, key), set.data(), sizeof set)) return false;
    const auto isKey = [&](const Record& record) { return record.key == key && record.ends > now; };
    const auto isOver = [&](const Record& record) { return record.ends <= now; };
    const auto found = std::find_if(set.begin(), set.end(), isKey);
    const auto place = found != set.end() ? found : std::find_if(set.begin(), set.end(), isOver);
    if (found != set.end()) slot.record = *found;
    if (place != set.end()) slot.at = setAt(part, key) + (place - set.begin()) * static_cast<off_t>(sizeof(Record));
    return true;
}

// Whoever has a turn keeps it, so that the order is never longer than the table; else the first to end gives way.
void displace(const Set<Guesser>& set, off_t setAt, std::int64_t now, Slot<Guesser>& slot) {
    const auto rank = [&](const Guesser& guesser) {
        const std::int64_t turn = endOfTurn(guesser);
        return std::pair(turn > now, turn > now ? turn : guesser.ends);
    };
    const auto first =
        std::min_element(set.begin(), set.end(), [&](const Guesser& a, const Guesser& b) { return rank(a) < rank(b); });
    if (rank(*first).first) {
        slot.record.ends = rank(*first).second;
    } else {
        slot.at = setAt + (first - set.begin()) * static_cast<off_t>(sizeof(Guesser));
    }
}

bool findGuesserIn(int fd, const Part& part, std::uint64_t key, std::int64_t now, Slot<Guesser>& slot) {
    Set<Guesser> set;
    if (!findIn(fd, part, key, now, set, slot)) return false;
    if (slot.at < 0) displace(set, setAt(part, key), now, slot);
    return true;
}

}  // namespace

bool GuessTable::open() {
    const std::string path = VEXO::SystemPath(kFile);
    file_ = openTrusted(path, O_RDWR | O_CREAT, 0600);
    if (!file_ && errno == ENOENT && makeFolder()) file_ = openTrusted(path, O_RDWR | O_CREAT, 0600);
    return file_ && lockByte(file_.get(), kTableLock, F_WRLCK, true) && load();
}

bool GuessTable::load() {
    Header header, mine;
    mine.format = kFormat;
    if (!readBoot(mine.boot)) return false;
    struct stat status {};
    if (fstat(file_.get(), &status) != 0) return false;
    const bool begun = status.st_size == kSize;
    if (begun && !readAt(file_.get(), 0, &header, sizeof header)) return false;
    if (begun && header.format == mine.format && header.boot == mine.boot)
        mine = header;
    else if (!beginAnew(file_.get(), mine))
        return false;
    key_ = mine.key;
    return true;
}

bool GuessTable::findThing(std::uint64_t key, std::int64_t now, Slot<Guessed>& slot) const {
    Set<Guessed> set;
    if (!findIn(file_.get(), kThings, key, now, set, slot)) return false;
    if (slot.at < 0) slot = {.at = setAt(kThings, key), .record = set[0]};
    return true;
}

bool GuessTable::findGuesser(std::uint64_t key, std::int64_t now, Slot<Guesser>& slot) const {
    return findGuesserIn(file_.get(), kGuessers, key, now, slot);
}

bool GuessTable::findPace(std::uint64_t key, std::int64_t now, Slot<Guesser>& slot) const {
    return findGuesserIn(file_.get(), kPaces, key, now, slot);
}

bool GuessTable::write(off_t at, const void* record, size_t size) const {
    return at < 0 || writeAt(file_.get(), at, record, size);
}

bool GuessTable::takeSeat() const {
    return std::any_of(kSeats.begin(), kSeats.end(),
                       [&](off_t seat) { return lockByte(file_.get(), seat, F_WRLCK, false); });
}

Descriptor GuessTable::unlock() {
    static_cast<void>(lockByte(file_.get(), kTableLock, F_UNLCK, false));
    return std::move(file_);
}

}  // namespace vexo
