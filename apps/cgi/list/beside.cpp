#include "list/beside.h"

#include <json/value.h>

#include <sstream>

#include "base/raised_identity.h"
#include "link/within.h"
#include "operation/subfolders.h"
#include "operation/task_reply.h"
#include "orvel/error_state.h"
#include "preferences/store.h"
#include "text.h"
#include "tus/unfinished.h"
#include "why/reason.h"

namespace orvel::cgi {
namespace {

// The file is root's, as the program that keeps it.
bool putPreferences(const User& user, Json::Value& data) {
    const RaisedIdentity root;
    return readPreferences(user.name, data["values"]) == ORV_ERR_NONE;
}

bool fill(const std::string& word, const User& user, const std::string& path, Json::Value& data) {
    if (word == "preferences") return putPreferences(user, data);
    if (word == "tasks") return tasksReply(user.name, data);
    if (word == "access") return !path.empty() && explainAccess(path, user, data);
    if (word == "above" && !path.empty()) data["folders"] = subfoldersAbove(user, path);
    if (word == "above") return !path.empty();
    if (word == "links") return !path.empty() && linksWithin(user.name, path, data);
    if (word != "uploads") return false;
    data = unfinishedReply(user);
    return true;
}

}  // namespace

void appendBeside(const Request& request, const std::string& path, Output& out) {
    std::istringstream words(request.web.GetParam("with", ""));
    Json::Value with(Json::objectValue);
    for (std::string word; std::getline(words, word, ',');) {
        Json::Value data;
        if (!with.isMember(word) && fill(word, request.user, path, data)) with[word] = data;
    }
    if (with.empty()) return;
    out.text() += ",\"with\":";
    appendJson(with, out.text());
}

}  // namespace orvel::cgi
