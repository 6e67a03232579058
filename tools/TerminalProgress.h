// TerminalProgress: a bar on stderr while something long goes on: share, rate and time left.
//
// Nothing is drawn unless stderr is a terminal and the bar is wanted; the line is wiped when the
// work ends, so that what stays on the screen is results and messages. Not synchronised: one thread
// at a time.
#ifndef ZMC_TOOLS_TERMINALPROGRESS_H
#define ZMC_TOOLS_TERMINALPROGRESS_H

#include <chrono>
#include <cstdint>
#include <string>

namespace zmctools {

class TerminalProgress {
public:
    // `label` stands before the bar; progress is counted in pixels.
    TerminalProgress(const std::string& labelText, bool wanted);
    ~TerminalProgress();
    TerminalProgress(const TerminalProgress&) = delete;
    TerminalProgress& operator=(const TerminalProgress&) = delete;

    // Draws, ten times a second at most. False if an end was asked for.
    bool Show(std::uint64_t done, std::uint64_t total);
    // The same for a share of the whole, without a rate in pixels.
    bool ShowShare(double share);

private:
    void Draw(double share, double pixels);

    using Clock = std::chrono::steady_clock;
    std::string label;
    bool enabled;
    bool drawn = false;
    Clock::time_point start = Clock::now();
    Clock::time_point next = start;
};

}  // namespace zmctools

#endif
