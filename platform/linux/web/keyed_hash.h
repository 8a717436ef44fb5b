// SipHash-2-4 with 128 bits of output: a short code for a text that only who has the key can make. Pure.
#ifndef VEXO_LINUX_KEYED_HASH_H
#define VEXO_LINUX_KEYED_HASH_H

#include <array>
#include <cstdint>
#include <string_view>

namespace vexo {

using HashKey = std::array<std::uint64_t, 2>;
using Hash = std::array<std::uint64_t, 2>;

Hash keyedHash(const HashKey& key, std::string_view text);

}  // namespace vexo

#endif
