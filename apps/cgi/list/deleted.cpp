#include "list/deleted.h"

#include <json/value.h>

#include <algorithm>
#include <tuple>

#include "base/wildcard.h"
#include "operation/bin_items.h"
#include "operation/judge.h"
#include "operation/recycle.h"
#include "orvel/error_state.h"
#include "reply.h"
#include "text.h"

namespace orvel::cgi {
namespace {

constexpr size_t kMostLooked = 100000;
constexpr unsigned long kUsualLimit = 100, kMostRows = 10000;
constexpr size_t kMostPatterns = 100;
constexpr int kEscape = '\\';

struct Row {
    BinItem item;
    std::string path, origin;  // share-relative
    std::string name;          // that it had
    [[nodiscard]] bool isFolder() const { return S_ISDIR(item.status.st_mode); }
};

struct Found {
    std::vector<Row> rows;
    std::vector<std::string> failed;  // shares whose bin could not be looked at
    bool cut = false;
};

bool areNames(const std::string& pattern, std::vector<Wildcard>& names) {
    for (size_t begin = 0, end = 0; begin < pattern.size(); begin = end + 1) {
        end = std::min(pattern.find(',', begin), pattern.size());
        if (end > begin) names.emplace_back(std::string_view(pattern).substr(begin, end - begin), kEscape);
    }
    return names.size() <= kMostPatterns;
}

bool isWanted(const Row& row, const std::vector<Wildcard>& names, _tag_dir_entry_type_ type) {
    if (type != DIR_ENTRY_TYPE_ALL && row.isFolder() != (type == DIR_ENTRY_TYPE_DIR)) return false;
    return names.empty() ||
           std::any_of(names.begin(), names.end(), [&](const Wildcard& name) { return name.match(row.name); });
}

// The bin of one share, as the user sees it. 0 or a library code.
int look(const User& user, const ListRequest& wanted, const std::string& share, const std::vector<Wildcard>& names,
         size_t& looked, Found& found) {
    PathInfo info;
    OrvLibSetErr(ORV_ERR_NONE);
    if (!PathInfoFactory::create(user.name.c_str(), share, info)) return lastCode();
    std::optional<RecycleBin> bin;
    int code = RecycleBin::openPresent(info, bin);
    if (code == ORV_ERR_NONE && bin) code = judge(user, bin->sharePath(), Need::kList);
    if (code != ORV_ERR_NONE || !bin) return code == ORV_ERR_DENIED ? static_cast<int>(ORV_ERR_NONE) : code;
    BinItems items;
    items.looked = looked;
    addBinItems(bin->folder(), deletionsIn(bin->recorded().path), kMostLooked, items);
    looked = items.looked;
    found.cut = found.cut || items.cut;
    for (BinItem& item : items.list) {
        Row row;
        row.path = bin->sharePath() + "/" + item.path;
        row.origin = bin->originOf(item.path);
        row.name = row.origin.substr(row.origin.rfind('/') + 1);
        row.item = std::move(item);
        if (isWanted(row, names, wanted.type)) found.rows.push_back(std::move(row));
    }
    return ORV_ERR_NONE;
}

void sort(const ListRequest& wanted, Found& found) {
    const std::string& by = wanted.sortBy;
    const auto folderOf = [](const Row& row) { return std::string_view(row.origin).substr(0, row.origin.rfind('/')); };
    const auto compare = [&](const Row& a, const Row& b) {
        if (by == "name") return a.name.compare(b.name);
        if (by == "size")
            return a.item.status.st_size < b.item.status.st_size ? -1 : a.item.status.st_size > b.item.status.st_size;
        if (by == "deleter") return a.item.user.compare(b.item.user);
        if (by == "from") return folderOf(a).compare(folderOf(b));
        return a.item.deleted < b.item.deleted ? -1 : static_cast<int>(a.item.deleted > b.item.deleted);
    };
    std::sort(found.rows.begin(), found.rows.end(), [&](const Row& a, const Row& b) {
        const int order = compare(a, b);
        if (order != 0) return wanted.ascending ? order < 0 : order > 0;
        return std::tie(a.name, a.path) < std::tie(b.name, b.path);
    });
}

Json::Value jsonOf(const Row& row) {
    Json::Value value, deleted;
    const struct stat& status = row.item.status;
    putPath(value, "name", row.name);
    putPath(value, "path", row.path);
    value["isdir"] = row.isFolder();
    if (!row.isFolder()) value["additional"]["size"] = Json::Int64{status.st_size};
    value["additional"]["time"]["mtime"] = Json::Int64{status.st_mtim.tv_sec};
    deleted["time"] = Json::Int64{row.item.deleted};
    deleted["recorded"] = row.item.recorded;
    deleted["by"] = readable(row.item.user);
    putPath(deleted, "from", row.origin.substr(0, row.origin.rfind('/')));
    value["deleted"] = std::move(deleted);
    return value;
}

}  // namespace

void serveDeleted(Request& request, const ListRequest& asked, Output& out) {
    const User& user = request.user;
    ListRequest wanted = asked;
    if (!request.web.HasParam("sort_direction"))
        wanted.ascending = !wanted.sortBy.empty() && wanted.sortBy != "deleted";
    if (wanted.limit == 0) wanted.limit = kUsualLimit;
    std::vector<Wildcard> names;
    if (wanted.limit > kMostRows || !areNames(wanted.pattern, names)) {
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, "");
    }
    int code = actAs(user.sid.c_str(), user.name, false);
    Listing shares;
    ListRequest all = wanted;
    all.sortBy.clear();
    all.offset = all.limit = 0;
    if (code == ORV_ERR_NONE) code = listShares(all, shares);
    if (code != ORV_ERR_NONE) return replyFailure(out, statusOf(code), user.cookie, code, "/");

    Found found;
    size_t looked = 0;
    for (const DIRENTRY_INFO& share : shares.entries) {
        const std::string path = "/" + share.name;
        if (look(user, wanted, path, names, looked, found) != ORV_ERR_NONE) found.failed.push_back(path);
    }
    sort(wanted, found);
    Json::Value data;
    data["total"] = Json::UInt64{found.rows.size()};
    data["offset"] = Json::UInt64{wanted.offset};
    data["items"] = Json::Value(Json::arrayValue);
    const size_t begin = std::min<size_t>(wanted.offset, found.rows.size());
    const size_t end = begin + std::min<size_t>(wanted.limit, found.rows.size() - begin);
    for (size_t i = begin; i < end; ++i) data["items"].append(jsonOf(found.rows[i]));
    data["cut"] = found.cut;
    data["failed"] = Json::Value(Json::arrayValue);
    for (const std::string& share : found.failed) data["failed"].append(readable(share));
    reply(out, Status::kOk, user.cookie, ORV_ERR_NONE, "", data);
}

}  // namespace orvel::cgi
