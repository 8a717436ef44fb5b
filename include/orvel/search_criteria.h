// Search criteria: each decides whether one file matches, and carries the same test as a condition for the file index.
//
// All criteria of one search must hold; the patterns of one name criterion are alternatives. The conditions of a
// criterion are shared between the criteria that link to them, so criteria may be deleted in any order; links made by
// chaining (operator()(FindComp*)) borrow, and a chained tree is valid while all of its criteria live. Nothing here is
// logged. `new` of a criterion may throw std::bad_alloc and nothing else.
#ifndef ORVEL_SEARCH_CRITERIA_H
#define ORVEL_SEARCH_CRITERIA_H

#include <sys/types.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "orvel/export.h"
#include "vexo/index.h"
#include "vexo/stat.h"

namespace orvel {
class Wildcard;
}

namespace FileSearch {

// Zero-fills `c`, then sets type, op, both links and the value, cut at 4,095 bytes (a number is written in decimal).
ORVEL_API void setSqlCond(__tag_FI_SQL_COND& c, __tag_FI_SQL_COND_TYPE type, __tag_FI_SQL_COND_OP op, std::string value,
                          __tag_FI_SQL_COND* andNext, __tag_FI_SQL_COND* orNext);
ORVEL_API void setSqlCond(__tag_FI_SQL_COND& c, __tag_FI_SQL_COND_TYPE type, __tag_FI_SQL_COND_OP op,
                          unsigned long long value, __tag_FI_SQL_COND* andNext, __tag_FI_SQL_COND* orNext);

class ORVEL_API FindComp {
 public:
    virtual ~FindComp();
    // Whether the file matches. `path`: its path or bare name, any bytes; null counts as "". `st`: its status, with the
    // creation time where a criterion asks for it. No side effects.
    virtual bool operator()(const char* path, const _tag_VEXOSTAT_& st) = 0;

    FindComp(const FindComp&) = delete;
    FindComp& operator=(const FindComp&) = delete;

    // The criterion's condition, owned by it; for the first criterion of a chain the root of the whole tree.
    __tag_FI_SQL_COND* getFirstCond() const { return primary_.get(); }
    // Links `next`'s condition behind this criterion's own (AND). Null does nothing. Borrows.
    void operator()(FindComp* next);

 protected:
    FindComp();

    std::shared_ptr<__tag_FI_SQL_COND> primary_;    // never null
    std::shared_ptr<__tag_FI_SQL_COND> secondary_;  // null unless the test needs two conditions
};

// The last component of the path against a wildcard pattern, without case. A pattern without an unescaped wildcard is
// looked for anywhere in the name ("report" becomes "*report*"), unless it ends in a backslash.
class ORVEL_API FindNameComp : public FindComp {
 public:
    // `pattern`: UTF-8, backslash escapes; the first 493 bytes of what results are compared. Null or empty: a criterion
    // that matches no file.
    explicit FindNameComp(const char* pattern);
    ~FindNameComp() override;
    // A path that ends in "/" is compared by its last component together with that "/". Alternatives are asked first.
    bool operator()(const char* path, const _tag_VEXOSTAT_& st) override;
    using FindComp::operator();

    // Makes `other` an alternative of this criterion, asked before it, and the root of its or-chain of conditions. Null
    // and the criterion itself do nothing. Takes no ownership: `other` must live as long as this criterion is asked;
    // the two may be deleted in any order. Neither may already be an alternative of the other.
    void orComp(FindNameComp* other);

    // The same, and `other` lives as long as this criterion.
    void adopt(std::unique_ptr<FindNameComp> other);

 private:
    std::unique_ptr<orvel::Wildcard> pattern_;  // compiled once
    std::vector<FindNameComp*> alternatives_;
    std::vector<std::unique_ptr<FindNameComp>> adopted_;
    std::vector<std::shared_ptr<__tag_FI_SQL_COND>> orChain_;  // keeps what the primary condition's or-links reach
};

// Folders, or regular files; links, sockets and devices are neither.
class ORVEL_API FindTypeComp : public FindComp {
 public:
    explicit FindTypeComp(bool isDir);
    ~FindTypeComp() override;
    bool operator()(const char* path, const _tag_VEXOSTAT_& st) override;
    using FindComp::operator();

