#include <unistd.h>

#include <string>

#include "doctor_checks.h"

namespace orvel::ctl {
namespace {

struct Decoder {
    const char* what;
    const char* program;
    const char* package;
};

constexpr Decoder kDecoders[] = {
    {"images", "/usr/bin/vipsthumbnail", "libvips-tools"},
    {"PDF documents", "/usr/bin/pdftoppm", "poppler-utils"},
    {"films", ORVEL_DECODERS "/film-picture", "orvel-films"},
    {"cameras' RAW files", ORVEL_DECODERS "/raw-picture", "orvel"},
};

}  // namespace

void checkPictures(Findings& findings) {
    for (const Decoder& decoder : kDecoders) {
        if (access(decoder.program, X_OK) == 0) continue;
        findings.push_back({.severity = Severity::kNote,
                            .text = std::string("there are no small pictures of ") + decoder.what,
                            .advice = std::string("apt install ") + decoder.package,
                            .file = decoder.program});
    }
    if (findings.empty()) findings.push_back({.text = "what draws small pictures is there"});
}

}  // namespace orvel::ctl
