// What the share definitions say, section by section: for whoever asks why a share is not there.
#ifndef VEXO_SHARE_REPORT_H
#define VEXO_SHARE_REPORT_H

#include "vexo/export.h"

enum {
    VEXO_NOTE_SHARE,     // the section is a share
    VEXO_NOTE_HOMES,     // [homes] of homes that lie where each account has its own
    VEXO_NOTE_OFF,       // not meant to be a share here: switched off, or a printer
    VEXO_NOTE_CLOSED,    // one option closes it; there is a note for each such option
    VEXO_NOTE_LEFT_OUT,  // the section is malformed
    VEXO_NOTE_PROBLEM,   // something outside every section
};

struct VEXOSHARENOTE {
    int kind;            // VEXO_NOTE_...
    const char* share;   // the section's name; "" for a problem
    const char* path;    // the share's root, variables as they are written; "" where there is none
    const char* file;    // real path
    int line;            // where the section begins; of the option that closes it, or of the malformed line
    const char* option;  // that closes it; "veto files" of a share, as Samba shows what the system keeps there
    const char* text;    // its value
    const char* why;     // of a share: the user who defined it, "" for the administrator
};

VEXO_BEGIN_C
// Hands over the notes in the order of the definitions, problems first; each lives as long as the call. The path of the
// main file goes into `file` at once. 0; -1 with errno when the definitions cannot be read, or `file` is too small.
VEXO_API int VEXOShareReport(char* file, int size, void (*take)(const VEXOSHARENOTE*, void*), void* argument);
VEXO_END_C

#endif
