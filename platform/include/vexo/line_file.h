// Files of lines in which each line is a record: "field,field,field".
#ifndef VEXO_LINE_FILE_H
#define VEXO_LINE_FILE_H

#include "vexo/export.h"

// File names are the appliance's own ("/tmp/foldersharing.current.users") and are taken below the system root. Such
// files lie where anybody may put one: a file that is not regular, has a second name, belongs neither to root nor to
// the effective user or can be written by others, and a symbolic link, is refused (0x0300) without waiting for
// anything.

VEXO_BEGIN_C
// The first line of which a whole field is `key`, into `line`: without its end (LF or CR LF), cut to size - 1 bytes.
// Fields are parted by any byte of `separators`; with "" the line is one field. 1 found; 0 none (`line` becomes "");
// -1 with the slot: 0x0900 no file, 0x0300 not trusted or denied, 0x0D00 a null or an empty key, 0x8100 else. Lines
// with a NUL byte, or of more than 1 MiB, are not found. Reads as root in a process that may become root.
VEXO_API int VLIBCFileGetLine(const char* file, const char* key, char* line, int size, const char* separators);
// Appends `line` and a newline by one write; a missing file is made, mode 0600. A last line that has no end gets one
// first. 0, or -1 with errno and the slot, the file as it was: 0x0D00 a null, a line that holds CR or LF, or one of
// more than `max` bytes (it is never cut); 0x0300 not trusted or denied, 0x0900 no such folder, 0x2900 no space, 0x2400
// quota, 0x8100 else. Writers exclude each other by a critical section. Writes as root in a process that may become
// root, so that the file is root's whoever comes first.
VEXO_API int VLIBCFileAddLine(const char* file, const char* line, int max);
// Renames `from` to `to`, which is replaced, with the identity of the caller. 0, or -1 with errno and the slot: 0x0900
// missing, 0x0300 denied, 0x0D00 null, 0x8100 else.
VEXO_API int VLIBCSysRename(const char* from, const char* to);
VEXO_END_C

#endif
