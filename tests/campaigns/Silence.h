// Silence: while it lives the standard error stream leads nowhere, because the parser tells of each
// malformed document there.
#ifndef ZMC_TESTS_CAMPAIGNS_SILENCE_H
#define ZMC_TESTS_CAMPAIGNS_SILENCE_H

#include <unistd.h>

#include <cstdio>
#include <cstdlib>

namespace zmctest {

class Silence {
public:
    Silence() : kept(dup(2)) {
        std::fflush(stderr);
        if (!std::freopen("/dev/null", "w", stderr)) std::abort();
    }
    ~Silence() {
        std::fflush(stderr);
        dup2(kept, 2);
        close(kept);
    }
    Silence(const Silence&) = delete;
    Silence& operator=(const Silence&) = delete;

private:
    int kept;
};

}  // namespace zmctest

#endif
