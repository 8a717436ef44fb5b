// Requests of users to the programs, and what they leave behind.
#ifndef ORVEL_TESTS_APPS_CGI_TEST_H
#define ORVEL_TESTS_APPS_CGI_TEST_H

#include "apps/program.h"
#include "support/testing.h"
#include "text.h"

namespace support {

using Names = std::vector<std::string>;
using orvel::cgi::percentEncode;

class CgiTest : public ApplianceTest {
 protected:
    static CgiReply get(const std::string& program, const std::string& user, const std::string& query,
                        const Variables& more = {}) {
        return CgiReply(runCgi(program, user, "GET", query, "", more));
    }
    static CgiReply post(const std::string& program, const std::string& user, const std::string& form,
                         Variables more = {}) {
        more["CONTENT_TYPE"] = "application/x-www-form-urlencoded";
        return CgiReply(runCgi(program, user, "POST", "", form, more));
    }
    static int code(const CgiReply& reply) { return reply.json["error"]["code"].asInt(); }
    // One text of each item of a list in a reply.
    static Names each(const Json::Value& items, const char* member) {
        Names texts;
        for (const Json::Value& item : items) texts.push_back(item[member].asString());
        return texts;
    }
    // What a search found, once it has ended.
    static Json::Value searched(const std::string& user, const std::string& id) {
        Json::Value data;
        waitUntil("the end of search " + id, [&] {
            data = get(PROGRAM_SEARCH, user, "action=list&taskid=" + id).json["data"];
            return data["finished"].asBool() || HasFailure();
        });
        return data;
    }
    static Names namesIn(const std::string& folder) {
        Names names;
        for (const auto& entry : fs::directory_iterator(folder)) names.push_back(entry.path().filename());
        std::sort(names.begin(), names.end());
        return names;
    }
    // A folder that everybody may change.
    static void openFolder(const std::string& path) {
        makeFolder(path, 0777);
        EXPECT_EQ(chmod(path.c_str(), 0777), 0);
    }
    static void give(const std::string& path, uid_t owner = kAliceUid) {
        EXPECT_EQ(lchown(path.c_str(), owner, kUsersGid), 0) << path;
    }
    static void expectOwned(const std::string& path, uid_t owner, mode_t mode) {
        const struct stat status = statusOf(path);
        EXPECT_TRUE(status.st_uid == owner && status.st_gid == kUsersGid) << path;
        EXPECT_EQ(status.st_mode & 07777, mode) << path;
    }
    static std::string transferLog() { return readFile(systemRoot() + "/var/log/vexo/xfer.log"); }
};

}  // namespace support

#endif
