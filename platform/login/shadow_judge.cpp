// A log-in by the system root's own etc/shadow: for a root that is not the machine's.
#include <crypt.h>
#include <fcntl.h>
#include <shadow.h>
#include <syslog.h>

#include <algorithm>
#include <cstdio>
#include <ctime>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "accounts/account_record.h"
#include "base/descriptor.h"
#include "base/owner.h"
#include "talk.h"
#include "vexo/system_root.h"

namespace vexo::login {
namespace {

constexpr time_t kSecondsOfDay = 86400;

struct Entry {
    std::string hash;
    bool locked = false;
    long changed = -1, good = -1;  // days, as shadow(5) has them
};

struct Found {
    std::optional<Entry> entry;
    std::string example;  // a hash of the file: what judging costs
};

bool isHash(std::string_view field) {
    return field.starts_with('$');
}

// False when the file cannot be read.
bool find(const std::string& user, Found& found) {
    orvel::Descriptor fd(open(VEXO::SystemPath("/etc/shadow").c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
    const std::unique_ptr<FILE, orvel::Releaser<fclose>> file(fd ? fdopen(fd.get(), "r") : nullptr);
    if (!file) return false;
    static_cast<void>(fd.release());
    while (const spwd* record = fgetspent(file.get())) {
        const std::string_view field = record->sp_pwdp;
        const std::string_view hash = field.substr(std::min(field.find_first_not_of('!'), field.size()));
        if (found.example.empty() && isHash(hash)) found.example = hash;
        if (found.entry || user != record->sp_namp) continue;
        found.entry = {.hash = std::string(hash),
                       .locked = isLockedPassword(field),
                       .changed = record->sp_lstchg,
                       .good = record->sp_max};
    }
    return ferror(file.get()) == 0;
}

bool matches(const char* password, const std::string& hash) {
    const auto data = std::make_unique<crypt_data>();
    const char* made = crypt_r(password, hash.c_str(), data.get());
    const bool same = made != nullptr && isHash(hash) && hash == made;
    explicit_bzero(data.get(), sizeof *data);
    return same;
}

// A password is to be changed when that was asked for (day 0), or after its days.
bool hasExpired(const Entry& entry) {
    if (entry.changed < 0) return false;
    const long today = time(nullptr) / kSecondsOfDay;
    return entry.changed == 0 || (entry.good >= 0 && today > entry.changed + entry.good);
}

}  // namespace

void judgeByShadow(Talk& talk) {
    Secret password;
    if (!talk.ask("Password: ", true, password)) return talk.refuse(VEXO_LOGIN_SERVICE);
    Found found;
    if (!find(talk.user(), found)) {
        syslog(LOG_ERR, "log-in: etc/shadow of the system root cannot be read: %m");
        return talk.refuse(VEXO_LOGIN_SERVICE);
    }
    // An unknown name, and one without a password, costs what the others do.
    const bool known = found.entry && isHash(found.entry->hash);
    if (!matches(password.text, known ? found.entry->hash : found.example) || !known) {
        talk.waitAsForAnyFailure({});
        return talk.refuse(VEXO_LOGIN_WRONG);
    }
    if (found.entry->locked) return talk.refuse(VEXO_LOGIN_LOCKED);
    if (hasExpired(*found.entry)) return talk.refuse(VEXO_LOGIN_EXPIRED);
    admitUser(talk, talk.user());
}

void judgeNobody(Talk& talk) {
    Secret password;
    if (!talk.ask("Password: ", true, password)) return talk.refuse(VEXO_LOGIN_SERVICE);
    talk.waitAsForAnyFailure({});
    talk.refuse(VEXO_LOGIN_WRONG);
}

}  // namespace vexo::login
