// What a file is, as far as a picture of it can be made.
#ifndef ORVEL_CGI_THUMBNAIL_KIND_H
#define ORVEL_CGI_THUMBNAIL_KIND_H

#include <string_view>

namespace orvel::cgi {

enum class Kind {
    kNone,
    kPicture,
    kDocument,
    kFilm,
    kRaw,          // what a camera's sensor saw, with a preview within
    kPictureOrRaw  // TIFF, which many cameras write as well
};

// How many of the first bytes are needed.
constexpr size_t kKindBytes = 512;

// By the first bytes: what a name says is not believed.
[[nodiscard]] Kind kindOf(std::string_view bytes);

}  // namespace orvel::cgi

#endif
