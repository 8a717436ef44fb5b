// The file index: records of files in SQLite databases, found by trees of conditions.
//
// Two kinds of database share one layout: the index of a share, a central store that the platform keeps, and result
// databases, one for each search, which lie where their caller says and may be anybody's garbage: a file that is no
// regular file, has a second name, belongs neither to root nor to the effective user, or holds no such database is
// refused. Operations that take a database path keep it open for the process; what is written is committed in batches,
// within a second, before anything is read, before a fork and at exit; a process that ends by _exit calls
// FILEIDXDBFlush before. A forked child begins anew and leaves what its parent has open alone. In every database the
// pair of share and path is unique. Operations may be called from callbacks.
//
// Where nothing else is said an operation gives 0 or more on success, and on failure <0 with the slot set: 0x0900
// missing or not to be opened, 0x0300 denied, 0x2900 no space, 0x0D00 a bad argument, 0x8100 anything else, such as
// a file that is not a database. A failed write leaves the database as it was before its batch.
#ifndef VEXO_INDEX_H
#define VEXO_INDEX_H

#include <stdint.h>

#include "vexo/export.h"

typedef int BOOL;

enum __tag_FI_SQL_COND_TYPE : int {
    FI_COL_NAME = 0,
    FI_COL_SHARE_ROOT = 1,
    FI_COL_EXTENSION = 2,
    FI_COL_PARENT = 3,
    FI_COL_SHARE = 4,
    FI_COL_PATH = 5,
    FI_COL_IS_DIR = 6,
    FI_COL_SIZE = 7,
    FI_COL_TYPE = 8,
    FI_COL_CREATE_TIME = 9,
    FI_COL_CHANGE_TIME = 10,
    FI_COL_ACCESS_TIME = 11,
    FI_COL_MODIFY_TIME = 12,
    FI_COL_PERMISSION = 13,
    FI_COL_MODE = 14,
    FI_COL_UID = 15,
    FI_COL_GID = 16,
    FI_COL_OWNER = 17,
    FI_COL_GROUP = 18
};

enum __tag_FI_SQL_COND_OP : int {
    FI_OP_EQUAL = 0,
    FI_OP_LESS = 2,
    FI_OP_GREATER = 4,
    FI_OP_GREATER_EQUAL = 5,
    FI_OP_WILDCARD = 6,
    FI_OP_PATH = 8,
    FI_OP_BELOW = 9
};

// A node of a condition tree; the tree borrows its nodes. Zero-filled before use.
//
// Paths (column 5): op 8 with a value V holds for records directly in the folder V ("" is the share's root); and-linked
// with op 9 on the same V it is widened to any depth below V. Op 8 with a value that ends in "/*" holds at any depth
// below what stands before it; no other character is a wildcard. In the condition of a path that a search gives (the
// `paths` of FILEIDXResultGetAndTableGen) the first component is the share's name and is dropped, and a final "/*" is a
// folder of that name. Op 6, on any text, is the wildcard comparison of names, without case, backslash escapes; in the
// `cond` of a search the first 493 bytes of a pattern for names count, as in the criterion. Numbers beyond 64 bits
// count as the largest; the id 4294967295 (columns 15 and 16) equals nothing.
//
// Evaluation: an or-chain holds when one of its members does; a member holds when its own test does and, where it has
// an and-link of its own, that; a member without one takes the chain's first non-null and-link.
struct __tag_FI_SQL_COND {
    __tag_FI_SQL_COND* pAndNext;
    __tag_FI_SQL_COND* pOrNext;
    __tag_FI_SQL_COND_TYPE type;
    __tag_FI_SQL_COND_OP op;
    char szValue[4096];  // text, or a number in decimal
};

// One record. The texts are bytes that end in NUL, never null, and are borrowed for the call.
struct __tag_FI_FILE_INFO_DATA {
    const char* szShareRoot;  // real path of the share's root
    const char* szShare;      // share name
    const char* szName;
    const char* szPath;        // within the share, no leading "/"
    const char* szParent;      // folder part of szPath, "" for the share's root
    const char* szExtension;   // upper case, "" for none
    const char* szPermission;  // "rwxr-xr-x"
    const char* szOwner;
    const char* szGroup;
    int isDir;        // 1 or 0
    int64_t size;     // bytes, 0 for a folder
    int64_t created;  // times are seconds since the epoch
    int64_t changed;
    int64_t accessed;
    int64_t modified;
    uint32_t mode;
    uint32_t uid;
    uint32_t gid;
};

struct FISORT {
    __tag_FI_SQL_COND_TYPE column;
    int descending;  // nonzero
};

// Text columns sort without case, ties by bytes; records equal in every key stand in order of share and path.
struct FIQUERY {
    FISORT sort[2];
    int nSort;                      // 0: no order is asked for
    const __tag_FI_SQL_COND* cond;  // null: every record
    unsigned long offset;
    unsigned long limit;
};

