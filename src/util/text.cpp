#include "orvel/text.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <string_view>
#include <utility>

#include "base/wildcard.h"
#include "core/boundary.h"

namespace {

std::string_view lastComponent(std::string_view path) {
    return path.substr(path.rfind('/') + 1);  // npos + 1 is 0: the whole text
}

std::vector<std::string> pieces(const std::string& text, const char* delimiter) {
    std::vector<std::string> result;
    if (text.empty()) return result;
    const std::string_view cut = delimiter == nullptr ? "" : delimiter;
    std::size_t begin = 0;
    std::size_t end = cut.empty() ? std::string::npos : text.find(cut);
    for (; end != std::string::npos; end = text.find(cut, begin)) {
        if (end != 0) result.push_back(text.substr(begin, end - begin));
        begin = end + cut.size();
    }
    result.push_back(text.substr(begin));
    return result;
}

}  // namespace

int OrvLibStringToLower(char* text) {
    if (text == nullptr) return -1;
    for (; *text != '\0'; ++text) {
        if (*text >= 'A' && *text <= 'Z') *text = static_cast<char>(*text + ('a' - 'A'));
    }
    return 0;
}

int OrvLibStrLikeCompare(const char* pattern, const char* text, int escape) {
    return orvel::guardedQuietly(0, [&] {
        if (pattern == nullptr || text == nullptr) return 0;
        return orvel::Wildcard(pattern, escape).match(text) ? 1 : 0;
    });
}

std::string OrvLibHex2Bin(const std::string& hex) {
    return orvel::guardedQuietly(std::string(), [&] {
        std::string bytes;
        bytes.reserve(hex.size() / 2);
        for (std::size_t i = 0; i + 1 < hex.size(); i += 2) {
            const char pair[] = {hex[i], hex[i + 1], '\0'};
            const char byte = static_cast<char>(strtol(pair, nullptr, 16));
            if (byte == '\0') break;  // kept: a decoded zero byte ends the output
            bytes += byte;
        }
        return bytes;
    });
}

void StringExplode(std::string& text, const char* delimiter, void (*callback)(std::string& piece, long),
                   long argument) {
    orvel::guardedQuietly(0, [&] {
        if (callback == nullptr) return 0;
        auto all = pieces(text, delimiter);
        if (all.size() == 1 && all.front() == text) {  // no delimiter: the callback may change the caller's text
            callback(text, argument);
            return 0;
        }
        for (auto& piece : all) callback(piece, argument);
        return 0;
    });
}

void StringExplode(std::vector<std::string>& out, const std::string& text, const char* delimiter) {
    orvel::guardedQuietly(0, [&] {
        auto all = pieces(text, delimiter);
        out.insert(out.end(), std::make_move_iterator(all.begin()), std::make_move_iterator(all.end()));
        return 0;
    });
}

void StringExplodeToFileNameString(std::string& out, std::string text, const char* delimiter, const char* separator) {
    orvel::guardedQuietly(0, [&] {
        if (text.empty()) return 0;
        std::string names;
        const auto all = pieces(text, delimiter);
        for (const auto& piece : all) {
            if (&piece != &all.front() && separator != nullptr) names += separator;
            names += lastComponent(piece);
        }
        out = std::move(names);
        return 0;
    });
}

std::string FindCommonParent(std::vector<std::string> paths) {
    return orvel::guardedQuietly(std::string(), [&] {
        if (paths.empty()) return std::string();
        for (auto& path : paths) {
            if (!path.ends_with('/')) path += '/';
        }
        std::string common = paths.front();
        for (const auto& path : paths) {
            const auto differs = std::mismatch(common.begin(), common.end(), path.begin(), path.end()).first;
            common.erase(differs, common.end());
        }
        const auto slash = common.rfind('/');
        if (slash != std::string::npos) common.erase(slash + 1);
        return common;
    });
}

const char* ReturnFileExt(const char* name, unsigned limit) {
    if (name == nullptr) return nullptr;
    const std::size_t length = strlen(name);
    if (length < 2) return nullptr;
    const std::size_t start = length > limit && limit >= 2 ? limit : length - 1;
    for (std::size_t i = start; i > 0; --i) {
        if (name[i] == '.') return name[i + 1] == '\0' ? nullptr : name + i + 1;
    }
    return nullptr;
}

int FileUnitGet(long long size, char* buffer, int bufferSize, bool twoDecimals) {
    if (buffer == nullptr || bufferSize < 1 || size <= 0) return 0;
    const auto capacity = static_cast<std::size_t>(bufferSize);
    if (size < 1024) {
        snprintf(buffer, capacity, "%lld Bytes", size);
        return 1;
    }
    struct Unit {
        const char* name;
        long long bytes;
    };
    static constexpr Unit units[] = {{"GB", 1LL << 30}, {"MB", 1LL << 20}, {"KB", 1LL << 10}};
    const Unit& unit =
        *std::find_if(std::begin(units), std::end(units), [&](const Unit& u) { return size >= u.bytes; });
    // Kept: single precision first, which rounds large sizes, so that 1,073,741,823 bytes are 1024 MB.
    const double value = static_cast<double>(static_cast<float>(size)) * (1.0 / static_cast<double>(unit.bytes));
    if (twoDecimals) {
        snprintf(buffer, capacity, "%5.2f %s", value, unit.name);
    } else {
        snprintf(buffer, capacity, "%lld %s", static_cast<long long>(value), unit.name);
    }
    return 1;
}
