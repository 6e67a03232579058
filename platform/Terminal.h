// The standard streams of a program as those at a terminal see them.
#ifndef ZMC_PLATFORM_TERMINAL_H
#define ZMC_PLATFORM_TERMINAL_H

#include <cstddef>
#include <string>
#include <string_view>

namespace platform {

enum class StandardStream { Output, Errors };

// Takes the numbers of the standard streams that the process was started without, so that no file
// that any library opens gets one, and has messages written into it. What is read from them or
// written to them fails as before. False if that cannot be done. At the start of a program, which a
// library has no business in.
bool HoldStandardStreams();

bool IsTerminal(StandardStream stream);

// Columns of the terminal that the stream goes to; `otherwise` if it goes elsewhere or the terminal
// does not tell.
std::size_t TerminalColumns(StandardStream stream, std::size_t otherwise);

// Hands the text to the system in one call and unbuffered, so that lines of several threads or
// processes do not mix. A stream that takes it no longer loses it: there is nobody left to tell.
void WriteAtOnce(StandardStream stream, std::string_view text);

// Takes that many bytes from standard input in one call, so that processes that have one pipe there
// get whole pieces. Empty at its end, and where it is no whole piece.
std::string ReadPiece(std::size_t size);

}  // namespace platform

#endif
