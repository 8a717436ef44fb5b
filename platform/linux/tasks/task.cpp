#include "vexo/task.h"

#include <algorithm>
#include <ctime>
#include <exception>
#include <string_view>
#include <utility>
#include <vector>

#include "base/raised_identity.h"
#include "failure.h"
#include "fault_gate.h"
#include "tasks/task_name.h"
#include "tasks/task_store.h"

namespace {

using orvel::Descriptor;
using vexo::TaskDocument;

// Fills the slot for errno.
bool failed(const char* file = __builtin_FILE(), int line = __builtin_LINE()) {
    return vexo::fail(vexo::errorOfErrno(errno), file, line) == 0;
}

bool refused(const char* file = __builtin_FILE(), int line = __builtin_LINE()) {
    return vexo::fail(VEXO_ERR_PARAMETER, EINVAL, file, line) == 0;
}

enum class Fate { kRunning, kDone, kFailed };

// Appends what the files of `folder` stand for; where there is no folder, that is nothing.
bool appendNames(const Descriptor& folder, const char* prefix, Json::Value& names) {
    std::vector<std::string> files, found;
    if (!folder && errno == ENOENT) return true;
    if (!folder || !vexo::listTaskFiles(folder.get(), files)) return failed();
    for (const std::string& file : files) {
        const auto name = vexo::taskNameOfFile(file);
        if (name && name->starts_with(prefix)) found.push_back(*name);
    }
    std::sort(found.begin(), found.end());
    for (const std::string& name : found) names.append(name);
    return true;
}

// Runs the body of an operation with root's identity; no exception leaves it.
template <class Result, class Body>
Result asStore(Result failure, Body&& body) {
    try {
        const orvel::RaisedIdentity raised;
        return body();
    } catch (const std::exception&) {
        vexo::fail(VEXO_ERR_GENERAL, ENOMEM);
        return failure;
    }
}

}  // namespace

namespace KTR {

struct Task::Impl {
    Descriptor folder;
    std::string name, file;
    TaskDocument document;
    Descriptor lock;  // open during an update

    bool begin() {
        if (lock) return refused();
        Descriptor locked = vexo::lockTask(folder.get(), file);
        if (!locked || !vexo::readTask(folder.get(), file, document)) return failed();
        lock = std::move(locked);
        return true;
    }
    bool end() {
        if (!lock) return refused();
        const Descriptor unlockAtEnd = std::move(lock);
        if (vexo::replaceTask(folder.get(), file, document)) return true;
        failed();
        return abandon();
    }
    // Ends the update as if there had been none.
    bool abandon() {
        const vexo::KeepErrno keep;
        lock.reset();
        static_cast<void>(vexo::readTask(folder.get(), file, document));
        return false;
    }
    // Whether the work goes on, by the document and, when that seems not to be so, by the one of this moment: it may
    // have come to its end since. What cannot be determined is no end.
    [[nodiscard]] Fate fate() const {
        if (document.finished) return Fate::kDone;
        if (lock || vexo::isRunning(document.worker).value_or(true)) return Fate::kRunning;
        TaskDocument now;
        if (!vexo::readTask(folder.get(), file, now)) return errno == ENOENT ? Fate::kFailed : Fate::kRunning;
        if (now.finished) return Fate::kDone;
        return vexo::isRunning(now.worker).value_or(true) ? Fate::kRunning : Fate::kFailed;
    }
    // Makes a change, in an update of its own where none is open.
    template <class Change>
    bool update(Change&& change) {
        const bool open = static_cast<bool>(lock);
        if (!open && !begin()) return false;
        change(document);
        return open || end();
    }
};

Task::Task(std::unique_ptr<Impl> impl) : impl_(std::move(impl)) {}
Task::~Task() = default;

bool Task::reload() {
    VEXO_GATE("KTR::Task::reload", false);
    if (impl_->lock) return true;
    return asStore(false,
                   [&] { return vexo::readTask(impl_->folder.get(), impl_->file, impl_->document) || failed(); });
}

Json::Value Task::getProperty(const char* name) const try {
    const Json::Value& properties = impl_->document.properties;
    return name != nullptr && properties.isMember(name) ? properties[name] : Json::Value();
} catch (const std::exception&) {
    return {};
}

bool Task::setProperty(const char* name, const Json::Value& value) {
    VEXO_GATE("KTR::Task::setProperty", false);
    if (name == nullptr) return refused();
    return asStore(false, [&] { return impl_->update([&](auto& document) { document.properties[name] = value; }); });
}

bool Task::beginUpdate() {
    VEXO_GATE("KTR::Task::beginUpdate", false);
    return asStore(false, [&] { return impl_->begin(); });
}

bool Task::endUpdate() {
    VEXO_GATE("KTR::Task::endUpdate", asStore(false, [&] { return impl_->abandon(); }));
    return asStore(false, [&] { return impl_->end(); });
}

bool Task::attach() {
    VEXO_GATE("KTR::Task::attach", false);
    return asStore(false, [&] {
        const vexo::Worker worker = vexo::thisProcess();
        return impl_->update([&](auto& document) { document.worker = worker; });
    });
}

pid_t Task::getWorker() const {
    const vexo::Worker& worker = impl_->document.worker;
    return asStore(pid_t{0}, [&] { return vexo::isRunning(worker).value_or(false) ? worker.pid : 0; });
}

bool Task::finish() {
    VEXO_GATE("KTR::Task::finish", false);
    return asStore(false, [&] { return impl_->update([](auto& document) { document.finished = true; }); });
}

bool Task::isFinished() const {
    return asStore(false, [&] { return impl_->fate() != Fate::kRunning; });
}

bool Task::hasFailed() const {
    return asStore(false, [&] { return impl_->fate() == Fate::kFailed; });
}

long long Task::getCreateTime() const {
    return impl_->document.created;
}

std::string Task::getName() const {
    return impl_->name;
}

bool Task::remove() {
    VEXO_GATE("KTR::Task::remove", false);
    return asStore(false, [&] {
        impl_->lock.reset();
        return vexo::removeTask(impl_->folder.get(), impl_->file) || failed();
    });
}

struct TaskMgr::Impl {
    std::string user;  // as a file name; "" for a name that no user can have

