// Users and groups as the machine's name services give them. Nothing is remembered here.
#ifndef VEXO_LINUX_ACCOUNT_NSS_H
#define VEXO_LINUX_ACCOUNT_NSS_H

#include <optional>
#include <string>
#include <vector>

#include "accounts/account_record.h"

namespace vexo::nss {

// `failed` leaves errno: the service could not answer, which is other than "there is no such account".
[[nodiscard]] Lookup user(const std::string& name, Account& out);
[[nodiscard]] Lookup user(uid_t uid, Account& out);
[[nodiscard]] Lookup group(const std::string& name, Group& out);
[[nodiscard]] Lookup group(gid_t gid, Group& out);
[[nodiscard]] std::vector<gid_t> groupsOf(const std::string& user, gid_t primary);
// As AccountSource answers.
[[nodiscard]] std::optional<Validity> validity(const std::string& user);
[[nodiscard]] bool users(std::vector<Account>& out);
[[nodiscard]] bool groups(std::vector<Group>& out);

}  // namespace vexo::nss

#endif
