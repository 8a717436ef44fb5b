// Names that the file manager never shows.
#include <cstring>

#include "base/new_file.h"
#include "vexo/filesystem.h"
#include "vexo/share_files.h"

static_assert(orvel::kPartPrefix == VEXO_PART_PREFIX);

int VEXOEAIsHiddenDir(const char* name) {
    return name != nullptr && strcmp(name, "@vexoea") == 0 ? 1 : 0;
}

int VEXOEAIsHiddenFile(const char* name) {
    if (name == nullptr) return 0;
    if (strcmp(name, ".") == 0 || strcmp(name, "..") == 0) return 1;
    if (orvel::isPartName(name)) return 1;
    if (VEXOEAIsHiddenDir(name) == 1 || strcmp(name, "@tmp") == 0) return 1;
    return VEXOShareVetoes(name);
}
