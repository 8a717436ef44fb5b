// Names that the file manager never shows.
#include <cstring>

#include "vexo/filesystem.h"

int VEXOEAIsHiddenDir(const char* name) {
    return name != nullptr && strcmp(name, "@vexoea") == 0 ? 1 : 0;
}

int VEXOEAIsHiddenFile(const char* name) {
    if (name == nullptr) return 0;
    if (name[0] == '.') return name[1] == '\0' || (name[1] == '.' && name[2] == '\0') ? 1 : 0;
    if (name[0] != '@') return 0;
    return VEXOEAIsHiddenDir(name) == 1 || strcmp(name, "@tmp") == 0 ? 1 : 0;
}
