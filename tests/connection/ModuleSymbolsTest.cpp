// The module's table of dynamic symbols, read from the file itself.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/support/ElfFile.h"

namespace {

TEST(ModuleSymbols, AreExactlyTheTwoFunctions) {
    const zmctest::ElfFile module(ZMC_MODULE_PATH);
    ASSERT_TRUE(module.IsElf());
    EXPECT_THAT(module.DefinedNames(),
                ::testing::UnorderedElementsAre("CreateDataConnectionFactory",
                                                "DeleteDataConnectionFactory"));
}

}  // namespace
