#include "list/kept.h"

#include <json/value.h>

#include <algorithm>
#include <optional>

#include "chosen_rows.h"
#include "kept_store.h"
#include "list/beside.h"
#include "natural_order.h"
#include "orvel/error_state.h"
#include "orvel/share_path.h"
#include "text.h"

namespace orvel::cgi {
namespace {

constexpr size_t kMostLeftNames = 10;
constexpr unsigned long kMostFollowed = 100;

struct Answer {
    int code = ORV_ERR_NONE;
    std::string culprit;
    Json::Value data;
};

void appendRows(const std::vector<KeptPageRow>& rows, int additional, Output& out) {
    out.text() += "\"items\":[";
    bool first = true;
    for (const KeptPageRow& row : rows) {
        if (!first) out.text() += ',';
        first = false;
        appendEntry(row.entry, row.gone ? 0 : additional, out.text());
        if (row.gone) {
            out.text().pop_back();
            out.text() += ",\"gone\":true}";
        }
        out.spill();
    }
    out.text() += ']';
}

void appendMember(const char* name, const Json::Value& value, Output& out) {
    out.text() += std::string("\"") + name + "\":";
    appendJson(value, out.text());
    out.text() += ',';
}

void beginPage(const User& user, const ListRequest& wanted, unsigned long total, Output& out) {
    beginReply(out, Status::kOk, user.cookie);
    out.text() += "{\"success\":true,\"data\":{\"total\":" + std::to_string(total) +
                  ",\"offset\":" + std::to_string(wanted.offset) + ",";
}

void fail(const User& user, int code, const std::string& path, const std::string& why, Output& out) {
    Json::Value data;
    if (!why.empty()) data["listing"] = why;
    reply(out, statusOf(code), user.cookie, code, path, data);
}

void servePage(const User& user, ListRequest wanted, KeptListing& listing, const std::string& id, Output& out) {
    wanted.path = listing.file().about().path;
    OpenedFolder opened;
    std::vector<KeptPageRow> rows;
    int code = listing.openFolder(wanted, opened);
    const FolderState shown = listing.file().about().folder;
    const unsigned long total = listing.file().rows();
    if (code == ORV_ERR_NONE) code = listing.page(wanted, opened, rows);
    if (code != ORV_ERR_NONE) return fail(user, code, wanted.path, listing.why(), out);
    beginPage(user, wanted, total, out);
    appendMember("listing", id, out);
    Json::Value where;
    putPath(where, "path", wanted.path);
    for (const std::string& name : where.getMemberNames()) appendMember(name.c_str(), where[name], out);
    appendMember("changed", opened.state != shown, out);
    appendRows(rows, wanted.additional, out);
    out.text() += "}}";
}

// Asked again and again by every page that shows a folder: mostly that nothing has changed.
void serveChanges(const User& user, const std::string& known, ListRequest wanted, KeptListing& listing, Output& out) {
    wanted.path = listing.file().about().path;
    OpenedFolder opened;
    std::string state;
    std::vector<KeptPageRow> rows;
    int code = listing.openFolder(wanted, opened);
    const bool changed = opened.state != listing.file().about().folder;
    const auto first = static_cast<uint32_t>(std::min<unsigned long>(wanted.offset, listing.file().rows()));
    const auto end = static_cast<uint32_t>(std::min(first + wanted.limit, ulong{listing.file().rows()}));
    if (code == ORV_ERR_NONE && !changed) code = listing.stateOfRows(first, end, opened, state);
    const bool others = code == ORV_ERR_NONE && !changed && (state.empty() || state != known);
    if (others) code = listing.page(wanted, opened, rows);
    if (code != ORV_ERR_NONE) return fail(user, code, wanted.path, listing.why(), out);
    beginReply(out, Status::kOk, user.cookie);
    out.text() += "{\"success\":true,\"data\":{";
    appendMember("state", state, out);
    appendMember("changed", changed, out);
    if (others) {
        appendRows(rows, wanted.additional, out);
    } else {
        out.text().pop_back();
    }
    out.text() += "}}";
}

Answer renew(const User& user, const VEXO::WebCGI& web) {
    Answer answer;
    answer.data["listings"] = Json::Value(Json::arrayValue);
    std::string rest = web.GetParam("listing", "");
    for (int i = 0; i < kMostKept && !rest.empty(); ++i) {
        const size_t end = std::min(rest.find(','), rest.size());
        const std::string id = rest.substr(0, end);
        if (openKept(user.name, id)) answer.data["listings"].append(id);
        rest.erase(0, std::min(end + 1, rest.size()));
    }
    return answer;
}

// Whether the request says what to look for.
bool isWhole(const VEXO::WebCGI& web, const std::string& action, const ListRequest& wanted) {
    if (action == "changes") return wanted.limit >= 1 && wanted.limit <= kMostFollowed;
    if (action != "find") return true;
    const auto text = bytesParam(web, "prefix");
    return text && !text->empty() && numberParam(web, "from", 0);
}

Answer findRow(KeptListing& listing, const VEXO::WebCGI& web) {
    const auto text = bytesParam(web, "prefix");
    const auto from = numberParam(web, "from", 0);
    Answer answer;
    std::optional<uint32_t> row;
    const auto first = static_cast<uint32_t>(std::min<unsigned long>(*from, listing.file().rows()));
    answer.code = listing.findBeginning(*text, first, row);
    answer.data["row"] = row ? Json::Int64{*row} : Json::Int64{-1};
    return answer;
}

Answer rowsOfNames(KeptListing& listing, const VEXO::WebCGI& web) {
    std::vector<std::string> names;
    for (const std::string& line : linesParam(web, "names_raw")) {
        const auto name = percentDecode(line);
        if (!name) return {ORV_ERR_PARAMETER, "", {}};
        names.push_back(*name);
    }
    Answer answer;
    std::vector<int64_t> rows;
    answer.code = listing.rowsOf(names, rows);
    answer.data["rows"] = Json::Value(Json::arrayValue);
    for (const int64_t row : rows) answer.data["rows"].append(Json::Int64{row});
    return answer;
}

void addRow(int64_t row, std::vector<RowRange>& ranges) {
    const auto number = static_cast<uint32_t>(row);
    if (!ranges.empty() && ranges.back().last + 1 == number) {
        ranges.back().last = number;
    } else {
        ranges.push_back({number, number});
    }
}

Answer carry(const User& user, const VEXO::WebCGI& web) {
    Answer answer;
    ChosenRows chosen;
    KeptListing into;
    std::vector<std::string> names;
    std::vector<int64_t> rows;
    answer.code = chosen.find(user, web);
    if (answer.code == ORV_ERR_NONE) answer.code = into.find(user.name, web.GetParam("into", ""));
    if (answer.code == ORV_ERR_NONE && !chosen.listing().file().about().folder.isSameFolder(into.file().about().folder))
        answer.code = ORV_ERR_PARAMETER;
    for (size_t i = 0; i < chosen.size() && answer.code == ORV_ERR_NONE; ++i) {
        KeptRow row;
        answer.code = chosen.row(i, row);
        names.push_back(row.name);
    }
    if (answer.code == ORV_ERR_NONE) answer.code = into.rowsOf(names, rows);
    if (answer.code != ORV_ERR_NONE) {
        chosen.explain(answer.data);
        if (!into.why().empty()) answer.data["listing"] = into.why();
        return answer;
    }
    Json::Value& left = answer.data["names"] = Json::Value(Json::arrayValue);
    Json::Int64 count = 0;
    for (size_t i = 0; i < rows.size(); ++i) {
        if (rows[i] < 0 && ++count <= Json::Int64{kMostLeftNames}) left.append(readable(names[i]));
    }
    std::erase_if(rows, [](int64_t row) { return row < 0; });
    std::sort(rows.begin(), rows.end());
    std::vector<RowRange> ranges;
    for (const int64_t row : rows) addRow(row, ranges);
    answer.data["ranges"] = rangesText(ranges);
    answer.data["count"] = Json::UInt64{rows.size()};
    answer.data["left"] = count;
    return answer;
}

}  // namespace

bool wantsToKeep(const VEXO::WebCGI& web) {
    return web.GetParam("keep", "") == "1";
}

void serveKeeping(Request& request, const ListRequest& wanted, Output& out) {
    const VEXO::WebCGI& web = request.web;
    const KeptOrder order = {web.GetParam("natural", ""), web.GetParam("folders_first", "") == "1"};
    KeptAnew anew;
    int code = order.natural.empty() || isLanguage(order.natural) ? ORV_ERR_NONE : ORV_ERR_PARAMETER;
    if (code == ORV_ERR_NONE)
        code = actAs(request.user.sid.c_str(), request.user.name, IsDirUserHome(wanted.path, nullptr));
    if (code == ORV_ERR_NONE) code = keepFolder(wanted, order, anew);
    if (code != ORV_ERR_NONE) return fail(request.user, code, wanted.path, "", out);
    beginPage(request.user, wanted, anew.total, out);
    if (anew.id.empty()) {
        appendMember("not_kept", anew.refusal, out);
    } else {
        appendMember("listing", anew.id, out);
    }
    appendMember("changed", false, out);
    appendRows(anew.rows, wanted.additional, out);
    appendBeside(request, wanted.path, out);
    out.text() += "}}";
}

bool isKeptAction(const std::string& action) {
    return action == "page" || action == "changes" || action == "renew" || action == "find" || action == "rows" ||
           action == "carry";
}

void serveKept(Request& request, const std::string& action, ListRequest wanted, Output& out) {
    const User& user = request.user;
    const VEXO::WebCGI& web = request.web;
    KeptListing listing;
    int code = isWhole(web, action, wanted) ? ORV_ERR_NONE : ORV_ERR_PARAMETER;
    if (code == ORV_ERR_NONE) code = actAs(user.sid.c_str(), user.name, false);
    if (code != ORV_ERR_NONE) return fail(user, code, "", "", out);
    Answer answer;
    if (action == "renew" || action == "carry") {
        answer = action == "renew" ? renew(user, web) : carry(user, web);
    } else {
        const std::string id = web.GetParam("listing", "");
        code = listing.find(user.name, id);
        if (code != ORV_ERR_NONE) return fail(user, code, "", listing.why(), out);
        if (action == "page") return servePage(user, std::move(wanted), listing, id, out);
        if (action == "changes") return serveChanges(user, web.GetParam("state", ""), std::move(wanted), listing, out);
        answer = action == "find" ? findRow(listing, web) : rowsOfNames(listing, web);
        if (!listing.why().empty()) answer.data["listing"] = listing.why();
    }
    reply(out, statusOf(answer.code), user.cookie, answer.code, answer.culprit, answer.data);
}

}  // namespace orvel::cgi
