#include "criteria.h"

#include <algorithm>
#include <string_view>

#include "orvel/error_state.h"
#include "reply.h"
#include "request.h"

namespace orvel::cgi {
namespace {

using namespace FileSearch;

// The library cuts a longer one and would look for something else.
constexpr size_t kLongestPattern = 490;
constexpr size_t kMostPatterns = 100;

enum class Value { kText, kPatterns, kExtensions, kNumber, kKind };

struct Criterion {
    const char* name;
    _tag_FIND_FIELD_ field;
    const char* op;
    Value value;
};

constexpr Criterion kCriteria[] = {{"name", FIND_NAME, nullptr, Value::kPatterns},
                                   {"type", FIND_TYPE, nullptr, Value::kKind},
                                   {"extension", FIND_EXTENSION, nullptr, Value::kExtensions},
                                   {"owner", FIND_OWNER, nullptr, Value::kText},
                                   {"group", FIND_GROUP, nullptr, Value::kText},
                                   {"mtime_from", FIND_MTIME, "from", Value::kNumber},
                                   {"mtime_to", FIND_MTIME, "before", Value::kNumber},
                                   {"crtime_from", FIND_CRTIME, "from", Value::kNumber},
                                   {"crtime_to", FIND_CRTIME, "before", Value::kNumber},
                                   {"atime_from", FIND_ATIME, "from", Value::kNumber},
                                   {"atime_to", FIND_ATIME, "before", Value::kNumber},
                                   {"size_equal", FIND_SIZE, "equal", Value::kNumber},
                                   {"size_less", FIND_SIZE, "less", Value::kNumber},
                                   {"size_greater", FIND_SIZE, "greater", Value::kNumber}};

// The elements that hold more than blanks, again separated by commas; "" when one is too long or they are too many.
// Blanks around an element belong to it, unless `trim` is set.
std::string usablePatterns(std::string_view list, bool trim) {
    constexpr const char* blanks = " \t\r\n\v\f";
    std::string usable;
    size_t count = 0;
    while (!list.empty()) {
        const size_t end = std::min(list.find(','), list.size());
        std::string_view element = list.substr(0, end);
        list.remove_prefix(std::min(end + 1, list.size()));
        const size_t first = element.find_first_not_of(blanks);
        if (first == std::string_view::npos) continue;
        if (trim) element = element.substr(first, element.find_last_not_of(blanks) + 1 - first);
        if (element.size() > kLongestPattern || ++count > kMostPatterns) return "";
        if (!usable.empty()) usable += ',';
        usable += element;
    }
    return usable;
}

int addCriterion(const Criterion& criterion, const std::string& value, Criteria& criteria) {
    switch (criterion.value) {
        case Value::kKind:
            if (value == "all") return ORV_ERR_NONE;
            if (value != "dir" && value != "file") return ORV_ERR_PARAMETER;
            return criteria.add(criterion.field, value.c_str(), value);
        case Value::kNumber:
            if (!parseNumber(value)) return ORV_ERR_PARAMETER;
            return criteria.add(criterion.field, criterion.op, value);
        case Value::kPatterns:
        case Value::kExtensions: {
            const std::string patterns = usablePatterns(value, criterion.value == Value::kExtensions);
            return patterns.empty() ? ORV_ERR_PARAMETER : criteria.add(criterion.field, criterion.op, patterns);
        }
        case Value::kText:
            break;
    }
    return criteria.add(criterion.field, criterion.op, value);
}

}  // namespace

Criteria::~Criteria() {
    for (const FindComp* criterion : list_) delete criterion;
}

int Criteria::add(_tag_FIND_FIELD_ field, const char* op, const std::string& value) {
    const size_t before = list_.size();
    OrvLibSetErr(ORV_ERR_NONE);
    if (!FindFactory::createFindOp(field, op, value.c_str(), list_)) return lastCode();
    if (field == FIND_ATIME && list_.size() > before) {
        accessTimes_.push_back(static_cast<FindATimeComp*>(list_.back()));
    }
    return ORV_ERR_NONE;
}

int Criteria::addNames(const std::string& patterns) {
    const std::string usable = usablePatterns(patterns, false);
    return usable.empty() ? static_cast<int>(ORV_ERR_PARAMETER) : add(FIND_NAME, nullptr, usable);
}

const std::vector<std::string>& criterionNames() {
    static const std::vector<std::string> names = [] {
        std::vector<std::string> made;
        for (const Criterion& criterion : kCriteria) made.emplace_back(criterion.name);
        return made;
    }();
    return names;
}

int parseCriteria(const std::function<std::string(const std::string& name)>& valueOf, Criteria& criteria,
                  std::string& culprit) {
    for (const Criterion& criterion : kCriteria) {
        const std::string value = valueOf(criterion.name);
        if (value.empty()) continue;
        culprit = criterion.name;
        const int code = addCriterion(criterion, value, criteria);
        if (code != ORV_ERR_NONE) return code;
    }
    culprit.clear();
    return criteria.list().empty() ? ORV_ERR_PARAMETER : ORV_ERR_NONE;
}

}  // namespace orvel::cgi
