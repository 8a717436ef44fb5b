// Names that the file manager never shows.
#include <cstring>

#include "vexo/filesystem.h"

int VEXOEAIsHiddenDir(const char* name) {
    return name != nullptr && strcmp(name, "@vexoea") == 0 ? 1 : 0;
}

int VEXOEAIsHiddenFile(const char* name) {
    if (name == nullptr) return 0;
    if (strcmp(name, ".") == 0 || strcmp(name, "..") == 0) return 1;
    if (strncmp(name, VEXO_PART_PREFIX, strlen(VEXO_PART_PREFIX)) == 0) return 1;
    return VEXOEAIsHiddenDir(name) == 1 || strcmp(name, "@tmp") == 0 ? 1 : 0;
}
