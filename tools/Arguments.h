// Values of options, read exactly; what is not understood is thrown as UsageError.
//
// Bands count from 1 on the command line and from 0 everywhere else; levels from 0, the finest.
#ifndef ZMC_TOOLS_ARGUMENTS_H
#define ZMC_TOOLS_ARGUMENTS_H

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "host/raster/RasterSource.h"

namespace zmctools {

// A whole number without a sign, up to `limit`.
std::uint64_t ParseCount(const std::string& option, const std::string& text, std::uint64_t limit);

// A number, "nan" and "inf" included. One that a double would make infinite or nothing is refused.
double ParseNumber(const std::string& option, const std::string& text);

// Bytes, with a unit K, M or G of 1024 to a power, with or without "B", "i" or "iB" behind it, or
// "B" alone.
std::uint64_t ParseSize(const std::string& option, const std::string& text);

// What --threads does, and its value: 0 where all processors are wanted.
inline constexpr const char* kThreadsText = "Threads to work with (default: all processors)";
std::uint32_t ParseThreads(const std::string& text);

// What is said of a list of bands that is given and empty.
inline constexpr const char* kNoBands = "an empty list names no band";

// "3,2,1" as bands from 0. Every one lies below `bands`. An empty text means all of them.
std::vector<std::uint32_t> ParseBands(const std::string& text, std::uint32_t bands);

// "X,Y,WIDTH,HEIGHT" inside width x height. An empty text means all of it.
zmchost::Window ParseWindow(const std::string& text, std::uint32_t width, std::uint32_t height,
                            const std::string& option = "--window");

}  // namespace zmctools

#endif
