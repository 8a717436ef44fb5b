#include "chosen_rows.h"

#include <fcntl.h>
#include <json/value.h>

#include <cerrno>
#include <unordered_set>

#include "confined.h"
#include "orvel/error_state.h"

namespace orvel::cgi {
namespace {

ListRequest requestFor(const User& user, const KeptAbout& about) {
    ListRequest request;
    request.user = user.name;
    request.sid = user.sid;
    request.path = about.path;
    request.pattern = about.pattern;
    request.type = static_cast<_tag_dir_entry_type_>(about.type);
    return request;
}

}  // namespace

bool ChosenRows::isIn(const VEXO::WebCGI& web) {
    return web.HasParam("listing");
}

int ChosenRows::find(const User& user, const VEXO::WebCGI& web) {
    const int code = listing_.find(user.name, web.GetParam("listing", ""));
    if (code != ORV_ERR_NONE) return code;
    const uint32_t total = listing_.file().rows();
    const auto ranges = parseRanges(web.GetParam("ranges", ""), total);
    const std::string except = web.GetParam("except", "");
    const auto exceptions = except.empty() ? std::vector<RowRange>() : parseRanges(except, total);
    const auto chosen = ranges && exceptions ? withoutRows(*ranges, *exceptions) : std::nullopt;
    if (!chosen || chosen->empty()) {
        wrong_ = ranges ? "except" : "ranges";
        return ORV_ERR_PARAMETER;
    }
    // Proven whole before anything is done with it.
    for (const RowRange& range : *chosen) {
        const auto look = [](uint32_t /*number*/, const KeptRow& /*row*/) { return true; };
        if (!listing_.file().each(range.first, range.last + 1, look)) return listing_.damaged();
    }
    rows_ = ChosenRowNumbers(*chosen);
    return ORV_ERR_NONE;
}

int ChosenRows::openFolder(const User& user) {
    return listing_.openFolder(requestFor(user, listing_.file().about()), opened_);
}

int ChosenRows::row(size_t position, KeptRow& row) {
    return listing_.file().row(rows_[position], row) ? static_cast<int>(ORV_ERR_NONE) : listing_.damaged();
}

int ChosenRows::look(const KeptRow& row, struct stat& status) const {
    // A folder that was moved meanwhile is not the one at the path any more.
    const auto within = pathInShare(opened_.info, opened_.folder);
    if (!within || opened_.info.shareRoot + *within != opened_.realPath) return ORV_ERR_MISSING;
    if (fstatat(opened_.folder.get(), row.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0)
        return refusalCode(errno, opened_.realPath + "/" + row.name);
    const bool isWhatItWas = row.isFolder ? S_ISDIR(status.st_mode) : S_ISREG(status.st_mode);
    return isWhatItWas ? ORV_ERR_NONE : ORV_ERR_MISSING;
}

int ChosenRows::namesSince(const User& user, std::vector<std::string>& names) {
    FolderState now;
    if (!stateOf(opened_.folder, now)) return refusalCode(errno, opened_.realPath);
    if (now == listing_.file().about().folder) return ORV_ERR_NONE;
    std::unordered_set<std::string> known;
    const bool whole = listing_.file().each(0, listing_.file().rows(), [&](uint32_t /*number*/, const KeptRow& row) {
        known.insert(row.name);
        return true;
    });
    if (!whole) return listing_.damaged();
    Listing listing;
    const int code = listOpened(requestFor(user, listing_.file().about()), opened_.folder, opened_.info.path,
                                opened_.realPath, listing);
    if (code != ORV_ERR_NONE) return code;
    for (const DIRENTRY_INFO& entry : listing.entries) {
        if (!known.contains(entry.name)) names.push_back(entry.name);
    }
    return ORV_ERR_NONE;
}

void ChosenRows::explain(Json::Value& data) const {
    if (!wrong_.empty()) data["parameter"] = wrong_;
    if (!listing_.why().empty()) data["listing"] = listing_.why();
}

}  // namespace orvel::cgi
