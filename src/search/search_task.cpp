// Where the results of searches lie: names, ids and existence of tasks.
#include "orvel/search_task.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <memory>
#include <string_view>
#include <utility>

#include "core/boundary.h"
#include "core/owned.h"
#include "search/task_folder.h"

namespace FileSearch {
namespace {

constexpr std::size_t kPathLimit = 4095;  // with the terminator

// One component of a path that leads nowhere else.
bool isName(const char* text) {
    if (text == nullptr) return false;
    const std::string_view name = text;
    return !name.empty() && name != "." && name != ".." && name.find('/') == std::string_view::npos;
}

bool exists(const std::string& path) {
    return !path.empty() && access(path.c_str(), F_OK) == 0;
}

std::string withinLimit(std::string path) {
    if (path.size() >= kPathLimit) path.clear();
    return path;
}

std::string textOf(const char* text) {
    return text == nullptr ? std::string() : std::string(text);
}

orvel::Descriptor openRandom() {
    orvel::Descriptor device(open("/dev/urandom", O_RDONLY | O_CLOEXEC));
    return device ? std::move(device) : orvel::Descriptor(open("/dev/random", O_RDONLY | O_CLOEXEC));
}

bool readRandom(unsigned int& number) {
    const orvel::Descriptor device = openRandom();
    if (!device) return false;
    ssize_t got = 0;
    do {
        got = read(device.get(), &number, sizeof number);
    } while (got < 0 && errno == EINTR);
    return got == static_cast<ssize_t>(sizeof number);
}

std::string newId() {
    char id[2 * sizeof(unsigned long long) + 2 * sizeof(unsigned int) + 1];
    snprintf(id, sizeof id, "%llX%X", static_cast<unsigned long long>(time(nullptr)), OrvSearchDBTask::GetRandom());
    return id;
}

}  // namespace

OrvSearchDBTask::OrvSearchDBTask(const char* volume, const char* owner, const char* taskId) : owner_(textOf(owner)) {
    const std::string id = taskId == nullptr ? getUniqueID(volume, owner) : taskId;
    filePath_ = getDBTaskFilePath(volume, owner, id.c_str());
    if (filePath_.empty()) return;
    taskId_ = id;
    if (!exists(filePath_)) createDBTaskDir(volume, owner, id.c_str());
}

OrvSearchDBTask::~OrvSearchDBTask() = default;

const char* OrvSearchDBTask::getDBTaskId() const {
    return taskId_.c_str();
}

const char* OrvSearchDBTask::getDBTaskFilePath() const {
    return filePath_.c_str();
}

bool OrvSearchDBTask::remove() {
    return unlink(filePath_.c_str()) == 0;
}

std::string OrvSearchDBTask::getDBTaskDir(const char* volume, const char* owner) {
    return orvel::guardedQuietly(std::string(), [&] {
        if (volume == nullptr || *volume != '/' || !isName(owner)) return std::string();
        return withinLimit(orvel::searchRoot(volume) + "/" + owner);
    });
}

std::string OrvSearchDBTask::getDBTaskFilePath(const char* volume, const char* owner, const char* taskId) {
    return orvel::guardedQuietly(std::string(), [&] {
        const std::string folder = getDBTaskDir(volume, owner);
        return folder.empty() || !isName(taskId) ? std::string() : withinLimit(folder + "/" + taskId);
    });
}

bool OrvSearchDBTask::checkDBTaskDirExists(const char* volume, const char* owner) {
    return orvel::guardedQuietly(false, [&] { return exists(getDBTaskDir(volume, owner)); });
}

bool OrvSearchDBTask::checkDBTaskExists(const char* volume, const char* owner, const char* taskId) {
    return orvel::guardedQuietly(false, [&] { return exists(getDBTaskFilePath(volume, owner, taskId)); });
}

void OrvSearchDBTask::createDBTaskDir(const char* volume, const char* owner, const char* taskId) {
    orvel::guardedQuietly(false, [&] {
        if (getDBTaskFilePath(volume, owner, taskId).empty()) return false;
        orvel::makeTaskFolders(volume, getDBTaskDir(volume, owner));
        return true;
    });
}

unsigned int OrvSearchDBTask::GetRandom() {
    unsigned int number = 0;
    if (readRandom(number)) return number;
    static bool seeded = false;  // once: seeds of one second would repeat the number
    if (!seeded) srandom(static_cast<unsigned int>(time(nullptr)));
    seeded = true;
    return static_cast<unsigned int>(random());
}

std::string OrvSearchDBTask::getUniqueID(const char* volume, const char* owner) {
    return orvel::guardedQuietly(std::string(), [&] {
        std::string id;
        do {
            id = newId();
        } while (checkDBTaskExists(volume, owner, id.c_str()));
        return id;
    });
}

OrvSearchDBTaskMgr::OrvSearchDBTaskMgr(const char* owner) : owner_(textOf(owner)) {}

OrvSearchDBTaskMgr::~OrvSearchDBTaskMgr() = default;

std::string OrvSearchDBTaskMgr::getDBTaskDir(const char* volume) const {
    return OrvSearchDBTask::getDBTaskDir(volume, owner_.c_str());
}

bool OrvSearchDBTaskMgr::hasDBTask(const char* volume, const char* taskId) const {
    return OrvSearchDBTask::checkDBTaskExists(volume, owner_.c_str(), taskId);
}

OrvSearchDBTask* OrvSearchDBTaskMgr::getDBTask(const char* volume, const char* taskId) const {
    return orvel::guardedQuietly(static_cast<OrvSearchDBTask*>(nullptr), [&]() -> OrvSearchDBTask* {
        return hasDBTask(volume, taskId) ? new OrvSearchDBTask(volume, owner_.c_str(), taskId) : nullptr;
    });
}

OrvSearchDBTask* OrvSearchDBTaskMgr::createDBTask(const char* volume, const char* taskId) {
    return orvel::guardedQuietly(static_cast<OrvSearchDBTask*>(nullptr), [&] {
        auto task = std::make_unique<OrvSearchDBTask>(volume, owner_.c_str(), taskId);
        if (*task->getDBTaskFilePath() == '\0') task.reset();
        return task.release();
    });
}

}  // namespace FileSearch
