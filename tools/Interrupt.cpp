#include "tools/Interrupt.h"

#include "platform/Interrupts.h"
#include "tools/Message.h"

namespace zmctools {

void CheckInterrupt(const std::string& file) {
    if (platform::IsInterrupted()) throw Interruption(file);
}

}  // namespace zmctools
