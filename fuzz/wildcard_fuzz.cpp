// Any pattern against any text: the matcher answers at once and, as long as that can be afforded, like the recursion.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "../tests/base/wildcard_model.h"
#include "base/wildcard.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size < 2) return 0;
    const std::string all(reinterpret_cast<const char*>(data + 2), size - 2);
    const int escape = data[0];
    const size_t cut = data[1] % (all.size() + 1);
    const std::string pattern = all.substr(0, cut);
    const std::string text = all.substr(cut);
    const bool answer = orvel::Wildcard(pattern, escape).match(text);
    // The recursion reads C strings and takes exponential time.
    const bool comparable = pattern.size() <= 16 && text.size() <= 16 && all.find('\0') == std::string::npos;
    if (comparable && answer != wildcard_model::compare(pattern.c_str(), text.c_str(), escape)) abort();
    return 0;
}
