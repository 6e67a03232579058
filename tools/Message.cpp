#include "tools/Message.h"

#include <unistd.h>

#include <atomic>

namespace zmctools {
namespace {

std::atomic<bool> isQuiet{false};

}  // namespace

void Say(const std::string& text) {
    std::string line = "zmcraster: ";
    for (const char c : text)
        if (c != '\n' && c != '\r')
            line += c;
        else if (line.back() != ' ')
            line += ' ';
    while (line.back() == ' ') line.pop_back();
    line += '\n';
    // One call, so that lines of several threads or processes do not mix.
    [[maybe_unused]] const auto written = write(STDERR_FILENO, line.data(), line.size());
}

void Warn(const std::string& text) {
    if (!isQuiet) Say(text);
}

void SetQuiet(bool quiet) { isQuiet = quiet; }

}  // namespace zmctools
