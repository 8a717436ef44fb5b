#include "record.h"

#include <fcntl.h>
#include <json/reader.h>
#include <json/value.h>
#include <json/writer.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <stdexcept>
#include <system_error>

#include "shares.h"

namespace fs = std::filesystem;

namespace orvel::demo {
namespace {

constexpr const char* kRecord = "/etc/vexo/demo.json";
// Folders of the system root that the demo makes or the appliance fills.
constexpr const char* kTrees[] = {"etc", "etc.defaults", "run", "usr", "var", "tmp"};
constexpr off_t kLongestRecord = 65536;

[[noreturn]] void fail(const std::string& what) {
    throw std::system_error(errno, std::generic_category(), what);
}

// The text of a regular file of the caller's own that has no other name; "" when there is none.
std::string readOwn(const std::string& path) {
    const int fd = open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    struct stat status = {};
    std::string text;
    if (fd >= 0 && fstat(fd, &status) == 0 && S_ISREG(status.st_mode) && status.st_uid == geteuid() &&
        status.st_nlink == 1 && status.st_size <= kLongestRecord) {
        text.resize(static_cast<size_t>(status.st_size));
        if (read(fd, text.data(), text.size()) != status.st_size) text.clear();
    }
    if (fd >= 0) close(fd);
    return text;
}

// A folder that even its owner may not read is in the way of everybody but root.
void openUp(const std::string& root) {
    std::error_code ignored;
    if (geteuid() == 0 || !fs::is_directory(fs::symlink_status(root, ignored))) return;
    fs::permissions(root, fs::perms::owner_all, fs::perm_options::add, ignored);
    for (fs::recursive_directory_iterator entry(root, ignored), end; entry != end; entry.increment(ignored)) {
        if (!fs::is_directory(entry->symlink_status(ignored))) continue;
        fs::permissions(entry->path(), fs::perms::owner_all, fs::perm_options::add, ignored);
    }
}

}  // namespace

std::optional<Record> readRecord(const std::string& folder) {
    const std::string text = readOwn(folder + kRecord);
    if (text.empty()) return std::nullopt;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    Json::Value json;
    std::string errors;
    if (!reader->parse(text.data(), text.data() + text.size(), &json, &errors) || !json.isObject() ||
        !json["roots"].isArray()) {
        throw std::runtime_error(folder + kRecord + " is damaged");
    }
    Record record;
    record.whole = json["whole"].isBool() && json["whole"].asBool();
    record.folderMade = json["folder_made"].isBool() && json["folder_made"].asBool();
    for (const Json::Value& root : json["roots"]) record.roots.push_back(root.asString());
    for (const Json::Value& person : json["people"]) {
        record.people.push_back(
            {person["name"].asString(), person["about"].asString(), 0, person["password"].asString()});
    }
    return record;
}

void writeRecord(const std::string& folder, const Record& record) {
    Json::Value json;
    json["whole"] = record.whole;
    json["folder_made"] = record.folderMade;
    for (const std::string& root : record.roots) json["roots"].append(root);
    for (const Person& person : record.people) {
        Json::Value& entry = json["people"].append(Json::objectValue);
        entry["name"] = person.name;
        entry["about"] = person.about;
        entry["password"] = person.password;
    }
    const std::string path = folder + kRecord;
    unlink((path + ".new").c_str());
    writeNew(path + ".new", Json::writeString(Json::StreamWriterBuilder(), json), 0600);
    if (rename((path + ".new").c_str(), path.c_str()) != 0) fail(path);
}

void writeNew(const std::string& path, const std::string& text, mode_t mode) {
    fs::create_directories(fs::path(path).parent_path());
    const int fd = open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600);
    if (fd < 0) fail(path);
    const bool written =
        write(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size()) && fchmod(fd, mode) == 0;
    if (!written) fail(path);
    close(fd);
}

bool isWhole(const Record& record) {
    return record.whole && std::all_of(record.roots.begin(), record.roots.end(),
                                       [](const std::string& root) { return fs::is_directory(root); });
}

void removeDemo(const std::string& folder, const Record& record) {
    for (const std::string& root : record.roots) {
        if (!isShareRoot(root)) throw std::runtime_error("the record of the demo names " + root);
    }
    for (const std::string& root : record.roots) {
        openUp(root);
        fs::remove_all(root);
    }
    for (const char* tree : kTrees) fs::remove_all(folder + "/" + tree);
    if (!record.folderMade) return;
    if (rmdir(folder.c_str()) != 0) fprintf(stderr, "orvelctl: %s holds other files and stays\n", folder.c_str());
}

}  // namespace orvel::demo
