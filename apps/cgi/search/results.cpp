#include <json/value.h>

#include <climits>
#include <optional>
#include <string>

#include "found_entry.h"
#include "listing.h"
#include "orvel/error_state.h"
#include "orvel/privilege.h"
#include "search/actions.h"
#include "text.h"

namespace orvel::cgi {
namespace {

constexpr unsigned long kUsualPage = 100;
constexpr unsigned long kLongestPage = 10000;
constexpr size_t kLongestFilter = 1000;

}  // namespace

std::optional<ListRequest> parsePage(const User& user, const VEXO::WebCGI& web) {
    const auto offset = numberParam(web, "offset", 0);
    const auto limit = numberParam(web, "limit", kUsualPage);
    const auto type = typeParam(web);
    const auto ascending = ascendingParam(web);
    const std::string filter = web.GetParam("filter", "");
    if (!offset || !limit || !type || !ascending || filter.size() > kLongestFilter) return std::nullopt;
    if (*offset > static_cast<unsigned long>(LONG_MAX) || *limit < 1 || *limit > kLongestPage) return std::nullopt;
    return ListRequest{.user = user.name,
                       .sid = user.sid,
                       .path = "",
                       .sortBy = web.GetParam("sort_by", ""),
                       .ascending = *ascending,
                       .offset = *offset,
                       .limit = *limit,
                       .additional = additionalBits(web.GetParam("additional", "")),
                       .pattern = filter,
                       .type = *type};
}

namespace {

Json::Value objectOf(const KTR::Task& record, const char* property) {
    const Json::Value value = record.getProperty(property);
    return value.isObject() ? value : Json::Value(Json::objectValue);
}

Json::Value stateOf(const KTR::Task& record) {
    Json::Value state;
    state["finished"] = record.isFinished();
    const Json::Value stopped = record.getProperty(kStoppedProperty);
    state["stopped"] = stopped.isBool() && stopped.asBool();
    const Json::Value noted = record.getProperty(kCodeProperty);
    const int code = noted.isInt() ? noted.asInt() : record.hasFailed() ? ORV_ERR_GENERAL : ORV_ERR_NONE;
    state["failed"] = code != ORV_ERR_NONE;
    if (code != ORV_ERR_NONE) {
        state["failure"]["code"] = code;
        state["failure"]["key"] = OrvParseErrorToKTRString(code, nullptr);
    }
    state["shares"] = objectOf(record, kSharesProperty);
    state["indexes"] = objectOf(record, kIndexesProperty);
    const Json::Value leftOut = record.getProperty(kLeftOutProperty);
    if (leftOut.isArray() && !leftOut.empty()) state["left_out"] = leftOut;
    return state;
}

// What lies in a share that was closed to the user since is not shown any more, not even its names.
int judgeSearched(const ListRequest& request, const KTR::Task& record, std::string& culprit) {
    const Json::Value searched = record.getProperty(kSearchedProperty);
    if (!searched.isArray()) return ORV_ERR_MISSING;
    const char* sid = request.sid.empty() ? nullptr : request.sid.c_str();
    for (const Json::Value& one : searched) {
        const auto share = percentDecode(one.isString() ? one.asString() : "");
        if (!share) return ORV_ERR_MISSING;
        culprit = *share;
        OrvLibSetErr(ORV_ERR_NONE);
        if (!CheckShareListPrivilege(request.user.c_str(), sid, share->c_str())) return lastCode(ORV_ERR_DENIED);
    }
    culprit.clear();
    return ORV_ERR_NONE;
}

}  // namespace

int readPage(const ListRequest& request, const SearchTask& task, ResultPage& page) {
    const int code = judgeSearched(request, *task.record, page.culprit);
    if (code != ORV_ERR_NONE) return code;
    // Asked first: what is finished has all its results.
    page.state = stateOf(*task.record);
    return task.results == nullptr ? ORV_ERR_MISSING : readResults(request, *task.results, page.listing);
}

void writeResults(const ListRequest& request, const ResultPage& page, Output& out) {
    appendJson(page.state, out.text());
    out.text().back() = ',';
    writePage(request, page.listing, appendEntry, out);
    out.text() += '}';
}

void listResults(Output& out, const User& user, const VEXO::WebCGI& web, const SearchTask& task) {
    const auto request = parsePage(user, web);
    if (!request) return replyFailure(out, Status::kBadRequest, user.cookie, ORV_ERR_PARAMETER, "");
    ResultPage page;
    const int code = readPage(*request, task, page);
    if (code != ORV_ERR_NONE) return replyFailure(out, statusOf(code), user.cookie, code, page.culprit);

    beginReply(out, Status::kOk, user.cookie);
    out.text() += "{\"success\":true,\"data\":";
    writeResults(*request, page, out);
    out.text() += '}';
}

}  // namespace orvel::cgi
