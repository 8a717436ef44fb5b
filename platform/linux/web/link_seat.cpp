#include "vexo/link_seat.h"

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>

#include "base/raised_identity.h"
#include "fault_gate.h"
#include "io/trusted_file.h"
#include "vexo/filesystem.h"
#include "vexo/system_root.h"

namespace VEXO {
namespace {

constexpr const char* kFolder = "/run/vexo";
constexpr const char* kFile = "/run/vexo/sending";

// One after the other in the file; the first byte of each is locked by who sits there.
struct Record {
    std::array<char, 40> link{};
    std::array<char, 64> address{};
    std::int64_t bytes = 0;
};
static_assert(sizeof(Record) == 112, "the format has no gaps");

off_t placeOf(int seat) {
    return static_cast<off_t>(seat) * static_cast<off_t>(sizeof(Record));
}

template <size_t Size>
void put(std::array<char, Size>& field, const std::string& text) {
    text.copy(field.data(), Size - 1);
}

struct flock byteOf(int seat) {
    struct flock lock {};
    lock.l_type = F_WRLCK;
    lock.l_whence = SEEK_SET;
    lock.l_start = placeOf(seat);
    lock.l_len = 1;
    return lock;
}

enum class State { kFree, kTaken, kUnknown };
State stateOf(int file, int seat) {
    struct flock lock = byteOf(seat);
    if (fcntl(file, F_OFD_GETLK, &lock) != 0) return State::kUnknown;
    return lock.l_type == F_UNLCK ? State::kFree : State::kTaken;
}

vexo::Descriptor openSeats() {
    constexpr uid_t keep = static_cast<uid_t>(-1);
    const std::string path = SystemPath(kFile);
    vexo::Descriptor file = vexo::openTrusted(path, O_RDWR | O_CREAT, 0600);
    if (!file && errno == ENOENT && VEXOFSMkdirP(SystemPath(kFolder).c_str(), nullptr, 1, keep, keep, 0755) == 0) {
        file = vexo::openTrusted(path, O_RDWR | O_CREAT, 0600);
    }
    return file;
}

// Looks at all seats. False with errno.
bool look(int file, const Record& mine, LinkSeat::Others& others, int& ofAddress, int& free) {
    for (int seat = 0; seat < kSeats; ++seat) {
        const State state = stateOf(file, seat);
        if (state == State::kUnknown) return false;
        if (state == State::kFree) {
            if (free < 0) free = seat;
            continue;
        }
        Record record;
        if (pread(file, &record, sizeof record, placeOf(seat)) != static_cast<ssize_t>(sizeof record)) return false;
        if (record.address == mine.address) ++ofAddress;
        if (record.link != mine.link) continue;
        ++others.files;
        others.bytes += record.bytes;
    }
    return true;
}

// Writes before it sits down: who looks meanwhile waits for the file.
bool sit(int file, int seat, const Record& mine) {
    struct flock lock = byteOf(seat);
    return pwrite(file, &mine, sizeof mine, placeOf(seat)) == static_cast<ssize_t>(sizeof mine) &&
           fcntl(file, F_OFD_SETLK, &lock) == 0;
}

}  // namespace

LinkSeat::~LinkSeat() {
    leave();
}

void LinkSeat::leave() {
    if (file_ >= 0) close(file_);
    file_ = -1;
}

LinkSeat::Taking LinkSeat::take(const std::string& link, const std::string& address, std::int64_t bytes,
                                Others& others) {
    VEXO_GATE("LinkSeat::take", Taking::kFailed);
    const orvel::RaisedIdentity raised;
    Record mine;
    put(mine.link, link);
    put(mine.address, address);
    mine.bytes = bytes;
    others = {};
    int ofAddress = 0, free = -1;
    vexo::Descriptor file = openSeats();
    if (!file || !vexo::lockFile(file.get(), LOCK_EX)) return Taking::kFailed;
    if (!look(file.get(), mine, others, ofAddress, free)) return Taking::kFailed;
    if (free < 0 || others.files >= kSeatsOfLink || ofAddress >= kSeatsOfAddress) return Taking::kNone;
    if (!sit(file.get(), free, mine) || flock(file.get(), LOCK_UN) != 0) return Taking::kFailed;
    leave();
    file_ = file.release();
    return Taking::kTaken;
}

}  // namespace VEXO
