#include "slots.h"

#include <arpa/inet.h>
#include <sys/mman.h>

#include <algorithm>
#include <cstring>
#include <string>

namespace orvel::orveld {
namespace {

constexpr std::uint64_t kFnvBasis = 0xCBF29CE484222325U;
constexpr std::uint64_t kFnvPrime = 0x100000001B3U;

std::uint64_t hashOf(std::string_view bytes) {
    std::uint64_t hash = kFnvBasis;
    for (const char byte : bytes) hash = (hash ^ static_cast<unsigned char>(byte)) * kFnvPrime;
    return hash == 0 ? 1 : hash;
}

}  // namespace

bool Slots::map() {
    void* memory = mmap(nullptr, kMost * sizeof(Slot), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) return false;
    slots_ = static_cast<Slot*>(memory);  // zeroed, which is what free slots are
    return true;
}

std::optional<size_t> Slots::take() {
    for (size_t number = 0; number < kMost; ++number) {
        Slot& slot = slots_[number];
        if (slot.state.load() != static_cast<std::uint32_t>(SlotState::kFree)) continue;
        slot.bodyLeft = 0;
        slot.program = 0;
        slot.address = 0;
        slot.answered = 0;
        slot.state = static_cast<std::uint32_t>(SlotState::kServing);
        end_ = std::max(end_, number + 1);
        return number;
    }
    return std::nullopt;
}

void Slots::give(size_t number) {
    slots_[number].state = static_cast<std::uint32_t>(SlotState::kFree);
    while (end_ > 0 && slots_[end_ - 1].state.load() == static_cast<std::uint32_t>(SlotState::kFree)) --end_;
}

bool Slots::admit(size_t number, std::string_view address, size_t most) {
    const std::uint64_t hash = hashOfAddress(address);
    slots_[number].address = hash;
    size_t others = 0;
    for (size_t i = 0; i < end_; ++i) {
        const Slot& slot = slots_[i];
        const auto state = static_cast<SlotState>(slot.state.load());
        const bool serves = state == SlotState::kServing || state == SlotState::kKept;
        if (i != number && serves && slot.address.load() == hash) ++others;
    }
    if (others < most) return true;
    slots_[number].state = static_cast<std::uint32_t>(SlotState::kRefused);
    return false;
}

std::uint64_t hashOfAddress(std::string_view address) {
    in6_addr six;
    if (inet_pton(AF_INET6, std::string(address).c_str(), &six) != 1) return hashOf(address);
    char bytes[sizeof six];
    std::memcpy(bytes, &six, sizeof six);
    if (!IN6_IS_ADDR_V4MAPPED(&six)) return hashOf(std::string_view(bytes, 8));
    char four[INET_ADDRSTRLEN] = "";
    inet_ntop(AF_INET, bytes + 12, four, sizeof four);
    return hashOf(four);
}

}  // namespace orvel::orveld
