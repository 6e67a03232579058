// ProcessorTime: what a thread has worked, however busy the machine is with others.
//
// Tests that judge whether something ends soon ask for this, and leave room of several times what a
// build with sanitizers takes: what they are to see takes minutes.
#ifndef ZMC_TESTS_SUPPORT_PROCESSORTIME_H
#define ZMC_TESTS_SUPPORT_PROCESSORTIME_H

#include <ctime>

namespace zmctest {

// Begins with its construction, on the thread that asks for it.
class ProcessorTime {
public:
    double Seconds() const { return Now() - begin; }

private:
    static double Now() {
        timespec time{};
        clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
        return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
    }

    double begin = Now();
};

}  // namespace zmctest

#endif
