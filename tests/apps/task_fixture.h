// Background operations, from the request that starts them to what they leave behind.
#ifndef ORVEL_TESTS_APPS_TASK_FIXTURE_H
#define ORVEL_TESTS_APPS_TASK_FIXTURE_H

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "apps/program.h"
#include "support/appliance.h"
#include "support/wait.h"
#include "text.h"
#include "vexo/task.h"

namespace fs = std::filesystem;
using orvel::cgi::percentEncode;
using support::CgiReply;
using support::readFile;
using support::writeFile;

// "path=..&path=.." of these paths, and a target unless it is empty.
inline std::string about(const std::vector<std::string>& paths, const std::string& target = "") {
    std::string form;
    for (const std::string& path : paths) form += "&path=" + percentEncode(path);
    return target.empty() ? form : form + "&target=" + percentEncode(target);
}

// What lies below a folder: a line for each entry with its permissions, and a file's content or a link's text.
inline std::string treeOf(const std::string& root) {
    std::vector<std::string> lines;
    for (const auto& entry : fs::recursive_directory_iterator(root)) {
        struct stat status {};
        lstat(entry.path().c_str(), &status);
        std::string line = entry.path().string().substr(root.size()) + " " + std::to_string(status.st_mode);
        if (entry.is_symlink()) {
            line += " " + fs::read_symlink(entry.path()).string();
        } else if (entry.is_regular_file()) {
            line += " " + std::to_string(status.st_mtime) + " " + readFile(entry.path());
        }
        lines.push_back(line);
    }
    std::sort(lines.begin(), lines.end());
    std::string all;
    for (const std::string& line : lines) all += line + "\n";
    return all;
}

class TaskCgi : public support::ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        photo_ = addShare("photo", "read only = no\nvalid users = alice, carol\nread list = bob\n");
        video_ = addShare("video", "read only = no\n");
    }
    static CgiReply ask(const std::string& user, const std::string& form, support::Variables more = {}) {
        more["CONTENT_TYPE"] = "application/x-www-form-urlencoded";
        return CgiReply(support::runCgi(PROGRAM_OPERATION, user, "POST", "", form, more));
    }
    static int code(const CgiReply& reply) { return reply.json["error"]["code"].asInt(); }
    // Starts an operation. "" when it was refused.
    static std::string start(const std::string& user, const std::string& form, const support::Variables& more = {}) {
        const CgiReply reply = ask(user, form, more);
        EXPECT_EQ(reply.status, 200) << form;
        return reply.json["data"]["taskid"].asString();
    }
    static Json::Value status(const std::string& user, const std::string& id) {
        return CgiReply(support::runCgi(PROGRAM_OPERATION, user, "GET", "action=status&taskid=" + id)).json["data"];
    }
    static Json::Value ended(const std::string& user, const std::string& id) {
        const std::unique_ptr<KTR::Task> task(KTR::TaskMgr(user.c_str()).getTask(id.c_str()));
        EXPECT_NE(task, nullptr) << id;
        support::waitUntil("the end of " + id,
                           [&] { return task == nullptr || (task->reload() && task->isFinished()); });
        return status(user, id);
    }
    static Json::Value perform(const std::string& user, const std::string& form) {
        const std::string id = start(user, form);
        EXPECT_NE(id, "") << form;
        return ended(user, id);
    }
    // "path code" of each error.
    static std::string errors(const Json::Value& task) {
        std::string all;
        for (const Json::Value& error : task["errors"]) {
            all += error["path"].asString() + " " + std::to_string(error["code"].asInt()) + "\n";
        }
        return all;
    }
    static std::string recordOf(const std::string& id) { return systemRoot() + "/var/lib/vexo/tasks/alice/" + id; }
    static bool hasParts(const std::string& root) {
        for (const auto& entry : fs::recursive_directory_iterator(root)) {
            if (entry.path().filename().string().starts_with(".vexo-part-")) return true;
        }
        return false;
    }
    static void give(const std::string& path, uid_t owner = support::kAliceUid) {
        EXPECT_EQ(lchown(path.c_str(), owner, support::kUsersGid), 0) << path;
    }
    std::string photo_, video_;
};

#endif
