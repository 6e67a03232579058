#include "zmcpe/ProjContext.h"

namespace zelm {

// Trivially destroyed, all of them: handles may be released after this library's destructors ran.
platform::Mutex projMutex;

namespace {

PJ_CONTEXT* context ZMC_GUARDED_BY(projMutex) = nullptr;
ProjUser* firstUser ZMC_GUARDED_BY(projMutex) = nullptr;
bool closed ZMC_GUARDED_BY(projMutex) = false;

void DropMessage(void*, int, const char*) {}

struct Closer {
    ~Closer() { ProjContext().CloseForGood(); }
};
const Closer closer;

}  // namespace

ProjContext::ProjContext() { projMutex.Lock(); }

ProjContext::~ProjContext() { projMutex.Unlock(); }

PJ_CONTEXT* ProjContext::Get() {
    if (context || closed) return context;
    context = proj_context_create();
    if (!context) return nullptr;
    // Refusals are answers, not news for the error stream. The level alone lets the messages of a
    // database that cannot be used through.
    proj_log_func(context, nullptr, DropMessage);
    proj_log_level(context, PJ_LOG_NONE);
    proj_context_set_enable_network(context, 0);
    return context;
}

void ProjContext::Enlist(ProjUser* user) {
    user->next = firstUser;
    if (firstUser) firstUser->previous = user;
    firstUser = user;
}

void ProjContext::Dismiss(ProjUser* user) {
    (user->previous ? user->previous->next : firstUser) = user->next;
    if (user->next) user->next->previous = user->previous;
}

void ProjContext::CloseForGood() {
    for (ProjUser* user = firstUser; user; user = user->next) user->DropProj();
    if (context) proj_context_destroy(context);
    context = nullptr;
    closed = true;
}

}  // namespace zelm
