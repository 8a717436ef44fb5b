// The file of guesses at passwords: of fixed size, so that strangers cannot make it grow, with places found by a keyed
// hash, so that they cannot choose whose place they share.
#ifndef VEXO_LINUX_GUESS_TABLE_H
#define VEXO_LINUX_GUESS_TABLE_H

#include <sys/types.h>

#include <cstdint>
#include <string_view>

#include "io/file_io.h"
#include "web/guess_rules.h"
#include "web/keyed_hash.h"

namespace vexo {

// A record and where it stands in the file; -1: nowhere.
template <class Record>
struct Slot {
    off_t at = -1;
    Record record;
};

// The open file, locked from open() on until unlock() or its end.
class GuessTable {
 public:
    // Opens the file, made where it is missing and begun anew after a restart of the machine. False with errno.
    [[nodiscard]] bool open();
    [[nodiscard]] Hash hash(std::string_view text) const { return keyedHash(key_, text); }

    // The record of `key`, or a new one in a place that is free at `now`; `at` is -1 where it gets none. False with
    // errno. A thing shares the place of another where all are taken.
    [[nodiscard]] bool findThing(std::uint64_t key, std::int64_t now, Slot<Guessed>& slot) const;
    // A guesser takes the place of one who has no turn. Where each has one, it gets none, and `record.ends` is the time
    // at which the first of these turns is over.
    [[nodiscard]] bool findGuesser(std::uint64_t key, std::int64_t now, Slot<Guesser>& slot) const;
    // The pace of an address on the whole machine stands apart from those that have turns.
    [[nodiscard]] bool findPace(std::uint64_t key, std::int64_t now, Slot<Guesser>& slot) const;
    // Writes a record back; one without a place is dropped. False with errno.
    [[nodiscard]] bool save(const Slot<Guessed>& slot) const {
        return write(slot.at, &slot.record, sizeof slot.record);
    }
    [[nodiscard]] bool save(const Slot<Guesser>& slot) const {
        return write(slot.at, &slot.record, sizeof slot.record);
    }

    // Takes one of the two seats at which guesses are judged; it is taken until the file is closed.
    [[nodiscard]] bool takeSeat() const;
    // Leaves the file to others, and gives its descriptor, with the seat, away.
    Descriptor unlock();

 private:
    [[nodiscard]] bool load();
    [[nodiscard]] bool write(off_t at, const void* record, size_t size) const;

    Descriptor file_;
    HashKey key_{};
};

}  // namespace vexo

#endif
