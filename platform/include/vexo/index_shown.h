// Searching a share's index for somebody who waits for the first results.
#ifndef VEXO_INDEX_SHOWN_H
#define VEXO_INDEX_SHOWN_H

#include "vexo/index.h"

VEXO_BEGIN_C
// As FILEIDXResultGetAndTableGen. `shown` (may be null) is the order that is waited for: where the index keeps it, up
// to 1,000 of the records that come first in it are copied, and committed, first. It is only a matter of time: the
// results are the same, and what takes long to find in that order is found in any.
VEXO_API int FILEIDXResultGetShown(const char* share, const __tag_FI_SQL_COND* paths, const __tag_FI_SQL_COND* cond,
                                   const char* out, BOOL (*accessTest)(__tag_FI_FILE_INFO_DATA*, void*),
                                   void* accessArg, int* cancel, BOOL (*folderTest)(const char*, void*),
                                   void* folderArg, const FISORT* shown);
VEXO_END_C

#endif
