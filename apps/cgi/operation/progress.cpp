#include "operation/progress.h"

#include <algorithm>
#include <ctime>

#include "background.h"
#include "orvel/error_state.h"
#include "orvel/task_progress.h"
#include "reply.h"
#include "vexo/copy.h"

namespace orvel::cgi {
namespace {

constexpr long long kInterval = 200;  // milliseconds between two writings of the record
// What the paths of the listed errors may come to: written with every byte escaped they still fit into the record.
constexpr size_t kErrorBytes = size_t{96} * 1024;
constexpr size_t kErrorOverhead = 64;
constexpr size_t kMostNew = 10;  // said by name

Progress* atWork = nullptr;

long long now() {
    timespec time{};
    clock_gettime(CLOCK_MONOTONIC_COARSE, &time);
    return time.tv_sec * 1000LL + time.tv_nsec / 1000000;
}

}  // namespace

Progress::Progress(KTR::Task& task, const std::string& user, const std::string& action)
    : task_(task), undo_(user, task.getName()), action_(action) {
    atWork = this;
}

Progress::~Progress() {
    atWork = nullptr;
}

void Progress::expect(long long items, long long bytes) {
    itemsTotal_ += items;
    bytesTotal_ += bytes;
}

void Progress::begin(const std::string& path) {
    current_ = path;
    if (!begun_) publishedAt_ = 0;  // how much there is to do is known by now
    begun_ = true;
    publishNowAndThen(0);
}

void Progress::bytes(long long count) {
    bytesDone_ += count;
    publishNowAndThen(0);
}

void Progress::count(long long& items) {
    ++items;
    publishNowAndThen(0);
}

void Progress::failed(const std::string& path, int code) {
    failed(path, code, OrvParseErrorToKTRString(code, nullptr));
}

void Progress::failed(const std::string& path, int code, const char* key) {
    const size_t room = measured_ ? kErrorBytes / 4 : kErrorBytes;  // besides what was measured
    if (errorBytes_ + path.size() + kErrorOverhead > room) {
        ++errorsLeftOut_;
    } else {
        Json::Value error;
        putPath(error, "path", path);
        error["code"] = code;
        error["key"] = key;
        errors_.append(error);
        errorBytes_ += path.size() + kErrorOverhead;
    }
    count(itemsFailed_);
}

void Progress::noteNew(const std::string& path, const std::vector<std::string>& names) {
    newCount_ = static_cast<Json::Int64>(names.size());
    for (size_t i = 0; i < std::min(names.size(), kMostNew); ++i) {
        Json::Value one;
        putPath(one, "path", path + "/" + names[i]);
        new_.append(one);
    }
}

void Progress::broken(const std::string& path, int code) {
    state_ = "failed";
    failed(path, code);
}

bool Progress::stopped() {
    publishNowAndThen(0);
    return *stopFlag() != 0;
}

int Progress::askDuringCopy() {
    if (atWork != nullptr) atWork->publishNowAndThen(VEXOFileCopyDone());
    return *stopFlag();
}

void Progress::publishNowAndThen(long long underWay) {
    const long long time = now();
    if (time - publishedAt_ < kInterval) return;
    publishedAt_ = time;
    SaveTaskData(&task_, data(underWay), fraction(underWay));
}

bool Progress::publish() {
    publishedAt_ = now();
    return SaveTaskData(&task_, data(0), fraction(0));
}

void Progress::end() {
    if (state_ == "running") state_ = *stopFlag() != 0 ? "cancelled" : "done";
    current_.clear();
    undo_.close();
    publish();
    task_.finish();
}

Json::Value Progress::data(long long underWay) const {
    Json::Value data;
    data["action"] = action_;
    data["state"] = state_;
    data["items_done"] = Json::Int64{itemsDone_};
    data["items_skipped"] = Json::Int64{itemsSkipped_};
    data["items_failed"] = Json::Int64{itemsFailed_};
    data["items_total"] = Json::Int64{itemsTotal_};
    data["bytes_done"] = Json::Int64{bytesDone_ + underWay};
    data["bytes_total"] = Json::Int64{bytesTotal_};
    putPath(data, "current", current_);
    data["errors"] = errors_;
    data["errors_left_out"] = Json::Int64{errorsLeftOut_};
    if (undo_.count() + undo_.leftOut() > 0) {
        data["undo_count"] = Json::Int64{undo_.count()};
        data["undo_left_out"] = Json::Int64{undo_.leftOut()};
    }
    if (measured_) data["measured"] = measured_();
    if (newCount_ == 0) return data;
    data["new"] = new_;
    data["new_count"] = newCount_;
    return data;
}

float Progress::fraction(long long underWay) const {
    if (state_ == "done") return 1;
    const long long items = itemsDone_ + itemsSkipped_ + itemsFailed_, bytes = bytesDone_ + underWay;
    const auto part = [](long long done, long long total) {
        return std::min(1.0F, static_cast<float>(done) / static_cast<float>(std::max(total, 1LL)));
    };
    return bytesTotal_ > 0 ? part(bytes, bytesTotal_) : part(items, itemsTotal_);
}

}  // namespace orvel::cgi
