// Text fields of the records that the platform hands out.
#ifndef VEXO_LINUX_FIELD_H
#define VEXO_LINUX_FIELD_H

#include <cstddef>
#include <cstring>
#include <string>

namespace vexo {

// Copies the whole of `text` into `field`. False, and the field as it was, when it does not fit: never a part of it,
// which would name something else.
template <size_t size>
[[nodiscard]] bool fillField(char (&field)[size], const std::string& text) {
    if (text.size() >= size) return false;
    memcpy(field, text.c_str(), text.size() + 1);
    return true;
}

}  // namespace vexo

#endif
