#include <cstdio>
#include <ctime>

#include "arguments.h"
#include "command.h"
#include "listing.h"
#include "orvel/privilege.h"
#include "orvel/share_path.h"

namespace orvel::ctl {
namespace {

constexpr const char* kColumns = "perm,owner,size,time";

_tag_dir_entry_type_ typeOf(const std::string& word) {
    if (word == "dir") return DIR_ENTRY_TYPE_DIR;
    if (word == "file") return DIR_ENTRY_TYPE_FILE;
    if (word == "all") return DIR_ENTRY_TYPE_ALL;
    throw UsageError("--type takes dir, file or all");
}

std::string nameOrId(const std::string& name, uint32_t id) {
    return name.empty() ? std::to_string(id) : name;
}

std::string rightText(uint32_t right) {
    return right == ORV_PRIVILEGE_READ_WRITE ? "rw" : right == ORV_PRIVILEGE_READ ? "ro" : "--";
}

}  // namespace

std::string entryRow(const DIRENTRY_INFO& entry, int additional, bool shares) {
    std::string text;
    if ((additional & ADDITIONAL_PERM) != 0) {
        text += (entry.isDirectory ? "d" : "-") + GetPrivilegeStr(entry.mode) + "  ";
        if (shares) text += rightText(entry.shareAccessRight) + "  ";
    }
    char field[128];
    if ((additional & ADDITIONAL_OWNER) != 0) {
        snprintf(field, sizeof field, "%-10s %-14s ", nameOrId(entry.owner, entry.uid).c_str(),
                 nameOrId(entry.group, entry.gid).c_str());
        text += field;
    }
    if ((additional & ADDITIONAL_SIZE) != 0) {
        snprintf(field, sizeof field, "%12lld  ", static_cast<long long>(entry.size));
        text += field;
    }
    if ((additional & ADDITIONAL_TIME) != 0) text += timeText(entry.mtime) + "  ";
    if ((additional & ADDITIONAL_TYPE) != 0) text += entry.type + "  ";
    text += terminalText(entry.name) + (entry.isDirectory ? "/" : "");
    if ((additional & ADDITIONAL_MOUNT_POINT_TYPE) != 0 && !entry.mountPointType.empty()) {
        text += "  [" + entry.mountPointType + "]";
    }
    if ((additional & ADDITIONAL_REAL_PATH) != 0) text += "  -> " + terminalText(entry.realPath);
    return text + "\n";
}

namespace {

void printRows(const cgi::ListRequest& request, const cgi::Listing& listing, bool shares, cgi::Output& out) {
    for (const DIRENTRY_INFO& entry : listing.entries) {
        out.text() += entryRow(entry, request.additional, shares);
        out.spill();
    }
    out.text() += std::to_string(listing.entries.size()) + " of " + std::to_string(listing.total) + "\n";
}

}  // namespace

int ls(const std::vector<std::string>& words) {
    const Arguments arguments(words, "ls", "", 1);
    const bool json = arguments.has("--json");
    const cgi::ListRequest request = {
        .user = arguments.required("--user"),
        .sid = "",
        .path = arguments.position(0),
        .sortBy = arguments.value("--sort", ""),
        .ascending = !arguments.has("--desc"),
        .offset = arguments.number("--offset", 0),
        .limit = arguments.number("--limit", 0),
        .additional = cgi::additionalBits(arguments.value("--additional", json ? "" : kColumns)),
        .pattern = arguments.value("--pattern", ""),
        .type = typeOf(arguments.value("--type", "all"))};
    const bool shares = request.path == "/";
    cgi::Listing listing;
    int code = becomeUser(request.user, shares || IsDirUserHome(request.path, nullptr));
    if (code == 0) code = shares ? listShares(request, listing) : listFolder(request, listing);
    if (code != 0) return refused(request.path, code);

    cgi::Output out(1);
    if (json) {
        writeListing(request, listing, shares ? cgi::appendShare : cgi::appendEntry, out);
        out.text() += '\n';
    } else {
        printRows(request, listing, shares, out);
    }
    return out.finish() ? 0 : 1;
}

}  // namespace orvel::ctl
