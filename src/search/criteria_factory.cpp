// Criteria from the fields of a search request.
#include <json/value.h>
#include <strings.h>

#include <cctype>
#include <cstdlib>
#include <memory>
#include <string>
#include <string_view>

#include "core/boundary.h"
#include "orvel/error_state.h"
#include "orvel/search_criteria.h"
#include "vexo/user.h"
#include "vexo/web.h"

namespace FileSearch {
namespace {

using Criteria = std::vector<FindComp*>;

// The caller deletes what is in `out`, so a criterion leaves its owner only once it is in there.
void append(Criteria& out, std::unique_ptr<FindComp> criterion) {
    if (!criterion) return;
    out.push_back(criterion.get());
    static_cast<void>(criterion.release());
}

bool fail(int code) {
    OrvLibSetErr(code);
    return false;
}

bool argumentsPresent(_tag_FIND_FIELD_ field, const char* op, const char* value) {
    if (field == FIND_TYPE) return op != nullptr;
    const bool needsOperator = field >= FIND_MTIME && field <= FIND_SIZE;
    return value != nullptr && (!needsOperator || op != nullptr);
}

bool isBlank(char c) {
    return std::isspace(static_cast<unsigned char>(c)) != 0;
}

// White space at both ends dropped, then one pair of double quotes around what remains.
std::string_view bare(std::string_view text) {
    while (!text.empty() && isBlank(text.front())) text.remove_prefix(1);
    while (!text.empty() && isBlank(text.back())) text.remove_suffix(1);
    if (text.size() > 2 && text.front() == '"' && text.back() == '"') text = text.substr(1, text.size() - 2);
    return text;
}

std::string namePattern(const std::string& element) {
    return std::string(bare(element));
}

// No number counts as 0; a value over the largest as that.
unsigned long long number(const char* value) {
    return std::strtoull(value, nullptr, 10);
}

std::unique_ptr<FindTypeComp> typeCriterion(const char* word) {
    if (word == nullptr) return nullptr;
    if (strcasecmp(word, "dir") == 0) return std::make_unique<FindTypeComp>(true);
    return strcasecmp(word, "file") == 0 ? std::make_unique<FindTypeComp>(false) : nullptr;
}

std::string extensionPattern(const std::string& element) {
    return "*." + element;
}

// One criterion whose alternatives are the elements of `list`; null when it has none.
std::unique_ptr<FindNameComp> createNames(const char* list, std::string (*toPattern)(const std::string&)) {
    std::unique_ptr<FindNameComp> head;
    for (const Json::Value& element : VEXO::WebAPIUtil::ParseToArray(list, ",")) {
        if (!element.isString()) continue;
        auto criterion = std::make_unique<FindNameComp>(toPattern(element.asString()).c_str());
        if (head) {
            head->adopt(std::move(criterion));
        } else {
            head = std::move(criterion);
        }
    }
    return head;
}

// Both criteria or, when memory is out, none.
void appendExtensions(Criteria& out, const char* value) {
    auto names = createNames(value, extensionPattern);
    out.reserve(out.size() + 2);
    append(out, typeCriterion("file"));
    append(out, std::move(names));
}

}  // namespace

bool FindFactory::createFindOp(_tag_FIND_FIELD_ field, const char* op, const char* value, Criteria& out) {
    return orvel::guarded(false, [&] {
        if (!argumentsPresent(field, op, value)) return fail(ORV_ERR_PARAMETER);
        uid_t uid = 0;
        gid_t gid = 0;
        switch (field) {
            case FIND_NAME:
                append(out, createNames(value, namePattern));
                break;
            case FIND_TYPE:
                append(out, typeCriterion(op));
                break;
            case FIND_EXTENSION:
                appendExtensions(out, value);
                break;
            case FIND_OWNER:
                if (VEXOUserGetUGID(value, &uid, &gid) < 0) return fail(ORV_ERR_USER);
                append(out, std::make_unique<FindUserComp>(value, uid));
                break;
            case FIND_GROUP:
                if (VEXOGroupGetGID(value, &gid) != 0) return fail(ORV_ERR_GROUP);
                append(out, std::make_unique<FindGroupComp>(value, gid));
                break;
            case FIND_MTIME:
                append(out, std::make_unique<FindMTimeComp>(op, number(value)));
                break;
            case FIND_CRTIME:
                append(out, std::make_unique<FindCRTimeComp>(op, number(value)));
                break;
            case FIND_ATIME:
                append(out, std::make_unique<FindATimeComp>(op, number(value)));
                break;
            case FIND_SIZE:
                append(out, std::make_unique<FindSizeComp>(op, number(value)));
                break;
            default:
                break;
        }
        return true;
    });
}

FindTypeComp* FindTypeCompFactory::createFindTypeOpt(const char* word) {
    return orvel::guarded(static_cast<FindTypeComp*>(nullptr), [&] { return typeCriterion(word).release(); });
}

}  // namespace FileSearch
