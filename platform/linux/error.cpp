#include "vexo/error.h"

namespace {

struct ErrorSlot {
    int code = 0;
    const char* file = "";
    int line = 0;
};

ErrorSlot slot;

}  // namespace

void VLIBCErrSetEx(int code, const char* file, int line) {
    slot = {code, file == nullptr ? "" : file, line};
}

int VLIBCErrGet() {
    return slot.code;
}

const char* VLIBCErrorGetFile() {
    return slot.file;
}

int VLIBCErrorGetLine() {
    return slot.line;
}
