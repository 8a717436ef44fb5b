#include "web/keyed_hash.h"

#include <bit>
#include <cstddef>

namespace vexo {
namespace {

class State {
 public:
    explicit State(const HashKey& key)
        : a_(key[0] ^ 0x736f6d6570736575U),
          b_(key[1] ^ 0x646f72616e646f6dU ^ 0xeeU),
          c_(key[0] ^ 0x6c7967656e657261U),
          d_(key[1] ^ 0x7465646279746573U) {}

    void take(std::uint64_t word) {
        d_ ^= word;
        mix(2);
        a_ ^= word;
    }
    Hash finish() {
        c_ ^= 0xeeU;
        mix(4);
        const std::uint64_t first = a_ ^ b_ ^ c_ ^ d_;
        b_ ^= 0xddU;
        mix(4);
        return {first, a_ ^ b_ ^ c_ ^ d_};
    }

 private:
    void mix(int rounds) {
        while (rounds-- > 0) {
            a_ += b_;
            c_ += d_;
            b_ = std::rotl(b_, 13) ^ a_;
            d_ = std::rotl(d_, 16) ^ c_;
            a_ = std::rotl(a_, 32) + d_;
            c_ += b_;
            d_ = std::rotl(d_, 21) ^ a_;
            b_ = std::rotl(b_, 17) ^ c_;
            c_ = std::rotl(c_, 32);
        }
    }
    std::uint64_t a_, b_, c_, d_;
};

// Up to eight bytes, the first one lowest.
std::uint64_t wordOf(std::string_view bytes) {
    std::uint64_t word = 0;
    for (std::size_t i = 0; i < bytes.size(); ++i) {
        word |= std::uint64_t{static_cast<unsigned char>(bytes[i])} << (8 * i);
    }
    return word;
}

}  // namespace

Hash keyedHash(const HashKey& key, std::string_view text) {
    State state(key);
    const std::uint64_t length = text.size();
    for (; text.size() >= 8; text.remove_prefix(8)) state.take(wordOf(text.substr(0, 8)));
    state.take(wordOf(text) | length << 56);
    return state.finish();
}

}  // namespace vexo
