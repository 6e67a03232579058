// The output that a debugger shows; on POSIX systems the standard error stream.
#ifndef ZMC_PLATFORM_DEBUGOUTPUT_H
#define ZMC_PLATFORM_DEBUGOUTPUT_H

namespace platform {

// Shows a zero-terminated UTF-16 text as it is, with no newline added. Never throws.
void WriteDebugOutput(const char16_t* text);

}  // namespace platform

#endif
