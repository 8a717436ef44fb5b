#include <fcntl.h>

#include <cstdio>
#include <memory>

#include "arguments.h"
#include "base/file.h"
#include "base/owner.h"
#include "command.h"
#include "orvel/sharing_settings.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"
#include "vexo/user.h"

namespace orvel::ctl {
namespace {

constexpr const char* kSettings = "/etc/vexoinfo.conf";
constexpr const char* kChoice = "PX_SHARING_SETTING";

int get(const std::string& user) {
    const bool may = OrvLibUserPrivForSharing(user.c_str()) == 1;
    printf("%s %s create links\n", terminalText(user).c_str(), may ? "may" : "may not");
    return 0;
}

int list() {
    char choice[64] = {};
    VLIBCFileGetKeyValue(kSettings, kChoice, choice, sizeof choice, 0);
    printf("%-12s %s\n", "setting", choice[0] == '\0' ? "everybody" : choice);
    for (const auto& [uid, chosen] : OrvelSharing::SharingManager().getPrivileges()) {
        std::unique_ptr<VEXOUSER, Releaser<VEXOUserFree>> record;
        const bool known = VEXOUserGetByUID(uid, acquire(record)) >= 0;
        printf("%-12s %s\n", known ? terminalText(record->szName).c_str() : std::to_string(uid).c_str(),
               chosen ? "chosen" : "not chosen");
    }
    return 0;
}

// For everybody: the setting of the appliance, locked as every change of it is.
int setForAll(const std::string& choice) {
    const Descriptor file(open(VEXO::SystemPath(kSettings).c_str(), O_RDWR | O_CLOEXEC | O_NOFOLLOW));
    if (file) static_cast<void>(lockFile(file.get(), LOCK_EX));
    const int done = choice == "everybody" ? VLIBCFileRemoveKey(kSettings, kChoice)
                                           : VLIBCFileSetKeyValue(kSettings, kChoice, choice.c_str(), nullptr);
    if (done != 0) fprintf(stderr, "orvelctl: %s could not be changed: %m\n", kSettings);
    return done == 0 ? 0 : 1;
}

int setForUser(const std::string& user, const std::string& choice) {
    if (choice != "yes" && choice != "no") throw UsageError("sharing set --user takes yes or no");
    const bool done = OrvelSharing::SharingManager().setPrivileges({{user, choice == "yes" ? "true" : "false"}});
    if (!done) fprintf(stderr, "orvelctl: the choice could not be stored; the system log says why\n");
    return done ? 0 : 1;
}

int set(const std::vector<std::string>& words) {
    const Arguments arguments(words, "sharing", "set", 1);
    const std::string& choice = arguments.position(0);
    if (arguments.has("--user")) return setForUser(arguments.required("--user"), choice);
    if (choice != "everybody" && choice != "admin_only" && choice != "per_user") {
        throw UsageError("sharing set takes everybody, admin_only or per_user");
    }
    return setForAll(choice);
}

}  // namespace

int sharing(const std::vector<std::string>& words) {
    std::vector<std::string> rest = words;
    const std::string form = takeForm("sharing", rest);
    if (form == "set") return set(rest);
    const Arguments arguments(rest, "sharing", form, form == "get" ? 1 : 0);
    return form == "get" ? get(arguments.position(0)) : list();
}

}  // namespace orvel::ctl
