// Interruption by signals: SIGINT, SIGTERM and SIGHUP ask for an end, and the work looks now and
// then whether one was asked for. A second signal of the same kind ends the process at once.
#ifndef ZMC_TOOLS_INTERRUPT_H
#define ZMC_TOOLS_INTERRUPT_H

#include <string>

namespace zmctools {

void CatchInterrupts();
bool IsInterrupted();
// Throws Interruption if an end was asked for.
void CheckInterrupt(const std::string& file);

}  // namespace zmctools

#endif
