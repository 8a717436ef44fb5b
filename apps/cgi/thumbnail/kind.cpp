#include "thumbnail/kind.h"

#include <algorithm>

namespace orvel::cgi {
namespace {

using namespace std::string_view_literals;

struct Sign {
    size_t at;
    std::string_view bytes;
    Kind kind;
};

// The first that fits counts.
constexpr Sign kSigns[] = {
    {0, "%PDF-"sv, Kind::kDocument},
    {0, "\xFF\xD8\xFF"sv, Kind::kPicture},
    {0, "\x89PNG\r\n"sv, Kind::kPicture},
    {0, "GIF8"sv, Kind::kPicture},
    {8, "WEBP"sv, Kind::kPicture},
    {8, "CR\2\0"sv, Kind::kRaw},
    {0, "FUJIFILMCCD-RAW"sv, Kind::kRaw},
    {0, "IIU\0"sv, Kind::kRaw},
    {0, "IIRO"sv, Kind::kRaw},
    {0, "IIRS"sv, Kind::kRaw},
    {0, "MMOR"sv, Kind::kRaw},
    {0, "II*\0"sv, Kind::kPictureOrRaw},
    {0, "MM\0*"sv, Kind::kPictureOrRaw},
    {0, "\x1A\x45\xDF\xA3"sv, Kind::kFilm},  // Matroska, WebM
    {8, "AVI "sv, Kind::kFilm},
    {0, "\x30\x26\xB2\x75\x8E\x66\xCF\x11"sv, Kind::kFilm},  // WMV
    {0, "FLV\1"sv, Kind::kFilm},
    {0, "OggS"sv, Kind::kFilm},
    {0, "\0\0\1\xBA"sv, Kind::kFilm},  // MPEG
    {4, "moov"sv, Kind::kFilm},
    {4, "mdat"sv, Kind::kFilm},
    {4, "wide"sv, Kind::kFilm},
};

// Of the family of MP4 the brand decides.
constexpr std::string_view kPictures[] = {"avif", "avis", "heic", "heix", "heim",
                                          "heis", "hevc", "hevx", "mif1", "msf1"};
constexpr std::string_view kSounds[] = {"M4A ", "M4B ", "M4P "};

bool standsAt(std::string_view bytes, size_t at, std::string_view sign) {
    return bytes.size() >= at && bytes.substr(at).starts_with(sign);
}

template <size_t size>
bool isAmong(const std::string_view (&list)[size], std::string_view word) {
    return std::find(std::begin(list), std::end(list), word) != std::end(list);
}

Kind kindOfBrand(std::string_view brand) {
    if (isAmong(kPictures, brand)) return Kind::kPicture;
    if (brand == "crx ") return Kind::kRaw;
    return isAmong(kSounds, brand) ? Kind::kNone : Kind::kFilm;
}

// Packets of 188 bytes, of cameras with a time before each.
bool isTransportStream(std::string_view bytes) {
    return (standsAt(bytes, 0, "G") && standsAt(bytes, 188, "G") && standsAt(bytes, 376, "G")) ||
           (standsAt(bytes, 4, "G") && standsAt(bytes, 196, "G") && standsAt(bytes, 388, "G"));
}

}  // namespace

Kind kindOf(std::string_view bytes) {
    if (standsAt(bytes, 4, "ftyp") && bytes.size() >= 12) return kindOfBrand(bytes.substr(8, 4));
    for (const Sign& sign : kSigns) {
        if (standsAt(bytes, sign.at, sign.bytes)) return sign.kind;
    }
    return isTransportStream(bytes) ? Kind::kFilm : Kind::kNone;
}

}  // namespace orvel::cgi
