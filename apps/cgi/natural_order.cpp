#include "natural_order.h"

#include <unicode/ucol.h>
#include <unicode/unorm2.h>
#include <unicode/ustring.h>

#include <algorithm>
#include <array>
#include <vector>

namespace orvel::cgi {
namespace {

using Units = std::vector<UChar>;

constexpr size_t kLongestLanguage = 32;
constexpr size_t kLongestNumber = 100;  // digits; what is longer goes the long way

// As the root collation orders them; letters come as pairs of lower and upper case after the digits.
constexpr std::string_view kPunctuation = " _-,;:!?.'\"()[]{}@*/\\&#%`^+<=>|~$";
constexpr char kDigitRank = static_cast<char>(kPunctuation.size() + 1);
constexpr char kLetterRank = kDigitRank + 1;
// These order all of ASCII as the root does.
constexpr std::array<std::string_view, 6> kPlainLanguages = {"en", "de", "fr", "it", "nl", "pt"};

bool isDigit(char c) {
    return c >= '0' && c <= '9';
}

char lower(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

// 1 and up; 0 for what is no printable ASCII.
std::array<char, 128> makeRanks() {
    std::array<char, 128> ranks{};
    const auto rank = [&ranks](char c) -> char& { return ranks[static_cast<unsigned char>(c)]; };
    for (size_t i = 0; i < kPunctuation.size(); ++i) rank(kPunctuation[i]) = static_cast<char>(i + 1);
    for (char c = 'a'; c <= 'z'; ++c) {
        rank(c) = static_cast<char>(kLetterRank + (c - 'a'));
        rank(static_cast<char>(c - 'a' + 'A')) = rank(c);
    }
    for (char c = '0'; c <= '9'; ++c) rank(c) = kDigitRank;
    return ranks;
}

const std::array<char, 128>& ranks() {
    static const std::array<char, 128> made = makeRanks();
    return made;
}

Units unitsOf(std::string_view text) {
    Units units(text.size() + 1);
    int32_t length = 0;
    UErrorCode error = U_ZERO_ERROR;
    u_strFromUTF8WithSub(units.data(), static_cast<int32_t>(units.size()), &length, text.data(),
                         static_cast<int32_t>(text.size()), 0xFFFD, nullptr, &error);
    units.resize(U_SUCCESS(error) ? static_cast<size_t>(length) : 0);
    return units;
}

Units decomposed(const Units& units) {
    UErrorCode error = U_ZERO_ERROR;
    const UNormalizer2* form = unorm2_getNFDInstance(&error);
    Units out(units.size() * 4 + 16);
    if (U_FAILURE(error)) return units;
    const int32_t length = unorm2_normalize(form, units.data(), static_cast<int32_t>(units.size()), out.data(),
                                            static_cast<int32_t>(out.size()), &error);
    if (U_FAILURE(error)) return units;
    out.resize(static_cast<size_t>(length));
    return out;
}

bool isAscii(std::string_view text) {
    return std::all_of(text.begin(), text.end(), [](char c) { return static_cast<unsigned char>(c) < 0x80; });
}

// Without case, in one form.
std::string foldedOf(std::string_view text) {
    std::string folded(text.size(), '\0');
    if (isAscii(text)) {
        std::transform(text.begin(), text.end(), folded.begin(), lower);
        return folded;
    }
    const Units units = decomposed(unitsOf(text));
    Units out(units.size() * 3 + 16);
    UErrorCode error = U_ZERO_ERROR;
    const int32_t length = u_strFoldCase(out.data(), static_cast<int32_t>(out.size()), units.data(),
                                         static_cast<int32_t>(units.size()), U_FOLD_CASE_DEFAULT, &error);
    if (U_FAILURE(error)) return std::string(text);
    out.resize(static_cast<size_t>(length));
    folded.resize(out.size() * 3);
    int32_t bytes = 0;
    u_strToUTF8WithSub(folded.data(), static_cast<int32_t>(folded.size()), &bytes, out.data(),
                       static_cast<int32_t>(out.size()), 0xFFFD, nullptr, &error);
    folded.resize(U_SUCCESS(error) ? static_cast<size_t>(bytes) : 0);
    return folded;
}

}  // namespace

bool isLanguage(std::string_view text) {
    const auto fits = [](char c) { return isDigit(c) || c == '-' || c == '_' || (lower(c) >= 'a' && lower(c) <= 'z'); };
    return !text.empty() && text.size() <= kLongestLanguage && std::all_of(text.begin(), text.end(), fits);
}

NaturalOrder::NaturalOrder(const std::string& language) : language_(language) {
    const std::string_view main = std::string_view(language_).substr(0, language_.find_first_of("-_"));
    plain_ = std::find(kPlainLanguages.begin(), kPlainLanguages.end(), main) != kPlainLanguages.end();
}

NaturalOrder::~NaturalOrder() {
    if (collator_ != nullptr) ucol_close(collator_);
}

bool NaturalOrder::open() {
    if (collator_ != nullptr) return true;
    UErrorCode error = U_ZERO_ERROR;
    collator_ = ucol_open(language_.c_str(), &error);
    if (U_SUCCESS(error)) ucol_setAttribute(collator_, UCOL_NUMERIC_COLLATION, UCOL_ON, &error);
    return U_SUCCESS(error);
}

bool NaturalOrder::hasShortKey(std::string_view name) const {
    size_t digits = 0;
    for (const char c : name) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte >= 128 || ranks()[byte] == 0) return false;
        digits = isDigit(c) ? digits + 1 : 0;
        if (digits > kLongestNumber) return false;
    }
    return plain_;
}

// What all letters are, then their cases. A number is its length and its digits, without zeros in front.
void NaturalOrder::appendShortKey(std::string_view name, std::string& out) {
    std::string cases;
    for (size_t at = 0; at < name.size();) {
        const char c = name[at];
        out += ranks()[static_cast<unsigned char>(c)];
        cases += lower(c) == c ? '\1' : '\2';
        ++at;
        if (!isDigit(c)) continue;
        size_t begin = at - 1;
        while (at < name.size() && isDigit(name[at])) ++at;
        while (begin + 1 < at && name[begin] == '0') ++begin;
        out += static_cast<char>(at - begin);
        out.append(name.substr(begin, at - begin));
    }
    out += '\0';
    out += cases;
}

bool NaturalOrder::appendKey(std::string_view name, std::string& out) {
    if (!open()) return false;
    const Units units = unitsOf(name);
    const auto count = static_cast<int32_t>(units.size());
    std::array<uint8_t, 1024> key{};
    const int32_t needed = ucol_getSortKey(collator_, units.data(), count, key.data(), key.size());
    if (needed <= 0) return false;
    if (static_cast<size_t>(needed) <= key.size()) {
        out.append(key.begin(), key.begin() + needed);
        return true;
    }
    std::vector<uint8_t> longer(static_cast<size_t>(needed));
    ucol_getSortKey(collator_, units.data(), count, longer.data(), needed);
    out.append(longer.begin(), longer.end());
    return true;
}

void warmNaturalOrder() {
    std::string key;
    for (const char* language : {"en", "de"}) {
        NaturalOrder order(language);
        static_cast<void>(order.appendKey("\xC3\xA4 10", key));
    }
    static_cast<void>(foldedOf("\xC3\x84"));
}

NameBeginning::NameBeginning(std::string_view text) : folded_(foldedOf(text)) {}

bool NameBeginning::begins(std::string_view name) const {
    return foldedOf(name).starts_with(folded_);
}

}  // namespace orvel::cgi
