// Dynamic-DNS entries: under which names the appliance is known outside.
#ifndef VEXO_DDNS_H
#define VEXO_DDNS_H

#include "vexo/export.h"

struct VEXODDNS {
    char szProvider[128];
    char szHostname[256];
};

VEXO_BEGIN_C
// Fills `*entry` with the section `provider` (exact case) of /etc/vexo/ddns.conf of the system root
// (docs/formats/ddns.md). 0, or -1 with the slot and the record zero: 0x0D00 a null argument, 0x0900 the file is
// missing or cannot be read, 0x0600 no such provider or one without a usable host name.
VEXO_API int VEXODDNSConfigGet(const char* provider, struct VEXODDNS* entry);
VEXO_END_C

#endif
