#include "picture.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <string_view>

namespace orvel::demo {
namespace {

constexpr int kWidth = 480, kHeight = 320;
constexpr int kSkyShades = 128;
constexpr int kHills = 5;
constexpr double kTurn = 6.283185307179586;

std::string bigEndian(uint32_t value) {
    std::string text;
    for (int shift = 24; shift >= 0; shift -= 8) text += static_cast<char>(value >> shift & 0xFF);
    return text;
}

uint32_t crcOf(std::string_view bytes) {
    uint32_t crc = ~0U;
    for (const char c : bytes) {
        crc ^= static_cast<unsigned char>(c);
        for (int bit = 0; bit < 8; ++bit) crc = crc >> 1 ^ ((crc & 1) != 0 ? 0xEDB88320U : 0);
    }
    return ~crc;
}

uint32_t adlerOf(std::string_view bytes) {
    uint32_t a = 1, b = 0;
    for (const char c : bytes) {
        a = (a + static_cast<unsigned char>(c)) % 65521;
        b = (b + a) % 65521;
    }
    return b << 16 | a;
}

std::string chunk(const std::string& name, const std::string& data) {
    return bigEndian(static_cast<uint32_t>(data.size())) + name + data + bigEndian(crcOf(name + data));
}

// A zlib stream of blocks that are stored as they are.
std::string stored(std::string_view bytes) {
    constexpr size_t kLongest = 65535;
    std::string stream = "\x78\x01";
    for (size_t at = 0; at < bytes.size(); at += kLongest) {
        const size_t length = std::min(kLongest, bytes.size() - at);
        const bool last = at + length == bytes.size();
        const auto low = static_cast<char>(length & 0xFF), high = static_cast<char>(length >> 8);
        stream += {last ? '\x01' : '\x00', low, high, static_cast<char>(~low), static_cast<char>(~high)};
        stream += bytes.substr(at, length);
    }
    return stream + bigEndian(adlerOf(bytes));
}

void addColour(std::string& palette, double hue, double saturation, double light) {
    for (const double shift : {0.0, -1.0 / 3, 1.0 / 3}) {
        const double channel = light * (1 - saturation + saturation * (0.5 + 0.5 * std::cos(kTurn * (hue + shift))));
        palette += static_cast<char>(std::clamp(static_cast<int>(channel * 255), 0, 255));
    }
}

// The sky from above to the horizon, then the hills from afar to near.
std::string paletteOf(int number) {
    const double hue = 0.55 + number * 0.137;
    std::string palette;
    for (int i = 0; i < kSkyShades; ++i) {
        const double depth = static_cast<double>(i) / kSkyShades;
        addColour(palette, hue + depth * 0.12, 0.75 - 0.5 * depth, 0.78 + 0.2 * depth);
    }
    for (int i = 0; i < kHills; ++i) addColour(palette, hue + 0.05 + i * 0.02, 0.55, 0.72 - i * 0.135);
    return palette;
}

double ridge(int hill, int x, int number) {
    const double wide = std::sin(x / (52.0 - hill * 5) + number * 1.9 + hill * 2.3);
    const double narrow = std::sin(x / 17.0 + number + hill * 1.1);
    return kHeight * (0.42 + hill * 0.12) + wide * (20 - hill * 2) + narrow * 5;
}

}  // namespace

std::string landscape(int number) {
    std::string rows;
    rows.reserve(static_cast<size_t>(kHeight) * (kWidth + 1));
    for (int y = 0; y < kHeight; ++y) {
        rows += '\0';  // no filter
        for (int x = 0; x < kWidth; ++x) {
            int colour = y * kSkyShades / kHeight;
            for (int hill = 0; hill < kHills; ++hill) {
                if (y > ridge(hill, x, number)) colour = kSkyShades + hill;
            }
            rows += static_cast<char>(colour);
        }
    }
    const std::string format("\x08\x03\x00\x00\x00", 5);  // eight bits a pixel, of a palette
    return "\x89PNG\r\n\x1a\n" + chunk("IHDR", bigEndian(kWidth) + bigEndian(kHeight) + format) +
           chunk("PLTE", paletteOf(number)) + chunk("IDAT", stored(rows)) + chunk("IEND", "");
}

}  // namespace orvel::demo