    [[nodiscard]] Descriptor open(bool make) const {
        if (!user.empty()) return vexo::openTaskFolder(user, make);
        errno = ENOENT;
        return Descriptor();
    }

    // Opens the task's file and reads it. Null with errno, ENOENT also for a name that no task can have.
    [[nodiscard]] std::unique_ptr<Task::Impl> find(const char* name) const {
        const auto file = vexo::fileNameOfTask(name == nullptr ? "" : name);
        errno = ENOENT;
        if (!file) return nullptr;
        auto task = std::make_unique<Task::Impl>();
        task->folder = open(false);
        task->name = name;
        task->file = *file;
        if (!task->folder || !vexo::readTask(task->folder.get(), *file, task->document)) return nullptr;
        return task;
    }

    [[nodiscard]] std::unique_ptr<Task::Impl> create(const char* name) const {
        const auto file = vexo::fileNameOfTask(name == nullptr ? "" : name);
        if (!file || user.empty()) {
            refused();
            return nullptr;
        }
        auto task = std::make_unique<Task::Impl>();
        task->folder = open(true);
        task->name = name;
        task->file = *file;
        task->document.created = time(nullptr);
        task->document.worker = vexo::thisProcess();
        if (task->folder && vexo::createTask(task->folder.get(), *file, task->document)) return task;
        failed();
        return nullptr;
    }
};

TaskMgr::TaskMgr(const char* user) : impl_(std::make_unique<Impl>()) {
    impl_->user = vexo::fileNameOfTask(user == nullptr ? "" : user).value_or("");
}
TaskMgr::~TaskMgr() = default;

bool TaskMgr::hasTask(const char* name) const {
    VEXO_GATE("KTR::TaskMgr::hasTask", false);
    return asStore(false, [&] { return impl_->find(name) != nullptr; });
}

Task* TaskMgr::getTask(const char* name) const {
    VEXO_GATE("KTR::TaskMgr::getTask", nullptr);
    return asStore<Task*>(nullptr, [&]() -> Task* {
        auto found = impl_->find(name);
        if (found) return new Task(std::move(found));
        failed();
        return nullptr;
    });
}

Task* TaskMgr::createTask(const char* name) {
    VEXO_GATE("KTR::TaskMgr::createTask", nullptr);
    return asStore<Task*>(nullptr, [&]() -> Task* {
        auto made = impl_->create(name);
        return made ? new Task(std::move(made)) : nullptr;
    });
}

bool TaskMgr::getAllTaskId(const char* prefix, Json::Value& names) const {
    VEXO_GATE("KTR::TaskMgr::getAllTaskId", false);
    if (prefix == nullptr || (!names.isArray() && !names.isNull())) return refused();
    return asStore(false, [&] { return appendNames(impl_->open(false), prefix, names); });
}

bool TaskMgr::getAllUsers(Json::Value& users) {
    VEXO_GATE("KTR::TaskMgr::getAllUsers", false);
    if (!users.isArray() && !users.isNull()) return refused();
    return asStore(false, [&] { return appendNames(vexo::openTaskFolder(".", false), "", users); });
}

}  // namespace KTR
