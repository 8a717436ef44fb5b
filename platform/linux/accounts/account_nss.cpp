#include "accounts/account_nss.h"

#include <grp.h>
#include <pwd.h>
#include <shadow.h>

#include <algorithm>
#include <cerrno>

#include "base/raised_identity.h"
#include "failure.h"

namespace vexo::nss {
namespace {

constexpr size_t kFirstBuffer = 4096;
constexpr size_t kLastBuffer = size_t{16} << 20;  // groups list all their members
constexpr size_t kMaxGroups = 65536;

// What the services answer for a name or id that does not exist, by their manuals.
bool meansMissing(int error) {
    return error == 0 || error == ENOENT || error == ESRCH || error == EBADF || error == EPERM;
}

// Asks one of the get..._r functions with buffers that grow until the record fits.
template <class Record, class Ask>
Lookup ask(Record& record, std::vector<char>& buffer, const Ask& call) {
    buffer.resize(kFirstBuffer);
    while (true) {
        Record* result = nullptr;
        const int error = call(&record, buffer.data(), buffer.size(), &result);
        if (result != nullptr) return Lookup::found;
        if (error == ERANGE && buffer.size() < kLastBuffer) {
            buffer.resize(buffer.size() * 4);
        } else if (error != EINTR) {
            if (meansMissing(error)) return Lookup::missing;
            errno = error;
            return Lookup::failed;
        }
    }
}

template <class Call>
Lookup askUser(Account& out, const Call& call) {
    passwd record{};
    std::vector<char> buffer;
    const Lookup answer = ask(record, buffer, call);
    if (answer == Lookup::found) out = {record.pw_name, record.pw_uid, record.pw_gid, record.pw_dir};
    return answer;
}

template <class Call>
Lookup askGroup(Group& out, const Call& call) {
    ::group record{};
    std::vector<char> buffer;
    const Lookup answer = ask(record, buffer, call);
    if (answer == Lookup::found) out = {record.gr_name, record.gr_gid};
    return answer;
}

}  // namespace

Lookup user(const std::string& name, Account& out) {
    const Lookup answer = askUser(out, [&](passwd* record, char* buffer, size_t size, passwd** result) {
        return getpwnam_r(name.c_str(), record, buffer, size, result);
    });
    if (answer == Lookup::found) out.name = name;  // as typed: a service may answer with another spelling
    return answer;
}

Lookup user(uid_t uid, Account& out) {
    return askUser(out, [&](passwd* record, char* buffer, size_t size, passwd** result) {
        return getpwuid_r(uid, record, buffer, size, result);
    });
}

Lookup group(const std::string& name, Group& out) {
    return askGroup(out, [&](::group* record, char* buffer, size_t size, ::group** result) {
        return getgrnam_r(name.c_str(), record, buffer, size, result);
    });
}

Lookup group(gid_t gid, Group& out) {
    return askGroup(out, [&](::group* record, char* buffer, size_t size, ::group** result) {
        return getgrgid_r(gid, record, buffer, size, result);
    });
}

std::vector<gid_t> groupsOf(const std::string& user, gid_t primary) {
    std::vector<gid_t> gids(64);
    int count = static_cast<int>(gids.size());
    while (getgrouplist(user.c_str(), primary, gids.data(), &count) < 0 && gids.size() < kMaxGroups) {
        gids.resize(std::max(static_cast<size_t>(count), gids.size() * 2));
        count = static_cast<int>(gids.size());
    }
    // Never more than was filled in: what resize adds are zeroes, the group of root.
    gids.resize(std::min(static_cast<size_t>(count), gids.size()));
    return gids;
}

std::optional<Validity> validity(const std::string& user) {
    const int before = errno;
    const orvel::RaisedIdentity raised;
    spwd record{};
    std::vector<char> buffer;
    const Lookup answer = ask(record, buffer, [&](spwd* out, char* bytes, size_t size, spwd** result) {
        return getspnam_r(user.c_str(), out, bytes, size, result);
    });
    if (answer == Lookup::failed && errno != EACCES) return std::nullopt;
    errno = before;
    return answer == Lookup::found ? Validity{record.sp_expire, isLockedPassword(record.sp_pwdp)} : Validity();
}

bool users(std::vector<Account>& out) {
    setpwent();
    while (true) {
        errno = 0;
        const passwd* record = getpwent();
        if (record == nullptr) break;
        out.push_back({record->pw_name, record->pw_uid, record->pw_gid, record->pw_dir});
    }
    const int error = errno;
    endpwent();
    errno = error;
    return meansMissing(error);
}

bool groups(std::vector<Group>& out) {
    setgrent();
    while (true) {
        errno = 0;
        const ::group* record = getgrent();
        if (record == nullptr) break;
        out.push_back({record->gr_name, record->gr_gid});
    }
    const int error = errno;
    endgrent();
    errno = error;
    return meansMissing(error);
}

}  // namespace vexo::nss
