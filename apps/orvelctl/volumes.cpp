#include <cerrno>
#include <cstdio>
#include <cstring>

#include "arguments.h"
#include "command.h"
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
    if (done != 0 && !reported) fprintf(stderr, "orvelctl: the volumes could not be prepared: %m\n");
    return done == 0 ? 0 : 1;
}

}  // namespace orvel::ctl
