// What the children report to the parent: a slot each in memory that both see.
//
// The children act as users, so nothing here is trusted: the parent takes numbers only, within bounds, and a child that
// writes nonsense spoils the figures and its own limits, nothing else.
#ifndef ORVEL_ORVELD_SLOTS_H
#define ORVEL_ORVELD_SLOTS_H

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

namespace orvel::orveld {

enum class SlotState : std::uint32_t {
    kFree,
    kServing,  // ended when the client goes away
    kKept,     // not ended: an operation, or a reply that has begun
    kRefused,  // for one of the limits
    kAnswered  // the reply is on its way, what is left is cleaning up
};

struct Slot {
    std::atomic<std::uint32_t> state;
    std::atomic<std::uint32_t> bodyLeft;  // not 0: the web server may still be sending
    std::atomic<std::uint32_t> program;   // place in the table of programs, counted from 1; 0: not known yet
    std::atomic<std::uint64_t> address;   // hash of the client's; 0: not known yet
    std::atomic<std::int64_t> answered;   // nanoseconds of the monotonic clock
};

class Slots {
 public:
    static constexpr size_t kMost = 1024;

    // False with errno when there is no memory.
    [[nodiscard]] bool map();
    // In the parent: a free slot, taken; and one given back.
    [[nodiscard]] std::optional<size_t> take();
    void give(size_t number);
    [[nodiscard]] Slot& at(size_t number) { return slots_[number]; }

    // In a child: publishes the address in its slot, then counts. False when as many others as `most` have it already.
    // Of several that come at once rather all are refused than one too many admitted.
    [[nodiscard]] bool admit(size_t number, std::string_view address, size_t most);

 private:
    Slot* slots_ = nullptr;
    size_t end_ = 0;  // behind the last that is taken: a child looks at no more of the memory than that
};

// Clients with the same hash count as one: an address, and of an IPv6 address the network (64 bits), as every address
// of it is one household's to choose.
std::uint64_t hashOfAddress(std::string_view address);

}  // namespace orvel::orveld

#endif
