// Background operations, from the request that starts them to what they leave behind.
#ifndef ORVEL_TESTS_APPS_TASK_FIXTURE_H
#define ORVEL_TESTS_APPS_TASK_FIXTURE_H

#include "apps/cgi_test.h"
#include "vexo/task.h"

// "path=..&path=.." of these paths, and a target unless it is empty.
inline std::string about(const std::vector<std::string>& paths, const std::string& target = "") {
    std::string form;
    for (const std::string& path : paths) form += "&path=" + percentEncode(path);
    return target.empty() ? form : form + "&target=" + percentEncode(target);
}

// The paths below a folder with what `shown` says of each, sorted; nothing where it says nothing.
inline std::string treeOf(const std::string& root,
                          const std::function<std::string(const fs::directory_entry& entry)>& shown) {
    Names lines;
    for (const auto& entry : fs::recursive_directory_iterator(root)) {
        const std::string text = shown(entry);
        if (!text.empty()) lines.push_back(entry.path().string().substr(root.size() + 1) + text);
    }
    std::sort(lines.begin(), lines.end());
    std::string all;
    for (const std::string& line : lines) all += (all.empty() ? "" : " ") + line;
    return all;
}

// The files with their contents.
inline std::string filesOf(const std::string& root) {
    return treeOf(root, [](const auto& file) { return file.is_regular_file() ? "=" + readFile(file.path()) : ""; });
}

// Everything with its permissions, and a file's time and content or a link's text.
inline std::string treeOf(const std::string& root) {
    return treeOf(root, [](const auto& entry) {
        const struct stat status = statusOf(entry.path());
        const std::string kind = " " + std::to_string(status.st_mode) + " ";
        if (entry.is_symlink()) return kind + fs::read_symlink(entry.path()).string();
        return entry.is_directory() ? kind : kind + std::to_string(status.st_mtime) + " " + readFile(entry.path());
    });
}

class TaskCgi : public support::CgiTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        SKIP_WITHOUT_ROOT();
        addShare("photo", "read only = no\nvalid users = alice, bob, carol\nread list = bob\n");
        video_ = addShare("video", "read only = no\n");
    }
    static CgiReply ask(const std::string& user, const std::string& form, const Variables& more = {}) {
        return post(PROGRAM_OPERATION, user, form, more);
    }
    // Starts an operation. "" when it was refused.
    static std::string start(const std::string& user, const std::string& form, const Variables& more = {}) {
        const CgiReply reply = ask(user, form, more);
        EXPECT_EQ(reply.status, 200) << form;
        return reply.json["data"]["taskid"].asString();
    }
    static Json::Value status(const std::string& user, const std::string& id) {
        return get(PROGRAM_OPERATION, user, "action=status&taskid=" + id).json["data"];
    }
    static Json::Value ended(const std::string& user, const std::string& id) {
        const std::unique_ptr<KTR::Task> task(KTR::TaskMgr(user.c_str()).getTask(id.c_str()));
        EXPECT_NE(task, nullptr) << id;
        waitUntil("the end of " + id, [&] { return task == nullptr || (task->reload() && task->isFinished()); });
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
        for (const Json::Value& error : task["errors"])
            all += error["path"].asString() + " " + std::to_string(error["code"].asInt()) + "\n";
        return all;
    }
    // "OWNER MODE", decimal.
    static std::string modeOf(const std::string& path) {
        struct stat status {};
        if (lstat(path.c_str(), &status) != 0) return "none";
        return std::to_string(status.st_uid) + " " + std::to_string(status.st_mode & 07777);
    }
    static std::string recordOf(const std::string& id) { return systemRoot() + "/var/lib/vexo/tasks/alice/" + id; }
    static bool hasParts(const std::string& root) { return treeOf(root).find(".vexo-part-") != std::string::npos; }
    // What alice may read and change, the folders above it too.
    static void writeFiles(const std::string& root, const Names& paths, const std::string& text = "") {
        for (const std::string& path : paths) {
            writeFile(root + path, text.empty() ? path : text, 0666);
            for (fs::path at = path; at.has_relative_path(); at = at.parent_path()) give(root + at.string());
        }
    }
    std::string video_;
};

#endif
