#include "zmcpe/ProjContext.h"

namespace zelm {

// Trivially destroyed, all of them: handles may be released after this library's destructors ran.
platform::Mutex projMutex;

namespace {

PJ_CONTEXT* shared ZMC_GUARDED_BY(projMutex) = nullptr;
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
    if (shared || closed) return shared;
    shared = proj_context_create();
    if (!shared) return nullptr;
    // Refusals are answers, not news for the error stream. The level alone lets the messages of a
    // database that cannot be used through.
    proj_log_func(shared, nullptr, DropMessage);
    proj_log_level(shared, PJ_LOG_NONE);
    proj_context_set_enable_network(shared, 0);
    return shared;
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
    if (shared) proj_context_destroy(shared);
    shared = nullptr;
    closed = true;
}

}  // namespace zelm
