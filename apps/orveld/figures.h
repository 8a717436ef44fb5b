// What orveld has done so far. Memory of the parent; a child answers a question about it from the copy that it was
// forked with.
#ifndef ORVEL_ORVELD_FIGURES_H
#define ORVEL_ORVELD_FIGURES_H

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

namespace orvel::orveld {

// How long requests took, in steps of an eighth of an octave: a quantile is right within 9 per cent.
class Durations {
 public:
    void add(std::chrono::nanoseconds time);
    // Seconds; 0 when there was none.
    [[nodiscard]] double quantile(double part) const;

 private:
    static constexpr size_t kSteps = 8;
    static constexpr size_t kOctaves = 34;  // from a microsecond to five hours
    std::array<std::uint32_t, kSteps * kOctaves> counts_{};
    std::uint64_t all_ = 0;
};

struct ProgramFigures {
    std::uint64_t served = 0;
    Durations durations;
};

struct Figures {
    std::uint64_t started = 0;  // when, seconds since 1970
    size_t reading = 0;         // connections whose header block is not whole
    size_t queued = 0;          // whole ones that wait for a child
    size_t running = 0;
    std::uint64_t served = 0;
    std::uint64_t refused = 0;    // for a limit
    std::uint64_t malformed = 0;  // ended before there was a request
    std::uint64_t crashed = 0;
    std::uint64_t abandoned = 0;           // the client went away
    std::vector<ProgramFigures> programs;  // as in the table of programs
};

// As JSON, and as text for Prometheus.
std::string figuresAsJson(const Figures& figures);
std::string figuresAsText(const Figures& figures);

}  // namespace orvel::orveld

#endif
