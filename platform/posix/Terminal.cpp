#include "platform/Terminal.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/ioctl.h>
#include <unistd.h>

namespace platform {
namespace {

int DescriptorOf(StandardStream stream) {
    return stream == StandardStream::Output ? STDOUT_FILENO : STDERR_FILENO;
}

}  // namespace

bool HoldStandardStreams() {
    for (int number = STDIN_FILENO; number <= STDERR_FILENO; ++number) {
        if (fcntl(number, F_GETFD) != -1) continue;
        // Open for the other direction than the stream is used in.
        const int opened = open("/dev/null", number == STDIN_FILENO ? O_WRONLY : O_RDONLY);
        if (opened != number) return false;
    }
    return true;
}

bool IsTerminal(StandardStream stream) { return isatty(DescriptorOf(stream)) == 1; }

std::size_t TerminalColumns(StandardStream stream, std::size_t otherwise) {
    winsize size = {};
    const bool told = ioctl(DescriptorOf(stream), TIOCGWINSZ, &size) == 0 && size.ws_col != 0;
    return told ? size.ws_col : otherwise;
}

std::string ReadPiece(std::size_t size) {
    // A signal that marks an interruption ends the wait for a piece.
    pollfd input = {STDIN_FILENO, POLLIN, 0};
    if (poll(&input, 1, -1) < 0) return "";
    std::string piece(size, '\0');
    const ssize_t got = read(STDIN_FILENO, piece.data(), size);
    return got == static_cast<ssize_t>(size) ? piece : "";
}

void WriteAtOnce(StandardStream stream, std::string_view text) {
    [[maybe_unused]] const auto written = write(DescriptorOf(stream), text.data(), text.size());
}

}  // namespace platform
