#include "platform/Terminal.h"

#include <sys/ioctl.h>
#include <unistd.h>

namespace platform {
namespace {

int DescriptorOf(StandardStream stream) {
    return stream == StandardStream::Output ? STDOUT_FILENO : STDERR_FILENO;
}

}  // namespace

bool IsTerminal(StandardStream stream) { return isatty(DescriptorOf(stream)) == 1; }

std::size_t TerminalColumns(StandardStream stream, std::size_t otherwise) {
    winsize size = {};
    const bool told = ioctl(DescriptorOf(stream), TIOCGWINSZ, &size) == 0 && size.ws_col != 0;
    return told ? size.ws_col : otherwise;
}

void WriteAtOnce(StandardStream stream, std::string_view text) {
    [[maybe_unused]] const auto written = write(DescriptorOf(stream), text.data(), text.size());
}

}  // namespace platform
