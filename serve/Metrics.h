// Metrics: counts of what the server did, and their text for Prometheus.
//
// Counters never lock; any number of threads may count and ask.
#ifndef ZMC_SERVE_METRICS_H
#define ZMC_SERVE_METRICS_H

#include <array>
#include <atomic>
#include <chrono>
#include <cstdint>
#include <string>

namespace zmcserve {

class Metrics {
public:
    using Count = std::atomic<std::uint64_t>;

    // One request was answered: with what status, how many bytes of a body, after how long.
    void Answered(int status, std::uint64_t bytes, std::chrono::nanoseconds time);

    Count refusedAsBusy{0};  // with 503, because too many waited
    Count connections{0};    // open now
    Count waiting{0};        // requests for a worker, now
    Count working{0};        // that a worker is at, now
    Count lostLogLines{0};

    // In the text format of Prometheus, version 0.0.4.
    std::string Text() const;

private:
    // Upper bounds in microseconds; the last one is without.
    static constexpr std::array<std::uint64_t, 10> kBounds = {
        500, 1000, 2500, 5000, 10000, 25000, 100000, 500000, 2500000, 10000000};

    std::array<Count, 6> byStatus{};  // by the hundreds; 0: anything else
    std::array<Count, kBounds.size() + 1> byTime{};
    Count bytesSent{0};
    Count microseconds{0};
};

}  // namespace zmcserve

#endif
