// PartQueue: numbers of parts in a pipe that several processes take from, and what these report.
//
// A number is a piece of nine bytes, eight digits and an end of line, so that a process gets a
// whole one or none. Reports are lines on standard output, of which each is written at once:
// "done N" for a part, and "passed N" now and then for N pixels more since the last report.
#ifndef ZMC_TOOLS_PARTQUEUE_H
#define ZMC_TOOLS_PARTQUEUE_H

#include <chrono>
#include <cstdint>
#include <functional>
#include <string>
#include <vector>

namespace zmctools {

class PartQueue {
public:
    static std::string Piece(std::uint64_t part);
    // The digits of the next piece; empty when there are no more.
    static std::string Take();

    class Reports {
    public:
        // How many pixels of the part that is under way have passed.
        void Passed(std::uint64_t pixels);
        void Done(std::uint64_t part);

    private:
        using Clock = std::chrono::steady_clock;
        std::uint64_t reported = 0;
        std::uint64_t passed = 0;
        Clock::time_point next{};

        void Report();
    };
};

// Has processes of this program make the parts, each of them with some threads. Parts that an ended
// process was at are made again by others; the rest of the arguments is that of one that goes on.
// What a process fails for is thrown with its own words, warnings are said once. `passed` is told
// of pixels and answers whether to go on; if not, all are ended and Interruption is thrown.
struct LocalParts {
    std::string plan;
    std::string target;  // for messages
    std::uint32_t processes = 1;
    std::uint32_t threads = 1;
    bool count = false;
    std::function<bool(std::uint64_t pixels)> passed;

    void Make(std::vector<std::uint64_t> parts) const;
};

}  // namespace zmctools

#endif
