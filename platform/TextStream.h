// Buffered text streams by wide name, for logs and their settings.
//
// Streams are plain FILE*: the caller closes them with fclose. No child process inherits them.
#ifndef ZMC_PLATFORM_TEXTSTREAM_H
#define ZMC_PLATFORM_TEXTSTREAM_H

#include <cstdint>
#include <cstdio>

namespace platform {

// Opens the file of that zero-terminated UTF-16 name in a mode of fopen ("r", "w", "w+", "a+");
// null if that cannot be done.
std::FILE* OpenTextStream(const char16_t* name, const char* mode);

// Writes out what the stream still holds, moves to its end and stores that offset in `position`;
// false if either failed.
bool SeekToEnd(std::FILE* stream, std::uint64_t& position);

}  // namespace platform

#endif
