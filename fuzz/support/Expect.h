// What a fuzz target holds of its input's outcome. An expectation that fails names itself and ends
// the program, so that a fuzzer keeps the input and a replay fails.
#ifndef ZMC_FUZZ_SUPPORT_EXPECT_H
#define ZMC_FUZZ_SUPPORT_EXPECT_H

#include <unistd.h>

#include <cstdio>
#include <cstdlib>

namespace zmcfuzz {

// To the descriptor and not to the stream, which targets may have silenced.
[[noreturn]] inline void Fail(const char* file, int line, const char* expectation) {
    dprintf(STDERR_FILENO, "%s:%d: does not hold: %s\n", file, line, expectation);
    std::abort();
}

}  // namespace zmcfuzz

#define ZMC_EXPECT(...) \
    ((__VA_ARGS__) ? static_cast<void>(0) : zmcfuzz::Fail(__FILE__, __LINE__, #__VA_ARGS__))

#endif
