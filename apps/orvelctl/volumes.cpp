#include <cerrno>
#include <cstdio>
#include <cstring>

#include "arguments.h"
#include "command.h"
#include "vexo/error.h"
#include "vexo/volume.h"

namespace orvel::ctl {
namespace {

void report(const VEXOVOLUMENOTE* note, void* /*argument*/) {
    if (note->error == 0) {
        printf("%s\n", terminalText(note->volume).c_str());
    } else {
        fprintf(stderr, "orvelctl: %s: %s\n", terminalText(note->folder).c_str(), strerror(note->error));
    }
}

// Why not even a first volume was looked at.
void explain(int error) {
    if (error == ENOENT && VLIBCErrGet() == VEXO_ERR_GENERAL) {
        fputs("orvelctl: there are no share definitions, so there are no volumes to prepare\n", stderr);
    } else {
        fprintf(stderr, "orvelctl: the volumes could not be prepared: %s\n", strerror(error));
    }
    if (error != EPERM) fputs("      \"orvelctl doctor shares\" says what to do\n", stderr);
}

}  // namespace

int volumes(const std::vector<std::string>& words) {
    const Arguments arguments(words, "volumes", "", 0);
    bool reported = false;
    const auto take = [](const VEXOVOLUMENOTE* note, void* flag) {
        *static_cast<bool*>(flag) = true;
        report(note, nullptr);
    };
    const int done = arguments.has("--user")
                         ? VEXOVolumesPrepareFor(arguments.required("--user").c_str(), take, &reported)
                         : VEXOVolumesPrepare(take, &reported);
    if (done != 0 && !reported) explain(errno);
    return done == 0 ? 0 : 1;
}

}  // namespace orvel::ctl
