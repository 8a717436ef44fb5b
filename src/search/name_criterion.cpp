// The criterion on names.
#include <algorithm>
#include <cstring>
#include <string>
#include <string_view>
#include <utility>

#include "base/wildcard.h"
#include "orvel/search_criteria.h"

namespace FileSearch {
namespace {

constexpr std::size_t kPatternLimit = 493;
constexpr char kEscape = '\\';

bool holds(std::string_view text, std::string_view part) {
    return text.find(part) != std::string_view::npos;
}

// Whether the text carries no wildcard of its own and is therefore looked for anywhere in a name. One escaped wildcard
// is taken as a sign that every other of its kind is escaped too; kept: callers rely on it.
bool isPlainSubstring(std::string_view text) {
    return (holds(text, "\\*") || !holds(text, "*")) && (holds(text, "\\?") || !holds(text, "?")) &&
           text.back() != kEscape;
}

// The last component, with the "/" behind it when the path ends in one.
std::string_view lastComponent(std::string_view path) {
    // A search asks this for every entry, mostly with a bare name.
    const void* slash = path.size() < 2 ? nullptr : memrchr(path.data(), '/', path.size() - 1);
    return slash == nullptr ? path
                            : path.substr(static_cast<std::size_t>(static_cast<const char*>(slash) - path.data()) + 1);
}

}  // namespace

FindNameComp::FindNameComp(const char* pattern) {
    std::string text = pattern == nullptr ? "" : pattern;
    if (!text.empty()) {
        // A doubled backslash stays doubled: to the comparison it is one literal backslash.
        if (isPlainSubstring(text)) text = "*" + text + "*";
        setSqlCond(*primary_, FI_COL_NAME, FI_OP_WILDCARD, text, nullptr, nullptr);
    }
    pattern_ = std::make_unique<orvel::Wildcard>(std::string_view(text).substr(0, kPatternLimit), kEscape);
}

FindNameComp::~FindNameComp() = default;

bool FindNameComp::operator()(const char* path, const _tag_VEXOSTAT_& st) {
    const char* given = path == nullptr ? "" : path;
    const bool byAlternative = std::any_of(alternatives_.begin(), alternatives_.end(),
                                           [&](FindNameComp* other) { return (*other)(given, st); });
    return byAlternative || pattern_->match(lastComponent(given));
}

void FindNameComp::orComp(FindNameComp* other) {
    if (other == nullptr || other == this) return;
    orChain_.push_back(primary_);
    alternatives_.push_back(other);
    primary_ = other->primary_;
    primary_->pOrNext = orChain_.back().get();
}

void FindNameComp::adopt(std::unique_ptr<FindNameComp> other) {
    adopted_.push_back(std::move(other));
    orComp(adopted_.back().get());
}

}  // namespace FileSearch
