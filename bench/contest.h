// Programs run against each other in interleaved rounds.
#ifndef ORVEL_BENCH_CONTEST_H
#define ORVEL_BENCH_CONTEST_H

#include <fcntl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <string>
#include <vector>

namespace bench {

using Arguments = std::vector<std::string>;

struct Time {
    double wall, cpu;  // milliseconds; negative when the program failed or is missing
};

// Runs a program with its output in `output`.
inline Time runProgram(const Arguments& arguments, int output) {
    std::vector<char*> argv;
    for (const auto& argument : arguments) argv.push_back(const_cast<char*>(argument.c_str()));
    argv.push_back(nullptr);
    const auto start = std::chrono::steady_clock::now();
    const pid_t child = vfork();
    if (child == 0) {
        dup2(output, STDOUT_FILENO);
        execvp(argv[0], argv.data());
        _exit(127);
    }
    int status = 0;
    rusage usage = {};
    wait4(child, &status, 0, &usage);
    const double wall = std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start).count();
    if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) return {-1, -1};
    const auto milliseconds = [](const timeval& t) {
        return static_cast<double>(t.tv_sec) * 1e3 + static_cast<double>(t.tv_usec) / 1e3;
    };
    return {wall, milliseconds(usage.ru_utime) + milliseconds(usage.ru_stime)};
}

inline double median(std::vector<double> values) {
    const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
    std::nth_element(values.begin(), middle, values.end());
    return *middle;
}

struct Contender {
    std::string name;
    Arguments arguments;
    std::vector<double> wall, wallRatios, cpuRatios;  // of each round; a ratio is to the first contender's time in it
};

// Runs all contenders round by round, output discarded, after one round that only warms the caches, and prints medians.
// The first contender is the floor. On a busy machine the ratio of processor times is the one to trust.
inline void contest(std::vector<Contender>& contenders, int rounds) {
    const int null = open("/dev/null", O_WRONLY | O_CLOEXEC);
    for (int round = -1; round < rounds; ++round) {
        Time floor = {};
        for (auto& contender : contenders) {
            const Time time = runProgram(contender.arguments, null);
            if (&contender == &contenders.front()) floor = time;
            if (time.wall < 0 || round < 0) continue;
            contender.wall.push_back(time.wall);
            contender.wallRatios.push_back(time.wall / floor.wall);
            contender.cpuRatios.push_back(time.cpu / floor.cpu);
        }
    }
    close(null);
    printf("%-44s %9s %8s %8s\n", "", "median ms", "ratio", "cpu");
    for (const auto& contender : contenders) {
        if (contender.wall.empty()) {
            printf("%-44s not available on this machine\n", contender.name.c_str());
        } else {
            printf("%-44s %9.1f %8.3f %8.3f\n", contender.name.c_str(), median(contender.wall),
                   median(contender.wallRatios), median(contender.cpuRatios));
        }
    }
}

}  // namespace bench

#endif
