// A camera's RAW file as small as it can be.
#ifndef ORVEL_TESTS_APPS_CAMERA_FILE_H
#define ORVEL_TESTS_APPS_CAMERA_FILE_H

#include <cstdint>
#include <string>
#include <vector>

namespace support {

struct TiffField {
    std::uint16_t tag, type;
    std::vector<std::uint32_t> values;
};

inline std::string littleEndian(std::uint32_t value, size_t bytes) {
    std::string text;
    for (size_t i = 0; i < bytes; ++i) text += static_cast<char>(value >> (8 * i));
    return text;
}

// A directory of fields that lies `at` in its file.
inline std::string tiffDirectory(const std::vector<TiffField>& fields, size_t at) {
    constexpr size_t kSizes[] = {0, 1, 1, 2, 4};
    const size_t behind = at + 2 + 12 * fields.size() + 4;
    std::string table = littleEndian(static_cast<std::uint32_t>(fields.size()), 2), data;
    for (const TiffField& field : fields) {
        std::string values;
        for (const std::uint32_t value : field.values) values += littleEndian(value, kSizes[field.type]);
        table += littleEndian(field.tag, 2) + littleEndian(field.type, 2) +
                 littleEndian(static_cast<std::uint32_t>(field.values.size()), 4);
        if (values.size() <= 4) {
            values.resize(4);
            table += values;
        } else {
            table += littleEndian(static_cast<std::uint32_t>(behind + data.size()), 4);
            data += values;
        }
    }
    return table + std::string(4, '\0') + data;
}

// DNG with a preview of 320x160 pixels from a camera that was held on its side, and what a sensor of 128x96 saw.
inline std::string cameraFileWith(const std::string& preview) {
    constexpr std::uint32_t kSensor = 512, kPreview = 1024;
    const auto size = static_cast<std::uint32_t>(preview.size());
    std::string file = std::string("II*\0\x08\0\0\0", 8);
    file += tiffDirectory({{254, 4, {1}},
                           {256, 4, {320}},
                           {257, 4, {160}},
                           {258, 3, {8, 8, 8}},
                           {259, 3, {7}},
                           {262, 3, {6}},
                           {271, 2, {'M', 0}},
                           {272, 2, {'M', 0}},
                           {273, 4, {kPreview}},
                           {274, 3, {6}},
                           {277, 3, {3}},
                           {278, 4, {160}},
                           {279, 4, {size}},
                           {330, 4, {kSensor}},
                           {50706, 1, {1, 4, 0, 0}},
                           {50708, 2, {'M', 0}}},
                          file.size());
    file.resize(kSensor);
    file += tiffDirectory({{254, 4, {0}},
                           {256, 4, {128}},
                           {257, 4, {96}},
                           {258, 3, {16}},
                           {259, 3, {1}},
                           {262, 3, {32803}},
                           {273, 4, {kPreview + size}},
                           {277, 3, {1}},
                           {278, 4, {96}},
                           {279, 4, {128 * 96 * 2}},
                           {33421, 3, {2, 2}},
                           {33422, 1, {0, 1, 1, 2}}},
                          kSensor);
    file.resize(kPreview);
    return file + preview + std::string(128 * 96 * 2, '\0');
}

}  // namespace support

#endif
