// What an indexer shows of its work while it runs: one line on a terminal, nothing elsewhere.
#ifndef ORVEL_ORVELCTL_INDEX_PROGRESS_H
#define ORVEL_ORVELCTL_INDEX_PROGRESS_H

#include <chrono>
#include <string>

namespace orvel::ctl {

class Progress {
 public:
    Progress();
    ~Progress();  // takes the line away
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    // `folder`, the one being read now, of which `entries` are counted.
    void at(const std::string& folder, unsigned long long entries);

 private:
    using Clock = std::chrono::steady_clock;
    bool shown_;  // on a terminal
    bool drawn_ = false;
    Clock::time_point start_, last_;
    unsigned long long total_ = 0;
};

}  // namespace orvel::ctl

#endif
