// A command that was asked to end leaves its work by an exception; main catches the signals.
#ifndef ZMC_TOOLS_INTERRUPT_H
#define ZMC_TOOLS_INTERRUPT_H

#include <string>

namespace zmctools {

// Throws Interruption, while at work on `file`, if an end was asked for.
void CheckInterrupt(const std::string& file);

}  // namespace zmctools

#endif
