#include "settings/language_choice.h"

#include <strings.h>

#include <algorithm>
#include <array>
#include <optional>

#include "web/cgi_text.h"

namespace vexo {
namespace {

constexpr std::array kLanguages = {kEnglish, "de"};
constexpr int kFullQuality = 1000;

// "0.8" in thousandths; empty for what is no quality.
std::optional<int> parseQuality(std::string_view text) {
    if (text.empty() || text.size() > 5 || (text[0] != '0' && text[0] != '1')) return {};
    if (text.size() > 1 && text[1] != '.') return {};
    int thousandths = (text[0] - '0') * kFullQuality;
    int digit = kFullQuality / 10;
    for (const char c : text.substr(std::min<size_t>(2, text.size()))) {
        if (c < '0' || c > '9') return {};
        thousandths += (c - '0') * digit;
        digit /= 10;
    }
    return std::min(thousandths, kFullQuality);
}

// The quality behind a language range; one that cannot be read makes the range count for nothing.
std::optional<int> qualityOf(std::string_view parameters) {
    while (!parameters.empty()) {
        const std::string_view parameter = trimBlanks(takePiece(parameters, ';'));
        if (parameter.starts_with("q=") || parameter.starts_with("Q=")) return parseQuality(parameter.substr(2));
    }
    return kFullQuality;
}

// The index of the language that a range like "de-AT" names; -1 for none of ours.
int languageOf(std::string_view range) {
    const std::string_view primary = range.substr(0, range.find('-'));
    for (size_t i = 0; i < kLanguages.size(); ++i) {
        const std::string_view code = kLanguages[i];
        if (code.size() == primary.size() && strncasecmp(code.data(), primary.data(), code.size()) == 0) {
            return static_cast<int>(i);
        }
    }
    return -1;
}

}  // namespace

const char* chooseLanguage(std::string_view acceptLanguage, std::string_view setting) {
    std::array<bool, kLanguages.size()> refused{};
    int best = languageOf(setting);
    int bestQuality = 0;
    while (!acceptLanguage.empty()) {
        std::string_view parameters = takePiece(acceptLanguage, ',');
        const int language = languageOf(trimBlanks(takePiece(parameters, ';')));
        const auto quality = qualityOf(parameters);
        if (language < 0 || !quality) continue;
        if (*quality == 0) refused[static_cast<size_t>(language)] = true;
        if (*quality <= bestQuality) continue;
        best = language;
        bestQuality = *quality;
    }
    if (best < 0 || (bestQuality == 0 && refused[static_cast<size_t>(best)])) return kEnglish;
    return kLanguages[static_cast<size_t>(best)];
}

}  // namespace vexo
