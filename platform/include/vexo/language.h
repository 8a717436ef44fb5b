// The language of a request, and tables of texts in it.
#ifndef VEXO_LANGUAGE_H
#define VEXO_LANGUAGE_H

#include "vexo/export.h"

typedef struct VEXOSTRINGS* PVEXOSTRINGS;

VEXO_BEGIN_C
// The language code of the request: "en" English, "de" German. The language that HTTP_ACCEPT_LANGUAGE wants most (by
// quality, then order; "de-AT" is "de"; quality 0 is never taken); when it names none of them or only "*", the setting
// "language" of /etc/vexoinfo.conf, else "en". Asked anew at each call. Never null; a literal.
VEXO_API const char* VexoCgiSelectDefLang(void);

// Opens the table of texts of a module ("filetable": letters, digits, "_" and "-") in the language of the request:
// /usr/vexo/texts/<language>/<module>.conf below the system root, else the same of the installed data; a table that
// a language lacks is taken in English. The table is a settings file. Null with the slot: 0x0D00 a bad name, 0x0900 no
// such table, 0x8100 else.
VEXO_API PVEXOSTRINGS VexoCgiStringBundleOpen(const char* module);
// The text of `key`, the bundle's own; null when there is none or for a null.
VEXO_API const char* VexoCgiStringBundleGet(PVEXOSTRINGS bundle, const char* key);
VEXO_API void VexoCgiStringBundleClose(PVEXOSTRINGS bundle);  // null is accepted
VEXO_END_C

#endif