// How many records a share's index holds, and of when it is.
struct FIINDEXSTATUS {
    unsigned long long records;
    unsigned long long folders;  // among them
    int64_t bytes;               // on disk
    int64_t built;               // end of the last build, seconds since the epoch
    int64_t updated;             // end of the last build or update
};

enum { FI_INDEX_BUILD = 0, FI_INDEX_UPDATE = 1 };
// What a writer knows of the index: it lags behind the files, it is in step with them, or it is and will be kept so.
enum { FI_INDEX_BEHIND = 0, FI_INDEX_IN_STEP = 1, FI_INDEX_LIVE = 2 };

VEXO_BEGIN_C
// 1 when the share has the option vexo:index and an index that can be read, else 0.
VEXO_API int FILEIDXIsIndexEnable(const char* share);

// Makes an empty result database, mode 0600; its folder must exist and `path` must not (0x0800).
VEXO_API int FILEIDXDBCreate(const char* path);

// Adds one record, or `count` of them. A record whose share and path are there already is left as it is.
VEXO_API int FILEIDXOutputDBInsert(const char* db, const __tag_FI_FILE_INFO_DATA* record);
VEXO_API int FILEIDXDBInsert(const char* db, const __tag_FI_FILE_INFO_DATA* records, int count);

// Sets the columns of the and-linked nodes `set` (op 0) in every record for which `where` holds; a record that already
// stands at the new share and path is replaced. A null tree is a bad argument here: not every record is meant.
VEXO_API int FILEIDXDBUpdate(const char* db, const __tag_FI_SQL_COND* set, const __tag_FI_SQL_COND* where);
VEXO_API int FILEIDXDBDel(const char* db, const __tag_FI_SQL_COND* where);

// Commits what this process wrote to the database so far.
VEXO_API int FILEIDXDBFlush(const char* db);

// How many records satisfy query->cond (sort, offset and limit do not count).
VEXO_API int FILEIDXCountGet(const char* db, const FIQUERY* query, unsigned long long* count);
// Calls `callback` for each record of the page in order; it ends the page by answering 0. A limit of 0 gives none.
VEXO_API int FILEIDXDBSelect(const char* db, const FIQUERY* query, BOOL (*callback)(__tag_FI_FILE_INFO_DATA*, void*),
                             void* arg);

// Copies the records of a share's index that satisfy `paths` and `cond` (null: all) into the result database `out`,
// with the root that the share has now.
// `accessTest` (may be null) says whether a record's file still satisfies what was asked about its access time, which
// an index cannot know, and may fill in the record's access time; with it, conditions on column 11 are taken to hold.
// `folderTest` (may be null) says whether a record in this folder (path within the share) may be seen. Both are called
// with the caller's own identity, after everything else held. `cancel` (may be null): nonzero ends the copying with
// what is there so far, a success.
VEXO_API int FILEIDXResultGetAndTableGen(const char* share, const __tag_FI_SQL_COND* paths,
                                         const __tag_FI_SQL_COND* cond, const char* out,
                                         BOOL (*accessTest)(__tag_FI_FILE_INFO_DATA*, void*), void* accessArg,
                                         int* cancel, BOOL (*folderTest)(const char*, void*), void* folderArg);

// The work of an indexer, one at a time for each share, in a process that may become root. Begin gives the path of the
// database to write with the operations above: a new one for FI_INDEX_BUILD, the share's index for FI_INDEX_UPDATE. <0
// with 0x1400 no such share, 0x0600 no index to update, 0x0800 another process is at it, 0x8100 the index to update is
// damaged or of another format and must be built anew. End with nonzero `done` makes
// a new one the share's index, as a whole, and notes the time; with 0 it removes it, and leaves an updated one as far
// as it came. A process that dies in between counts as ended with 0.
VEXO_API int FILEIDXIndexBegin(const char* share, int mode, char* path, int size);
VEXO_API int FILEIDXIndexEnd(const char* share, int done);
// Removes the share's index; removing none is 0.
VEXO_API int FILEIDXIndexDrop(const char* share);
// Removes what killed builds left, and counts it; -1 on failure.
VEXO_API long FILEIDXSweep(void);
// 0, or <0 with 0x0600 when there is none.
VEXO_API int FILEIDXIndexStatus(const char* share, FIINDEXSTATUS* status);
// Of when the share's index is, without looking at its records: `updated` as in its status, `live` 1 while a process
// keeps it in step with the files. <0 as for the status.
VEXO_API int FILEIDXIndexAsOf(const char* share, int64_t* updated, int* live);
// Between FILEIDXIndexBegin for an update and its end, after what was written is committed: what the index is now.
// FI_INDEX_IN_STEP and FI_INDEX_LIVE note the time. That it is live ends with the process.
VEXO_API int FILEIDXIndexMark(const char* share, int state);
VEXO_END_C

#endif
