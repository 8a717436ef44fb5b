/* String lists and hashes, owned by the caller from allocation to the matching free. Strings are copied in. */
#ifndef VEXO_LIST_H
#define VEXO_LIST_H

#include "vexo/export.h"

VEXO_BEGIN_C

typedef struct _VLIBCSZLIST_ {
    int nItem; /* number of strings; read only */
} VLIBCSZLIST, *PVLIBCSZLIST;

typedef struct _VLIBCSZHASH_* PVLIBCSZHASH;

/* An empty list. `capacity` is a hint, never a limit; any value is accepted. Null when memory is out. */
VEXO_API PVLIBCSZLIST VLIBCSzListAlloc(int capacity);
/* Appends a copy of `text`. The list may move: `*list` is updated. Returns the new count; -1 (the list unchanged) for a
 * null argument or no memory. */
VEXO_API int VLIBCSzListPush(PVLIBCSZLIST* list, const char* text);
/* The string at `index`, owned by the list until it changes; null past either end or for a null list. */
VEXO_API const char* VLIBCSzListGet(PVLIBCSZLIST list, int index);
/* Sorts in place. Option 16: ascending without case, ties by bytes. Other options leave the order. Null is accepted. */
VEXO_API void VLIBCSzListSortItems(PVLIBCSZLIST list, int option);
VEXO_API void VLIBCSzListFree(PVLIBCSZLIST list); /* null is accepted */

/* Cuts `text` in place at any byte of `separators`, appends the non-empty pieces to `*out` and returns their number;
 * -1 for a null argument or no memory. */
VEXO_API int VLIBCStrTok(char* text, const char* separators, PVLIBCSZLIST* out);

/* An empty map from string to string that keeps the order of insertion. Null when memory is out. */
VEXO_API PVLIBCSZHASH VLIBCSzHashAlloc(int capacity);
/* Adds a pair; the first value of a key is kept. 0, or -1 for a null argument or no memory. */
VEXO_API int VLIBCSzHashSetValue(PVLIBCSZHASH* hash, const char* key, const char* value);
/* The value of `key`, owned by the hash; null when absent. */
VEXO_API const char* VLIBCSzHashGetValue(PVLIBCSZHASH hash, const char* key);
/* Appends the keys to `*out` in order of insertion and returns their number; -1 for a null argument or no memory. */
VEXO_API int VLIBCSzHashEnumKey(PVLIBCSZHASH hash, PVLIBCSZLIST* out);
VEXO_API void VLIBCSzHashFree(PVLIBCSZHASH hash); /* null is accepted */

VEXO_END_C

#endif
