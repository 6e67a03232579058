#include "tools/HistogramBars.h"

#include <algorithm>
#include <cmath>
#include <iterator>

namespace zmctools {
namespace {

constexpr std::size_t kMaxBars = 64;
constexpr int kLines = 6;
constexpr const char* kBlocks[] = {" ", "▁", "▂", "▃", "▄", "▅", "▆", "▇", "█"};
constexpr int kSteps = std::size(kBlocks) - 1;  // heights that a character has

std::vector<double> Gather(const std::vector<double>& counts) {
    const std::size_t perBar = (counts.size() + kMaxBars - 1) / kMaxBars;
    std::vector<double> bars;
    for (std::size_t i = 0; i < counts.size(); ++i) {
        if (i % perBar == 0) bars.push_back(0);
        bars.back() += counts[i];
    }
    return bars;
}

}  // namespace

std::vector<std::string> DrawBars(const std::vector<double>& counts) {
    const std::vector<double> bars = Gather(counts);
    const double highest = bars.empty() ? 0 : *std::max_element(bars.begin(), bars.end());
    if (!(highest > 0)) return {};
    std::vector<std::string> lines;
    for (int line = kLines - 1; line >= 0; --line) {
        std::string text;
        for (const double bar : bars) {
            int steps = static_cast<int>(std::lround(bar / highest * kLines * kSteps));
            if (bar > 0) steps = std::max(steps, 1);
            text += kBlocks[std::clamp(steps - line * kSteps, 0, kSteps)];
        }
        lines.push_back(text);
    }
    return lines;
}

}  // namespace zmctools