 private:
    bool isDir_;
};

// Files of one owner. `name` (null counts as "") is what the index compares beside the id. The id 0xFFFFFFFF matches
// nothing.
class ORVEL_API FindUserComp : public FindComp {
 public:
    FindUserComp(const char* name, uid_t uid);
    ~FindUserComp() override;
    bool operator()(const char* path, const _tag_VEXOSTAT_& st) override;
    using FindComp::operator();

 private:
    uint32_t uid_;
};

// Files of one group; as FindUserComp.
class ORVEL_API FindGroupComp : public FindComp {
 public:
    FindGroupComp(const char* name, gid_t gid);
    ~FindGroupComp() override;
    bool operator()(const char* path, const _tag_VEXOSTAT_& st) override;
    using FindComp::operator();

 private:
    uint32_t gid_;
};

// The size in bytes; a folder counts as 0. `op` is "equal" (within about 5 per cent), "less" (both exactly so spelled)
// or any other word, or null, for greater. A size beyond the largest signed number counts as that.
class ORVEL_API FindSizeComp : public FindComp {
 public:
    FindSizeComp(const char* op, unsigned long long size);
    ~FindSizeComp() override;
    bool operator()(const char* path, const _tag_VEXOSTAT_& st) override;
    using FindComp::operator();

 private:
    int kind_;  // 1 equal, 2 greater, 3 less
    int64_t upper_;
    int64_t value_;
};

// A time in seconds since the epoch. `op` is "before" (without case) or any other word, or null, for at-or-after. A
// time beyond the largest signed number counts as that.
class ORVEL_API FindTimeComp : public FindComp {
 public:
    FindTimeComp(__tag_FI_SQL_COND_TYPE type, const char* op, unsigned long long time);
    ~FindTimeComp() override;
    bool operator()(const char* path, const _tag_VEXOSTAT_& st) override;
    using FindComp::operator();
    virtual long getTime(const _tag_VEXOSTAT_& st) = 0;  // which time of the file is compared

 private:
    int kind_;  // 2 at or after, 3 before
    long notBefore_;
    long before_;
};

class ORVEL_API FindMTimeComp : public FindTimeComp {
 public:
    FindMTimeComp(const char* op, unsigned long long time);
    ~FindMTimeComp() override;
    long getTime(const _tag_VEXOSTAT_& st) override;
};

class ORVEL_API FindCRTimeComp : public FindTimeComp {
 public:
    FindCRTimeComp(const char* op, unsigned long long time);
    ~FindCRTimeComp() override;
    long getTime(const _tag_VEXOSTAT_& st) override;
};

class ORVEL_API FindATimeComp : public FindTimeComp {
 public:
    FindATimeComp(const char* op, unsigned long long time);
    ~FindATimeComp() override;
    long getTime(const _tag_VEXOSTAT_& st) override;
};

// What a criterion is made from; the comment names the operator and the value that createFindOp takes.
enum _tag_FIND_FIELD_ : int {
    FIND_NAME = 0,  // -, patterns separated by commas (white space and one pair of double quotes around each dropped)
    FIND_TYPE = 1,  // "dir" or "file", -
    FIND_EXTENSION = 2,  // -, extensions separated by commas; regular files only
    FIND_OWNER = 3,      // -, user name
    FIND_GROUP = 4,      // -, group name
    FIND_MTIME = 5,      // "before" or any other word, decimal seconds
    FIND_CRTIME = 6,
    FIND_ATIME = 7,
    FIND_SIZE = 8  // "equal", "less" or any other word, decimal bytes
};

class ORVEL_API FindFactory {
 public:
    // Appends the criteria of one search field to `out`, whose owner deletes them: none or one (for FIND_EXTENSION the
    // files-only criterion and the names). `op`, `value`: as the browser sent them; required only where the field uses
    // them, except that every field but FIND_TYPE requires `value`. Invalid numbers count as 0. A field above
    // FIND_SIZE adds nothing and succeeds.
    // False with the library code 400 (a required argument is null), 403 (unknown user), 404 (unknown group), 401 (no
    // memory); what stood in `out` is left. Success stores no code.
    static bool createFindOp(_tag_FIND_FIELD_ field, const char* op, const char* value, std::vector<FindComp*>& out);
};

class ORVEL_API FindTypeCompFactory {
 public:
    // A new criterion (the caller's) for "dir" or "file", in any case; null for any other word, and for null.
    static FindTypeComp* createFindTypeOpt(const char* word);
};

}  // namespace FileSearch

#endif
