#include "list/versions.h"

#include <json/value.h>

#include "base/beneath.h"
#include "orvel/error_state.h"
#include "orvel/share_path.h"
#include "reply.h"
#include "versions/version.h"

namespace orvel::cgi {
namespace {

constexpr size_t kMostLooked = 2000;

// The versions of one path, as rows.
struct Rows {
    Json::Value items = Json::Value(Json::arrayValue);
    size_t looked = 0;
    bool cut = false;
};

bool isSame(const struct stat& a, const struct stat& b) {
    return S_ISREG(a.st_mode) && S_ISREG(b.st_mode) && a.st_size == b.st_size && a.st_mtim.tv_sec == b.st_mtim.tv_sec &&
           a.st_mtim.tv_nsec == b.st_mtim.tv_nsec;
}

const char* wordFor(Dated dated) {
    switch (dated) {
        case Dated::kByName:
            return "name";
        case Dated::kByRecord:
            return "record";
        case Dated::kByFileSystem:
            return "filesystem";
        default:
            return "none";
    }
}

Json::Value rowOf(const Version& version) {
    Json::Value row;
    putPath(row, "snapshot", version.snapshot.name);
    row["dated"] = wordFor(version.snapshot.dated);
    if (version.snapshot.dated != Dated::kNot) row["time"] = Json::Int64{version.snapshot.time};
    if (S_ISREG(version.status.st_mode)) row["size"] = Json::Int64{version.status.st_size};
    row["mtime"] = Json::Int64{version.status.st_mtim.tv_sec};
    row["isdir"] = S_ISDIR(version.status.st_mode);
    row["current"] = version.present.isThere() && isSame(version.status, version.present.status());
    row["same"] = 0;
    return row;
}

// Those in one shelf. A snapshot without the path parts what lies before it from what lies behind it.
void look(const Shelf& shelf, Version& version, Rows& rows) {
    std::vector<Snapshot> snapshots;
    if (!snapshotsIn(shelf, snapshots)) rows.cut = true;
    struct stat before {};
    bool follows = false;
    for (Snapshot& snapshot : snapshots) {
        if (rows.looked == kMostLooked) {
            rows.cut = true;
            return;
        }
        ++rows.looked;
        version.snapshot = std::move(snapshot);
        const bool found = openVersionIn(shelf, version) == ORV_ERR_NONE;
        const bool folded = found && follows && isSame(before, version.status);
        if (found && !folded) rows.items.append(rowOf(version));
        if (found) {
            Json::Value& row = rows.items[rows.items.size() - 1];
            row["same"] = row["same"].asInt() + 1;
            if (version.snapshot.dated != Dated::kNot) row["oldest"] = Json::Int64{version.snapshot.time};
            before = version.status;
        }
        follows = found;
    }
}

Json::Value presentOf(const Present& present) {
    Json::Value value;
    value["exists"] = present.isThere();
    if (!present.isThere()) return value;
    const struct stat& status = present.status();
    value["isdir"] = S_ISDIR(status.st_mode);
    if (S_ISREG(status.st_mode)) value["size"] = Json::Int64{status.st_size};
    value["mtime"] = Json::Int64{status.st_mtim.tv_sec};
    return value;
}

}  // namespace

void serveVersions(Request& request, const ListRequest& wanted, Output& out) {
    const User& user = request.user;
    Version version;
    Shelves shelves;
    Rows rows;
    int code = actAs(user.sid.c_str(), user.name, IsDirUserHome(wanted.path, nullptr));
    if (code == ORV_ERR_NONE) code = version.present.open(user, wanted.path, Need::kList);
    if (code == ORV_ERR_NONE) code = version.present.findShelves(shelves);
    if (code != ORV_ERR_NONE) return replyFailure(out, statusOf(code), user.cookie, code, wanted.path);
    for (const Shelf& shelf : shelves.all) {
        if (rows.looked == 0) look(shelf, version, rows);
    }
    Json::Value data;
    data["present"] = presentOf(version.present);
    data["items"] = std::move(rows.items);
    data["snapshots"] = Json::UInt64{rows.looked};
    data["cut"] = rows.cut;
    data["closed"] = shelves.isClosed && rows.looked == 0;
    reply(out, Status::kOk, user.cookie, ORV_ERR_NONE, "", data);
}

void serveEarlierFolder(Request& request, const ListRequest& wanted, Output& out) {
    const User& user = request.user;
    const auto name = versionParam(request.web);
    Version version;
    Listing listing;
    int code = !name ? static_cast<int>(ORV_ERR_PARAMETER)
                     : actAs(user.sid.c_str(), user.name, IsDirUserHome(wanted.path, nullptr));
    if (code == ORV_ERR_NONE) code = openVersion(user, wanted.path, *name, Need::kList, version);
    if (code == ORV_ERR_NONE) {
        code = listOpened(wanted, version.opened, version.present.info().path, realPathOf(version.opened), listing);
    }
    if (code != ORV_ERR_NONE) return replyFailure(out, statusOf(code), user.cookie, code, wanted.path);
    beginReply(out, Status::kOk, user.cookie);
    out.text() += "{\"success\":true,\"data\":";
    writeListing(wanted, listing, appendEntry, out);
    out.text() += '}';
}

}  // namespace orvel::cgi
