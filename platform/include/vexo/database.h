// Questions to a database file, read only.
#ifndef VEXO_DATABASE_H
#define VEXO_DATABASE_H

#include "vexo/export.h"

typedef struct VEXODB* PVEXODB;
typedef struct VEXODBRESULT* PVEXODBRESULT;

VEXO_BEGIN_C
// Opens the SQLite database `file`, a name of the appliance's own ("/usr/vexo/etc/pexlander/pxsharing.db") taken below
// the system root, with the caller's identity. Never makes or changes it, but for ending a change that its writer's
// death left half done. Null with the slot: 0x0900 missing, 0x0300 denied or not trusted (no regular file, a link, a
// second name, of neither root nor the effective user, writable by others), 0x0D00 null, 0x8100 else. A file that is no
// database is found out by the first statement.
VEXO_API PVEXODB VEXODBConnect(const char* file);
// Runs one statement and keeps all its rows in `*result`, the caller's, which outlives the connection. 0, or -1 with
// `*result` null and the slot: 0x0D00 a null or more than one statement, 0x8100 anything else, that is a broken or
// locked database, bad SQL, a statement that would write, more than 64 MiB of rows. Answers within ten seconds.
VEXO_API int VEXODBExecute(PVEXODB db, const char* sql, PVEXODBRESULT* result);
// Why the last Execute failed, for a log; "" when it did not, or for null. The connection's until its next use.
VEXO_API const char* VEXODBErrorGet(PVEXODB db);
VEXO_API void VEXODBClose(PVEXODB db);  // null is accepted

// Goes to the next row, the first one at first. 0 with its number (from 0) in `*row`; -1 with `*row` -1 after the last
// and for a null.
VEXO_API int VEXODBFetchRow(PVEXODBRESULT result, int* row);
// The field of a row already fetched, as text that the result owns; column names are compared without case (ASCII).
// Null for NULL, an unknown column, a row that is not there and a null.
VEXO_API const char* VEXODBFetchField(PVEXODBRESULT result, int row, const char* name);
VEXO_API void VEXODBFreeResult(PVEXODBRESULT result);  // null is accepted
VEXO_END_C

#endif
