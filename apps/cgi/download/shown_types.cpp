#include "download/shown_types.h"

#include <string>

namespace orvel::cgi {
namespace {

struct Shown {
    std::string_view extension;
    const char* type;
};

constexpr const char* kText = "text/plain; charset=utf-8";
constexpr Shown kShown[] = {{"jpg", "image/jpeg"},  {"jpeg", "image/jpeg"}, {"png", "image/png"}, {"gif", "image/gif"},
                            {"webp", "image/webp"}, {"avif", "image/avif"}, {"txt", kText},       {"log", kText},
                            {"md", kText},          {"csv", kText}};

}  // namespace

const char* shownType(std::string_view name) {
    const size_t dot = name.rfind('.');
    if (dot == std::string_view::npos) return nullptr;
    std::string extension(name.substr(dot + 1));
    for (char& c : extension) c = c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
    for (const Shown& shown : kShown) {
        if (shown.extension == extension) return shown.type;
    }
    return nullptr;
}

}  // namespace orvel::cgi
