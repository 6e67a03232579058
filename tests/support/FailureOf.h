// FailureOf: what an action of the host's library complains of.
#ifndef ZMC_TESTS_SUPPORT_FAILUREOF_H
#define ZMC_TESTS_SUPPORT_FAILUREOF_H

#include <string>

#include "host/base/Error.h"

namespace zmctest {

// The text of the Error that the action throws; "no failure" if it throws none.
template <class Action>
std::string FailureOf(Action&& action) {
    try {
        action();
        return "no failure";
    } catch (const zmchost::Error& error) {
        return error.what();
    }
}

}  // namespace zmctest

#endif
