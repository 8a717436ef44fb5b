// The lists of all users, all groups, and the groups of one user.
#include <syslog.h>

#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <optional>

#include "base/printable.h"
#include "core/boundary.h"
#include "core/owned.h"
#include "enum/group_ids.h"
#include "orvel/listing.h"

namespace {

constexpr const char* kSource = "orvelenum";
constexpr int kGroupListCapacity = 512;

// Reads every record of one source into `map`, by the field `id`.
template <class Owner, class Database, class Cursor, class Map>
void collect(Database* database, AUTH_TYPE type, Cursor cursor, unsigned int Owner::element_type::*id, Map& map) {
    Owner record;  // the cursor fills the same one again and again; the last is freed here
    for (;;) {
        auto* current = record.release();
        const int result = cursor(database, &current, type, 1);
        record.reset(current);
        if (result != 0 || !record) return;
        map[(*record).*id].name = record->szName;  // a new entry's further fields are 0, a known one's stay
    }
}

// The number that `text` is as a whole. What does not fit into 32 bits is cut: kept, ids beyond that do not occur.
std::optional<unsigned int> parseId(const char* text) {
    const char* digits = text;
    while (isspace(static_cast<unsigned char>(*digits)) != 0) ++digits;
    if (*digits == '-') return std::nullopt;
    char* end = nullptr;
    errno = 0;
    const unsigned long number = strtoul(text, &end, 10);
    if (end == text || *end != '\0' || errno == ERANGE) return std::nullopt;
    return static_cast<unsigned int>(number);
}

}  // namespace

bool orvel::appendGroupIds(PVLIBCSZLIST list, std::list<unsigned int>& gids) {
    for (int i = 0; i < list->nItem; ++i) {
        const char* text = VLIBCSzListGet(list, i);
        if (text == nullptr) {
            syslog(LOG_ERR, "%s:%d Get NULL from VEXOGroupInfoGetgroupList", kSource, __LINE__);
            return false;
        }
        const auto gid = parseId(text);
        if (!gid) {
            syslog(LOG_ERR, "%s:%d Get Error Formate from VEXOGroupInfoGetgroupList (%s)", kSource, __LINE__,
                   printable(text).c_str());
            return false;
        }
        gids.push_back(*gid);
    }
    return true;
}

bool OrvEnum::EnumAllUsers(std::map<unsigned int, _tag_USER_INFO_>& users, AUTH_TYPE type) {
    return orvel::guardedQuietly(false, [&] {
        const orvel::UserDatabase database(VEXOUserDBOpen());
        if (!database) {
            syslog(LOG_ERR, "%s:%d Failed to open user db", kSource, __LINE__);
            return false;
        }
        collect<orvel::UserRecord>(database.get(), type, VEXOUserDBGetByCursor, &VEXOUSER::uid, users);
        return true;
    });
}

bool OrvEnum::EnumAllGroups(std::map<unsigned int, _tag_GROUP_INFO_>& groups, AUTH_TYPE type) {
    return orvel::guardedQuietly(false, [&] {
        const orvel::GroupDatabase database(VEXOGroupDBOpen());
        if (!database) {
            syslog(LOG_ERR, "%s:%d Failed to open group db", kSource, __LINE__);
            return false;
        }
        collect<orvel::GroupRecord>(database.get(), type, VEXOGroupDBGetByCursor, &VEXOGROUP::gid, groups);
        return true;
    });
}

bool OrvEnum::EnumUserGroups(std::list<unsigned int>& gids, std::string user) {
    return orvel::guardedQuietly(false, [&] {
        orvel::StringList list(VLIBCSzListAlloc(kGroupListCapacity));
        if (!list) return false;
        // The outcome is the list alone: a failed look-up leaves it empty and means no groups.
        VEXOGroupInfoGetgroupList(user.c_str(), orvel::lend(list), 0);
        return orvel::appendGroupIds(list.get(), gids);
    });
}
