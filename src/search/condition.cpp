// Filling of condition nodes.
#include <cstdio>
#include <cstring>

#include "orvel/search_criteria.h"

namespace FileSearch {
namespace {

void fill(__tag_FI_SQL_COND& c, __tag_FI_SQL_COND_TYPE type, __tag_FI_SQL_COND_OP op, __tag_FI_SQL_COND* andNext,
          __tag_FI_SQL_COND* orNext) {
    std::memset(&c, 0, sizeof c);
    c.pAndNext = andNext;
    c.pOrNext = orNext;
    c.type = type;
    c.op = op;
}

}  // namespace

void setSqlCond(__tag_FI_SQL_COND& c, __tag_FI_SQL_COND_TYPE type, __tag_FI_SQL_COND_OP op, std::string value,
                __tag_FI_SQL_COND* andNext, __tag_FI_SQL_COND* orNext) {
    fill(c, type, op, andNext, orNext);
    snprintf(c.szValue, sizeof c.szValue, "%s", value.c_str());
}

void setSqlCond(__tag_FI_SQL_COND& c, __tag_FI_SQL_COND_TYPE type, __tag_FI_SQL_COND_OP op, unsigned long long value,
                __tag_FI_SQL_COND* andNext, __tag_FI_SQL_COND* orNext) {
    fill(c, type, op, andNext, orNext);
    snprintf(c.szValue, sizeof c.szValue, "%llu", value);
}

}  // namespace FileSearch
