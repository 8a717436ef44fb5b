// Holds processes that run the platform built for tests before one of its operations.
#ifndef ORVEL_TESTS_SUPPORT_GATE_H
#define ORVEL_TESTS_SUPPORT_GATE_H

#include <sys/stat.h>

#include <filesystem>
#include <string>
#include <utility>

#include "support/appliance.h"
#include "support/wait.h"

namespace support {

// Shut from the start; open for good when it is destroyed.
class Gate {
 public:
    // `file` does not exist yet; every user may reach it.
    Gate(std::string operation, std::string file) : operation_(std::move(operation)), file_(std::move(file)) { shut(); }
    ~Gate() { open(); }
    Gate(const Gate&) = delete;
    Gate& operator=(const Gate&) = delete;

    // What the environment of the process to be held says.
    [[nodiscard]] std::pair<const std::string, std::string> order() const {
        return {"VEXO_GATE_HOLD", operation_ + "=" + file_};
    }
    // Waits until a process is held.
    [[nodiscard]] bool holds() const {
        return waitUntil("somebody at the gate of " + operation_, [&] { return !readFile(file_).empty(); });
    }
    // Lets the held process pass this once.
    void next() { shut(); }
    void open() {
        std::error_code ignored;
        std::filesystem::remove(file_, ignored);
    }

 private:
    void shut() {
        writeFile(file_ + ".new", "");
        EXPECT_EQ(chmod((file_ + ".new").c_str(), 0666), 0);
        std::filesystem::rename(file_ + ".new", file_);
    }
    std::string operation_, file_;
};

}  // namespace support

#endif
