#include "list/inside.h"

#include <json/value.h>

#include <algorithm>
#include <climits>
#include <map>
#include <tuple>

#include "archive_reader.h"
#include "base/file.h"
#include "download/sending.h"
#include "kept_store.h"
#include "list/archive_index.h"
#include "natural_order.h"
#include "operation/member_path.h"
#include "orvel/error_state.h"
#include "orvel/share_path.h"
#include "reply.h"
#include "text.h"

namespace orvel::cgi {
namespace {

constexpr unsigned long kUsualLimit = 1000, kMostRows = 10000;
constexpr size_t kMostIndexBytes = size_t{32} << 20;

struct Row {
    std::string name, key;  // what names are ordered by
    bool isFolder = false, isLink = false, encrypted = false;
    long long size = -1, modified = 0;
};

struct Level {
    std::vector<Row> rows;
    bool encrypted = false;  // any member of the archive
    bool there = false;      // the folder
    long refused = 0;        // members of the archive that cannot be unpacked: their names, or what they are
};

// What a member is to the folder: a row of it, or below one.
void add(const ArchiveMember& member, const std::vector<std::string>& inside,
         std::map<std::string, Row, std::less<>>& rows, Level& level) {
    level.encrypted = level.encrypted || member.encrypted;
    if (member.name.find_first_not_of("./") == std::string_view::npos && member.kind == ArchiveMember::Kind::kFolder)
        return;  // the top itself
    const auto components = memberComponents(member.name);
    if (!components || member.name.size() >= PATH_MAX || member.kind == ArchiveMember::Kind::kOther) {
        ++level.refused;
        return;
    }
    if (components->size() < inside.size() || !std::equal(inside.begin(), inside.end(), components->begin())) return;
    level.there = level.there || components->size() > inside.size() || member.kind == ArchiveMember::Kind::kFolder;
    if (components->size() == inside.size()) return;
    Row& row = rows[(*components)[inside.size()]];
    const bool own = components->size() == inside.size() + 1;
    row.isFolder = row.isFolder || !own || member.kind == ArchiveMember::Kind::kFolder;
    row.encrypted = row.encrypted || member.encrypted;
    if (!own) return;
    row.isLink = member.kind == ArchiveMember::Kind::kLink;
    row.size = member.size;
    row.modified = member.modified;
}

Level levelOf(const ArchiveIndex& index, const std::vector<std::string>& inside) {
    Level level;
    level.there = inside.empty();
    std::map<std::string, Row, std::less<>> rows;
    index.each([&](const ArchiveMember& member) { add(member, inside, rows, level); });
    level.rows.reserve(rows.size());
    for (auto& [name, row] : rows) {
        row.name = name;
        level.rows.push_back(std::move(row));
    }
    return level;
}

void sort(std::vector<Row>& rows, const ListRequest& wanted, const std::string& language) {
    NaturalOrder order(language);
    for (Row& row : rows) {
        if (language.empty() || !order.appendKey(row.name, row.key)) row.key = row.name;
    }
    const auto compare = [&wanted](const Row& a, const Row& b) {
        if (wanted.sortBy == "size") return a.size < b.size ? -1 : static_cast<int>(a.size > b.size);
        if (wanted.sortBy == "mtime") return a.modified < b.modified ? -1 : static_cast<int>(a.modified > b.modified);
        return a.key.compare(b.key);
    };
    std::sort(rows.begin(), rows.end(), [&](const Row& a, const Row& b) {
        if (a.isFolder != b.isFolder) return a.isFolder;
        const int by = compare(a, b);
        if (by != 0) return wanted.ascending ? by < 0 : by > 0;
        return std::tie(a.key, a.name) < std::tie(b.key, b.name);
    });
}

// The index of the archive, from the look before or a new one, and the id that it is kept under, "" where it is not. 0
// or a library code.
int indexOf(const Source& source, const User& user, const std::string& known, ArchiveIndex& index, std::string& id) {
    const Descriptor kept = known.empty() ? Descriptor() : openKept(user.name, known);
    std::string bytes;
    if (kept && readAll(kept.get(), bytes, kMostIndexBytes) && index.take(std::move(bytes), source.status)) {
        id = known;
        return ORV_ERR_NONE;
    }
    if (!index.look(source.opened.get(), source.status)) return ORV_ERR_GENERAL;
    if (keepBytes(user.name, index.bytes(), id) != KeptResult::kDone) id.clear();
    return ORV_ERR_NONE;
}

Json::Value jsonOf(const Row& row) {
    Json::Value value;
    putPath(value, "name", row.name);
    value["isdir"] = row.isFolder;
    if (!row.isFolder && row.size >= 0) value["size"] = Json::Int64{row.size};
    if (row.modified != 0) value["mtime"] = Json::Int64{row.modified};
    if (row.encrypted) value["encrypted"] = true;
    if (row.isLink) value["link"] = true;
    return value;
}

Json::Value pageOf(const Level& level, const ListRequest& wanted) {
    Json::Value page;
    page["total"] = Json::UInt64{level.rows.size()};
    page["offset"] = Json::UInt64{wanted.offset};
    page["items"] = Json::Value(Json::arrayValue);
    for (size_t i = wanted.offset; i < level.rows.size() && i - wanted.offset < wanted.limit; ++i)
        page["items"].append(jsonOf(level.rows[i]));
    page["encrypted"] = level.encrypted;
    page["refused"] = Json::Int64{level.refused};
    return page;
}

int codeOf(std::string_view end) {
    if (end == "none") return ORV_ERR_ARCHIVE;
    return end == "locked" ? kArchiveLocked.code : static_cast<int>(ORV_ERR_NONE);
}

}  // namespace

void serveInside(Request& request, const ListRequest& asked, Output& out) {
    const User& user = request.user;
    ListRequest wanted = asked;
    if (wanted.limit == 0) wanted.limit = kUsualLimit;
    const std::string language = request.web.GetParam("natural", "");
    const auto folder = bytesParam(request.web, "inside");
    const auto inside = memberComponents(folder.value_or(""));
    if (!folder || (!folder->empty() && !inside) || wanted.limit > kMostRows ||
        (!language.empty() && !isLanguage(language)))
        return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, wanted.path);
    Source source;
    source.asked = wanted.path;
    ArchiveIndex index;
    std::string id;
    int code = actAs(user.sid.c_str(), user.name, IsDirUserHome(wanted.path, nullptr));
    if (code == ORV_ERR_NONE) code = openToSend(user, source);
    if (code == ORV_ERR_NONE && !S_ISREG(source.status.st_mode)) code = ORV_ERR_ARCHIVE;
    if (code == ORV_ERR_NONE) code = indexOf(source, user, request.web.GetParam("index", ""), index, id);
    if (code == ORV_ERR_NONE) code = codeOf(index.end());
    if (code == kArchiveLocked.code)
        return replyOwnFailure(out, Status::kOk, user.cookie, code, kArchiveLocked.key, wanted.path, {});
    if (code != ORV_ERR_NONE) return replyFailure(out, statusOf(code), user.cookie, code, wanted.path);
    Level level = levelOf(index, inside.value_or(std::vector<std::string>()));
    if (!level.there && index.end().empty())
        return replyFailure(out, Status::kOk, user.cookie, ORV_ERR_MISSING, wanted.path + "/" + *folder);
    sort(level.rows, wanted, language);
    Json::Value page = pageOf(level, wanted);
    if (!id.empty()) page["index"] = id;
    if (!index.end().empty()) page["cut"] = std::string(index.end());
    reply(out, Status::kOk, user.cookie, ORV_ERR_NONE, "", page);
}

}  // namespace orvel::cgi
