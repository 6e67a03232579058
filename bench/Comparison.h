// Times an operation beside its bound in one run: both in turn, so that what slows the machine
// slows both. Reports "ratio", the rate of ours as a share of the bound's, from the medians.
#ifndef ZMC_BENCH_COMPARISON_H
#define ZMC_BENCH_COMPARISON_H

#include <benchmark/benchmark.h>

#include <algorithm>
#include <chrono>
#include <cstddef>
#include <vector>

namespace bench {

inline double Median(std::vector<double>& values) {
    const auto middle = values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2);
    std::nth_element(values.begin(), middle, values.end());
    return *middle;
}

template <class Call>
double SecondsOf(Call&& call) {
    const auto start = std::chrono::steady_clock::now();
    call();
    benchmark::ClobberMemory();
    return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

// Use with UseManualTime, which then is the time of ours.
template <class Ours, class Bound>
void Compare(benchmark::State& state, std::size_t bytes, Ours&& ours, Bound&& bound) {
    for (int warmUp = 0; warmUp < 3; ++warmUp) {
        ours();
        bound();
    }
    std::vector<double> oursTimes, boundTimes;
    for (auto _ : state) {
        boundTimes.push_back(SecondsOf(bound));
        oursTimes.push_back(SecondsOf(ours));
        state.SetIterationTime(oursTimes.back());
    }
    const double oursMedian = Median(oursTimes);
    state.counters["ratio"] = Median(boundTimes) / oursMedian;
    state.counters["GB/s"] = static_cast<double>(bytes) / oursMedian / 1e9;
}

}  // namespace bench

#endif
