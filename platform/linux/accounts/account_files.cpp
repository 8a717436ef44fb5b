#include "accounts/account_files.h"

#include <grp.h>
#include <pwd.h>
#include <shadow.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstdio>
#include <memory>

#include "base/owner.h"
#include "base/raised_identity.h"
#include "failure.h"

namespace vexo {
namespace {

using File = std::unique_ptr<FILE, orvel::Releaser<fclose>>;

// Opens a regular file to read records from; null with errno.
File openRecords(const std::string& path, FileVersion& version) {
    Descriptor fd = openFile(path, O_RDONLY | O_NONBLOCK | O_NOCTTY);
    struct stat status {};
    if (!fd || fstat(fd.get(), &status) != 0) return nullptr;
    if (!S_ISREG(status.st_mode)) {
        errno = EINVAL;
        return nullptr;
    }
    version = FileVersion(status);
    File file(fdopen(fd.get(), "r"));
    if (file != nullptr) static_cast<void>(fd.release());
    return file;
}

// Lines that begin so stand for records of another service, which these files are not asked for.
bool isRecordName(const char* name) {
    return name[0] != '\0' && name[0] != '+' && name[0] != '-';
}

template <class Key, class Record>
const Record* recordAt(const std::unordered_map<Key, size_t>& index, const Key& key,
                       const std::vector<Record>& records) {
    const auto found = index.find(key);
    return found == index.end() ? nullptr : &records[found->second];
}

}  // namespace

bool AccountFiles::refresh(const std::string& passwd, const std::string& group) {
    if (wereRead_ && passwdVersion_.isCurrentAt(passwd) && groupVersion_.isCurrentAt(group)) return true;
    ++readings_;
    wereRead_ = readUsers(passwd) && readGroups(group);
    return wereRead_;
}

bool AccountFiles::readUsers(const std::string& path) {
    users_.clear();
    userByName_.clear();
    userByUid_.clear();
    const File file = openRecords(path, passwdVersion_);
    if (file == nullptr) return false;
    while (const passwd* record = fgetpwent(file.get())) {
        if (!isRecordName(record->pw_name)) continue;
        userByName_.emplace(record->pw_name, users_.size());
        userByUid_.emplace(record->pw_uid, users_.size());
        users_.push_back({record->pw_name, record->pw_uid, record->pw_gid, record->pw_dir});
    }
    return ferror(file.get()) == 0;
}

bool AccountFiles::readGroups(const std::string& path) {
    groups_.clear();
    groupByName_.clear();
    groupByGid_.clear();
    listing_.clear();
    const File file = openRecords(path, groupVersion_);
    if (file == nullptr) return false;
    while (const ::group* record = fgetgrent(file.get())) {
        if (!isRecordName(record->gr_name)) continue;
        groupByName_.emplace(record->gr_name, groups_.size());
        groupByGid_.emplace(record->gr_gid, groups_.size());
        groups_.push_back({record->gr_name, record->gr_gid});
        for (char** member = record->gr_mem; *member != nullptr; ++member) listing_[*member].push_back(record->gr_gid);
    }
    return ferror(file.get()) == 0;
}

const Account* AccountFiles::user(const std::string& name) const {
    return recordAt(userByName_, name, users_);
}

const Account* AccountFiles::user(uid_t uid) const {
    return recordAt(userByUid_, uid, users_);
}

const Group* AccountFiles::group(const std::string& name) const {
    return recordAt(groupByName_, name, groups_);
}

const Group* AccountFiles::group(gid_t gid) const {
    return recordAt(groupByGid_, gid, groups_);
}

const std::vector<gid_t>& AccountFiles::listing(const std::string& user) const {
    static const std::vector<gid_t> none;
    const auto found = listing_.find(user);
    return found == listing_.end() ? none : found->second;
}

std::optional<Validity> AccountFiles::validity(const std::string& shadow, const std::string& user) {
    const int before = errno;
    if (!shadowVersion_.isCurrentAt(shadow) && !readValidities(shadow)) return std::nullopt;
    errno = before;
    const auto found = validities_.find(user);
    return found == validities_.end() ? Validity() : found->second;
}

// No file, and one that is closed to this process, count as one without an end of anybody.
bool AccountFiles::readValidities(const std::string& path) {
    validities_.clear();
    shadowVersion_ = {};
    FileVersion version;
    const orvel::RaisedIdentity raised;
    const File file = openRecords(path, version);
    if (file == nullptr) return errno == ENOENT || errno == ENOTDIR || errno == EACCES;
    while (const spwd* record = fgetspent(file.get())) {
        validities_.emplace(record->sp_namp, Validity{record->sp_expire, isLockedPassword(record->sp_pwdp)});
    }
    if (ferror(file.get()) != 0) return false;
    shadowVersion_ = version;
    return true;
}

}  // namespace vexo
