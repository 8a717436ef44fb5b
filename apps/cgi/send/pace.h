// How slowly a visitor may send: a seat is not kept by who sends a byte now and then.
#ifndef ORVEL_CGI_SEND_PACE_H
#define ORVEL_CGI_SEND_PACE_H

#include <chrono>
#include <cstddef>
#include <cstdint>

namespace orvel::cgi {

class Pace {
 public:
    using Clock = std::chrono::steady_clock;
    static constexpr std::chrono::seconds kGrace{60};
    static constexpr std::int64_t kSlowest = 1024;  // bytes a second, on the whole

    explicit Pace(Clock::time_point begin = Clock::now()) : begin_(begin) {}

    // So many bytes more have come.
    bool isTooSlow(size_t bytes, Clock::time_point now = Clock::now()) {
        bytes_ += static_cast<std::int64_t>(bytes);
        const auto taken = std::chrono::duration_cast<std::chrono::seconds>(now - begin_);
        return taken > kGrace && bytes_ < taken.count() * kSlowest;
    }

 private:
    Clock::time_point begin_;
    std::int64_t bytes_ = 0;
};

}  // namespace orvel::cgi

#endif
