// Users and groups from files in the format of passwd(5), group(5) and shadow(5).
#ifndef VEXO_LINUX_ACCOUNT_FILES_H
#define VEXO_LINUX_ACCOUNT_FILES_H

#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "accounts/account_record.h"
#include "io/file_io.h"

namespace vexo {

class AccountFiles {
 public:
    // Reads the files again if they changed. False with errno: ENOENT when one of them is missing.
    [[nodiscard]] bool refresh(const std::string& passwd, const std::string& group);
    // How often they were read.
    [[nodiscard]] unsigned readings() const { return readings_; }

    [[nodiscard]] const std::vector<Account>& users() const { return users_; }
    [[nodiscard]] const std::vector<Group>& groups() const { return groups_; }
    // Null when there is none.
    [[nodiscard]] const Account* user(const std::string& name) const;
    [[nodiscard]] const Account* user(uid_t uid) const;
    [[nodiscard]] const Group* group(const std::string& name) const;
    [[nodiscard]] const Group* group(gid_t gid) const;
    // The groups that list `user` as a member.
    [[nodiscard]] const std::vector<gid_t>& listing(const std::string& user) const;

    // The day on which the account ends; -1 never, or not for this process to know. The file is root's alone, so it is
    // read as root. Nothing, with errno, when it cannot be read.
    [[nodiscard]] std::optional<Validity> validity(const std::string& shadow, const std::string& user);

 private:
    [[nodiscard]] bool readUsers(const std::string& path);
    [[nodiscard]] bool readGroups(const std::string& path);
    [[nodiscard]] bool readValidities(const std::string& path);

    FileVersion passwdVersion_;
    FileVersion groupVersion_;
    FileVersion shadowVersion_;
    bool wereRead_ = false;  // as a whole
    unsigned readings_ = 0;
    std::vector<Account> users_;
    std::vector<Group> groups_;
    // Positions of the first record of a name or an id: as with NSS, the first one counts.
    std::unordered_map<std::string, size_t> userByName_;
    std::unordered_map<uid_t, size_t> userByUid_;
    std::unordered_map<std::string, size_t> groupByName_;
    std::unordered_map<gid_t, size_t> groupByGid_;
    std::unordered_map<std::string, std::vector<gid_t>> listing_;
    std::unordered_map<std::string, Validity> validities_;
};

}  // namespace vexo

#endif
