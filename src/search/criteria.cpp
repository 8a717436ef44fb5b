// Criteria on the status of a file: type, owner, group, size and times.
#include <strings.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <limits>
#include <memory>

#include "orvel/search_criteria.h"

namespace FileSearch {
namespace {

enum { kEqual = 1, kGreater = 2, kLess = 3 };     // kinds of a size
enum { kAtOrAfter = kGreater, kBefore = kLess };  // kinds of a time

constexpr mode_t kFileTypeBits = 0xF000;
constexpr mode_t kFolder = 0x4000;
constexpr mode_t kRegularFile = 0x8000;
constexpr uint32_t kNoId = 0xFFFFFFFF;

bool isFolder(const _tag_VEXOSTAT_& st) {
    return (st.st_mode & kFileTypeBits) == kFolder;
}

template <class Signed>
Signed capped(unsigned long long value) {
    return static_cast<Signed>(std::min(value, static_cast<unsigned long long>(std::numeric_limits<Signed>::max())));
}

std::shared_ptr<__tag_FI_SQL_COND> newCondition() {
    return std::make_shared<__tag_FI_SQL_COND>();
}

std::string text(const char* name) {
    return name == nullptr ? std::string() : std::string(name);
}

}  // namespace

FindComp::FindComp() : primary_(newCondition()) {}

FindComp::~FindComp() = default;

void FindComp::operator()(FindComp* next) {
    if (next == nullptr) return;
    (secondary_ ? secondary_ : primary_)->pAndNext = next->primary_.get();
}

FindTypeComp::FindTypeComp(bool isDir) : isDir_(isDir) {
    setSqlCond(*primary_, FI_COL_IS_DIR, FI_OP_EQUAL, isDir ? 1ULL : 0ULL, nullptr, nullptr);
}

FindTypeComp::~FindTypeComp() = default;

bool FindTypeComp::operator()(const char*, const _tag_VEXOSTAT_& st) {
    return (st.st_mode & kFileTypeBits) == (isDir_ ? kFolder : kRegularFile);
}

FindUserComp::FindUserComp(const char* name, uid_t uid) : uid_(uid) {
    secondary_ = newCondition();
    setSqlCond(*secondary_, FI_COL_OWNER, FI_OP_WILDCARD, text(name), nullptr, nullptr);
    setSqlCond(*primary_, FI_COL_UID, FI_OP_EQUAL, static_cast<unsigned long long>(uid), nullptr, secondary_.get());
}

FindUserComp::~FindUserComp() = default;

bool FindUserComp::operator()(const char*, const _tag_VEXOSTAT_& st) {
    return uid_ != kNoId && st.st_uid == uid_;
}

FindGroupComp::FindGroupComp(const char* name, gid_t gid) : gid_(gid) {
    secondary_ = newCondition();
    setSqlCond(*secondary_, FI_COL_GROUP, FI_OP_WILDCARD, text(name), nullptr, nullptr);
    setSqlCond(*primary_, FI_COL_GID, FI_OP_EQUAL, static_cast<unsigned long long>(gid), nullptr, secondary_.get());
}

FindGroupComp::~FindGroupComp() = default;

bool FindGroupComp::operator()(const char*, const _tag_VEXOSTAT_& st) {
    return gid_ != kNoId && st.st_gid == gid_;
}

// "equal" and "less" are recognised in exact case, unlike "before": kept, callers rely on it.
FindSizeComp::FindSizeComp(const char* op, unsigned long long size)
    : kind_(kGreater), upper_(0), value_(capped<int64_t>(size)) {
    const std::string word = text(op);
    if (word == "equal") {
        kind_ = kEqual;
        const int64_t tolerance = std::max<int64_t>((value_ >> 2) / 5, 1);
        upper_ = capped<int64_t>(static_cast<unsigned long long>(value_) + static_cast<unsigned long long>(tolerance));
        value_ = value_ > tolerance ? value_ - tolerance : 0;
        secondary_ = newCondition();
        setSqlCond(*secondary_, FI_COL_SIZE, FI_OP_GREATER_EQUAL, static_cast<unsigned long long>(value_), nullptr,
                   nullptr);
        setSqlCond(*primary_, FI_COL_SIZE, FI_OP_LESS, static_cast<unsigned long long>(upper_), secondary_.get(),
                   nullptr);
        return;
    }
    if (word == "less") kind_ = kLess;
    setSqlCond(*primary_, FI_COL_SIZE, kind_ == kLess ? FI_OP_LESS : FI_OP_GREATER,
               static_cast<unsigned long long>(value_), nullptr, nullptr);
}

FindSizeComp::~FindSizeComp() = default;

bool FindSizeComp::operator()(const char*, const _tag_VEXOSTAT_& st) {
    const int64_t size = isFolder(st) ? 0 : st.st_size;
    switch (kind_) {
        case kEqual:
            return value_ <= size && size < upper_;
        case kGreater:
            return size > value_;
        case kLess:
            return size < value_;
        default:
            return false;
    }
}

FindTimeComp::FindTimeComp(__tag_FI_SQL_COND_TYPE type, const char* op, unsigned long long time)
    : kind_(strcasecmp(text(op).c_str(), "before") == 0 ? kBefore : kAtOrAfter),
      notBefore_(capped<long>(time)),
      before_(notBefore_) {
    setSqlCond(*primary_, type, kind_ == kBefore ? FI_OP_LESS : FI_OP_GREATER_EQUAL,
               static_cast<unsigned long long>(before_), nullptr, nullptr);
}

FindTimeComp::~FindTimeComp() = default;

bool FindTimeComp::operator()(const char*, const _tag_VEXOSTAT_& st) {
    const long time = getTime(st);
    if (kind_ == kAtOrAfter) return time >= notBefore_;
    return kind_ == kBefore && time < before_;
}

FindMTimeComp::FindMTimeComp(const char* op, unsigned long long time) : FindTimeComp(FI_COL_MODIFY_TIME, op, time) {}
FindMTimeComp::~FindMTimeComp() = default;
long FindMTimeComp::getTime(const _tag_VEXOSTAT_& st) {
    return st.st_modify;
}

FindCRTimeComp::FindCRTimeComp(const char* op, unsigned long long time) : FindTimeComp(FI_COL_CREATE_TIME, op, time) {}
FindCRTimeComp::~FindCRTimeComp() = default;
long FindCRTimeComp::getTime(const _tag_VEXOSTAT_& st) {
    return st.st_create;
}

FindATimeComp::FindATimeComp(const char* op, unsigned long long time) : FindTimeComp(FI_COL_ACCESS_TIME, op, time) {}
FindATimeComp::~FindATimeComp() = default;
long FindATimeComp::getTime(const _tag_VEXOSTAT_& st) {
    return st.st_access;
}

}  // namespace FileSearch
