#include "archive_library.h"

#include <dlfcn.h>
#include <syslog.h>

namespace orvel::cgi {
namespace {

template <class Function>
bool find(void* library, const char* name, Function& function) {
    function = reinterpret_cast<Function>(dlsym(library, name));
    return function != nullptr;
}

ArchiveLibrary functions;

bool findAll() {
    void* library = dlopen(ORVEL_ARCHIVE_LIBRARY, RTLD_NOW | RTLD_LOCAL);
    bool whole = library != nullptr;
#define ORVEL_FIND_FUNCTION(name) whole = whole && find(library, #name, functions.name);
    ORVEL_ARCHIVE_FUNCTIONS(ORVEL_FIND_FUNCTION)
#undef ORVEL_FIND_FUNCTION
    if (!whole) syslog(LOG_ERR, "%s is missing or too old: nothing can be packed or unpacked", ORVEL_ARCHIVE_LIBRARY);
    return whole;
}

}  // namespace

const ArchiveLibrary& libarchive = functions;

bool loadArchiveLibrary() {
    static const bool loaded = findAll();
    return loaded;
}

}  // namespace orvel::cgi
