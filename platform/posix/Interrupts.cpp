#include "platform/Interrupts.h"

#include <csignal>
#include <initializer_list>

namespace platform {
namespace {

volatile std::sig_atomic_t interrupted = 0;

extern "C" void TakeSignal(int) { interrupted = 1; }

}  // namespace

void CatchInterrupts() {
    for (const int signal : {SIGINT, SIGTERM, SIGHUP}) {
        struct sigaction before = {};
        // A signal that the caller ignores, as nohup does, stays ignored.
        if (sigaction(signal, nullptr, &before) == 0 && before.sa_handler == SIG_IGN) continue;
        struct sigaction action = {};
        action.sa_handler = TakeSignal;
        action.sa_flags = static_cast<int>(SA_RESTART | SA_RESETHAND);
        sigaction(signal, &action, nullptr);
    }
    struct sigaction before = {};
    if (sigaction(SIGXFSZ, nullptr, &before) != 0 || before.sa_handler != SIG_DFL) return;
    before.sa_handler = SIG_IGN;
    sigaction(SIGXFSZ, &before, nullptr);
}

bool IsInterrupted() { return interrupted != 0; }

void IgnoreBrokenPipes() {
    struct sigaction action = {};
    action.sa_handler = SIG_IGN;
    sigaction(SIGPIPE, &action, nullptr);
}

}  // namespace platform
