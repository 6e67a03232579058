#include "tools/Message.h"

#include <atomic>

#include "platform/Terminal.h"

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
    platform::WriteAtOnce(platform::StandardStream::Errors, line);
}

void Warn(const std::string& text) {
    if (!isQuiet) Say(text);
}

void SetQuiet(bool quiet) { isQuiet = quiet; }

}  // namespace zmctools
