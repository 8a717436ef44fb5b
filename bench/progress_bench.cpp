// One update of a task record beside a bare write and rename of the same bytes, in one run.
//   progress_bench [ROUNDS [FOLDER]]
#include <fcntl.h>
#include <json/value.h>
#include <json/writer.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "contest.h"
#include "orvel/task_progress.h"

namespace fs = std::filesystem;

namespace {

constexpr int kBatch = 500;

Json::Value sample() {
    Json::Value data;
    for (const char* key :
         {"items_done", "items_failed", "items_skipped", "items_total", "bytes_done", "bytes_total"}) {
        data[key] = Json::Int64{1234567890};
    }
    data["action"] = "copy";
    data["state"] = "running";
    data["current"] = "/photo/2012/holiday/a name of usual length.jpg";
    data["errors"] = Json::Value(Json::arrayValue);
    return data;
}

double now() {
    timespec time{};
    clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &time);
    return static_cast<double>(time.tv_sec) * 1e6 + static_cast<double>(time.tv_nsec) / 1e3;
}

bool writeAndRename(const std::string& file, const std::string& text) {
    const std::string temporary = file + ".new";
    const int fd = open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
    const bool written = fd >= 0 && write(fd, text.data(), text.size()) == static_cast<ssize_t>(text.size());
    close(fd);
    return written && rename(temporary.c_str(), file.c_str()) == 0;
}

}  // namespace

int main(int argc, char** argv) {
    std::string root = std::string(argc > 2 ? argv[2] : "/tmp") + "/orvel-progress-XXXXXX";
    if (mkdtemp(root.data()) == nullptr) return 2;
    setenv("VEXO_ROOT", root.c_str(), 1);
    const std::unique_ptr<KTR::Task> task(KTR::TaskMgr("bench").createTask("Quorvane_copy"));
    const Json::Value data = sample();
    if (task == nullptr || !SaveTaskData(task.get(), data, 0.5F)) return 2;
    std::string text(fs::file_size(root + "/var/lib/vexo/tasks/bench/Quorvane_copy"), 'x');
    std::vector<double> bare, full, ratios;
    for (int round = -1; round < (argc > 1 ? atoi(argv[1]) : 21); ++round) {
        const double start = now();
        for (int i = 0; i < kBatch; ++i) {
            if (!writeAndRename(root + "/bare", text)) return 1;
        }
        const double middle = now();
        for (int i = 0; i < kBatch; ++i) {
            if (!SaveTaskData(task.get(), data, static_cast<float>(i) / kBatch)) return 1;
        }
        const double end = now();
        if (round < 0) continue;
        bare.push_back((middle - start) / kBatch);
        full.push_back((end - middle) / kBatch);
        ratios.push_back(full.back() / bare.back());
    }
    printf("processor time of one update, %zu bytes\n  bare write and rename  %7.1f us  1.00\n", text.size(),
           bench::median(bare));
    printf("  SaveTaskData           %7.1f us  %.2f\n", bench::median(full), bench::median(ratios));
    fs::remove_all(root);
    return 0;
}
