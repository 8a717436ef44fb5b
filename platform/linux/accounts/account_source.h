// Users and groups of this machine. From etc/passwd and etc/group of the system root where it has both, else from NSS.
// What was found, and what was not, is remembered for the process; files are read again when they changed.
#ifndef VEXO_LINUX_ACCOUNT_SOURCE_H
#define VEXO_LINUX_ACCOUNT_SOURCE_H

#include <sys/types.h>

#include <optional>
#include <string>
#include <type_traits>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "accounts/account_files.h"
#include "accounts/account_record.h"

namespace vexo {

class AccountSource {
 public:
    static AccountSource& instance();

    // Reads the files of the system root again when they changed. Never asks NSS.
    void refreshFiles();

    // `failed` leaves errno, and `out` is filled only when found. Names are looked up as they are typed, and the record
    // keeps that spelling.
    [[nodiscard]] Lookup user(const std::string& name, Account& out);
    [[nodiscard]] Lookup user(uid_t uid, Account& out);
    [[nodiscard]] Lookup group(const std::string& name, Group& out);
    [[nodiscard]] Lookup group(gid_t gid, Group& out);

    // Every group of `user`, `primary` in front; false with errno.
    [[nodiscard]] bool groupsOf(const std::string& user, gid_t primary, std::vector<gid_t>& out);
    // The day on which the account ends; -1 never, or not for this process to know (only root may ask). Nothing, with
    // errno, when it could not be determined.
    [[nodiscard]] std::optional<Validity> validity(const std::string& user);

    // All of them in the order of the source; false with errno.
    [[nodiscard]] bool users(std::vector<Account>& out);
    [[nodiscard]] bool groups(std::vector<Group>& out);

 private:
    enum class Origin { files, nss, unreadable };
    [[nodiscard]] Origin refresh();

    AccountFiles files_;
    unsigned readings_ = 0;
    // Ids that the files do not have. Not even a look at the files is spent on them again (until something else finds
    // the files changed): a folder can hold thousands of entries of a user who is gone.
    std::unordered_set<uid_t> unknownUids_;
    std::unordered_set<gid_t> unknownGids_;

    template <class Key>
    using Arg = std::conditional_t<std::is_arithmetic_v<Key>, Key, const Key&>;
    template <class Key, class Record>
    using Memory = std::unordered_map<Key, std::optional<Record>>;  // empty: known to be missing
    template <class Key, class Record, class Nss>
    [[nodiscard]] Lookup find(Memory<Key, Record>& memory, const Key& key, Record& out,
                              const Record* (AccountFiles::*inFiles)(Arg<Key>) const, const Nss& nss);

    Memory<std::string, Account> userByName_;
    Memory<uid_t, Account> userByUid_;
    Memory<std::string, Group> groupByName_;
    Memory<gid_t, Group> groupByGid_;
    std::unordered_map<std::string, std::vector<gid_t>> groupsOfUser_;
    std::unordered_map<std::string, Validity> validityOfUser_;
};

}  // namespace vexo

#endif
