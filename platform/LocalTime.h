// The wall clock as text.
#ifndef ZMC_PLATFORM_LOCALTIME_H
#define ZMC_PLATFORM_LOCALTIME_H

namespace platform {

// Length of the text below, without its terminator.
inline constexpr int kLocalTimeLength = 24;

// The present local time in the form of asctime without its newline, "Sat Nov 21 03:33:04 2026";
// empty if the time cannot be told. Any thread may call.
void LocalTimeText(char (&text)[kLocalTimeLength + 1]);

}  // namespace platform

#endif
