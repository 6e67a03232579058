#include "tools/TerminalProgress.h"

#include <algorithm>
#include <cmath>
#include <cstdio>

#include "platform/Interrupts.h"
#include "platform/Terminal.h"
#include "tools/Visible.h"

namespace zmctools {
namespace {

constexpr auto kStream = platform::StandardStream::Errors;

std::string Clock(double seconds) {
    const auto whole = static_cast<unsigned long>(std::lround(std::clamp(seconds, 0.0, 3.5e6)));
    char text[32];
    if (whole >= 3600)
        static_cast<void>(std::snprintf(text, sizeof text, "%lu:%02lu:%02lu", whole / 3600,
                                        whole / 60 % 60, whole % 60));
    else
        static_cast<void>(std::snprintf(text, sizeof text, "%lu:%02lu", whole / 60, whole % 60));
    return text;
}

}  // namespace

TerminalProgress::TerminalProgress(const std::string& labelText, bool wanted)
    : label(Shortened(Visible(labelText), 30)), enabled(wanted && platform::IsTerminal(kStream)) {}

TerminalProgress::~TerminalProgress() {
    if (drawn) platform::WriteAtOnce(kStream, "\r\x1b[K");
}

bool TerminalProgress::Show(std::uint64_t done, std::uint64_t total) {
    const double all = static_cast<double>(std::max<std::uint64_t>(total, 1));
    Draw(static_cast<double>(done) / all, static_cast<double>(done));
    return !platform::IsInterrupted();
}

bool TerminalProgress::ShowShare(double share) {
    Draw(share, 0);
    return !platform::IsInterrupted();
}

void TerminalProgress::Draw(double share, double pixels) {
    const Clock::time_point now = Clock::now();
    share = std::clamp(share, 0.0, 1.0);
    if (!enabled || (now < next && share < 1)) return;
    next = now + std::chrono::milliseconds(100);
    const double seconds = std::chrono::duration<double>(now - start).count();
    char tail[96];
    int length = std::snprintf(tail, sizeof tail, "] %3.0f %%", std::floor(share * 100));
    std::string after(tail, static_cast<std::size_t>(length));
    if (pixels > 0 && seconds > 0) {
        static_cast<void>(
            std::snprintf(tail, sizeof tail, "  %.1f Mpixel/s", pixels / seconds / 1e6));
        after += tail;
    }
    if (share > 0) after += "  " + zmctools::Clock(seconds / share - seconds) + " left";
    const std::string before = label + " [";
    const std::size_t width = platform::TerminalColumns(kStream, 80);
    const std::size_t taken = before.size() + after.size() + 1;
    const std::size_t room = width > taken + 10 ? width - taken : 10;
    const auto full = static_cast<std::size_t>(share * static_cast<double>(room));
    platform::WriteAtOnce(kStream, "\r" + before + std::string(full, '#') +
                                       std::string(room - full, '.') + after + "\x1b[K");
    drawn = true;
}

}  // namespace zmctools
