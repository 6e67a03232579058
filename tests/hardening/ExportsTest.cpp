// The names that others can bind to in the engine, the loader and the plug-in: their few, and no
// inline code of the standard library.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/support/ElfFile.h"

namespace {

using ::testing::HasSubstr;
using ::testing::UnorderedElementsAre;

TEST(Exports, OfTheEngineAreItsFourEntryPoints) {
    EXPECT_THAT(support::ElfFile(ZMC_ENGINE_BINARY).DefinedNames(),
                UnorderedElementsAre("Esri_Pe_Initialize", "Esri_Pe_CreateFromString",
                                     "Esri_Pe_CreateFromCode", "Esri_Pe_Release"));
}

TEST(Exports, OfTheLoaderAreItsFourFunctions) {
    EXPECT_THAT(support::ElfFile(ZMC_LOADER_BINARY).DefinedNames(),
                UnorderedElementsAre(HasSubstr("FindModule"), HasSubstr("OpenModule"),
                                     HasSubstr("CloseModule"), HasSubstr("StartXerces")));
}

#ifdef ZMC_PLUGIN_BINARY
TEST(Exports, OfThePlugInAreTheFunctionThatGdalCalls) {
    EXPECT_THAT(support::ElfFile(ZMC_PLUGIN_BINARY).DefinedNames(),
                UnorderedElementsAre("GDALRegister_ZMCPyramid"));
}
#endif

}  // namespace
