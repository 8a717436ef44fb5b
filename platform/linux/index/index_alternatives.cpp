#include "index/index_alternatives.h"

#include <algorithm>

#include "base/wildcard.h"

namespace vexo::fileindex {

namespace {

bool isAscii(std::string_view text) {
    unsigned char bits = 0;
    for (const char c : text) bits |= static_cast<unsigned char>(c);
    return bits < 0x80;
}

// What is ASCII: each byte is a character, and no other one than a letter folds to another.
void appendLower(std::string_view text, std::string& out) {
    for (const char c : text) out += static_cast<char>(c >= 'A' && c <= 'Z' ? c + ('a' - 'A') : c);
}

}  // namespace

std::optional<std::string_view> extensionOf(std::string_view name, std::string& buffer) {
    buffer.clear();
    if (isAscii(name)) {
        const size_t dot = name.rfind('.');
        if (dot == std::string_view::npos) return {};
        appendLower(name.substr(dot + 1), buffer);
        return buffer;
    }
    orvel::appendComparable(name, buffer);
    const size_t dot = buffer.rfind('.');
    if (dot == std::string::npos) return {};
    return std::string_view(buffer).substr(dot + 1);
}

void Endings::add(std::string_view ending) {
    endings_.add(ending);
    extensions_.add(ending.substr(ending.rfind('.') + 1));  // of npos + 1: all of it
    longest_ = std::max(longest_, ending.size());
}

bool Endings::match(std::string_view name) const {
    thread_local std::string text;
    text.clear();
    if (isAscii(name)) {
        appendLower(name.substr(name.size() - std::min(name.size(), longest_ + 1)), text);
    } else {
        orvel::appendComparable(name, text);
    }
    const std::string_view all = text;
    for (size_t dot = all.rfind('.'); dot != std::string_view::npos; dot = all.rfind('.', dot - 1)) {
        const std::string_view ending = all.substr(dot + 1);
        if (ending.size() > longest_) return false;
        if (endings_.has(ending)) return true;
        if (dot == 0) return false;
    }
    return false;
}

bool FolderSet::holds(std::string_view path) const {
    const size_t last = path.rfind('/');
    if (direct_.has(path.substr(0, last == std::string_view::npos ? 0 : last))) return true;
    if (below_.empty()) return false;
    for (size_t slash = path.find('/'); slash != std::string_view::npos; slash = path.find('/', slash + 1)) {
        if (below_.has(path.substr(0, slash))) return true;
    }
    return false;
}

}  // namespace vexo::fileindex
