// The file index: records of files in SQLite databases, found by trees of conditions.
#ifndef VEXO_INDEX_H
#define VEXO_INDEX_H

#include "vexo/export.h"

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
// Evaluation: an or-chain holds when one of its members does; a member holds when its own test does and, where it has
// an and-link of its own, that; a member without one takes the chain's first non-null and-link.
struct __tag_FI_SQL_COND {
    __tag_FI_SQL_COND* pAndNext;
    __tag_FI_SQL_COND* pOrNext;
    __tag_FI_SQL_COND_TYPE type;
    __tag_FI_SQL_COND_OP op;
    char szValue[4096];  // text, or a number in decimal
};

#endif
