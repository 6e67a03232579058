#include <gtest/gtest.h>

#include <algorithm>

#include "tests/support/ChildProcess.h"

namespace {

TEST(LoadOrder, ModuleSiblingAndEngineInEveryOrder) {
    std::vector<std::string> libraries = {ZMC_MODULE_PATH, ZMC_SIBLING_PATH, ZMC_ENGINE_PATH};
    std::sort(libraries.begin(), libraries.end());
    int orders = 0;
    do {
        for (const bool reverse : {false, true}) {
            std::vector<std::string> command = {ZMC_LOAD_ORDER_PROBE};
            command.insert(command.end(), libraries.begin(), libraries.end());
            if (reverse) command.push_back("reverse");
            const auto result = zmctest::RunChild(command);
            EXPECT_EQ(result.status, 0) << libraries[0] << libraries[1] << result.err;
            EXPECT_EQ(result.out, "done\n");
            ++orders;
        }
    } while (std::next_permutation(libraries.begin(), libraries.end()));
    EXPECT_EQ(orders, 12);
}

}  // namespace
