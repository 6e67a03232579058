// The names that others can bind to in the engine, the loader, the plug-in and the library of
// sources: their few, and no inline code of the standard library.
#include <cxxabi.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <memory>
#include <regex>
#include <set>
#include <string>

#include "tests/support/ElfFile.h"

namespace {

using ::testing::HasSubstr;
using ::testing::UnorderedElementsAre;

TEST(Exports, OfTheEngineAreItsFourEntryPoints) {
    EXPECT_THAT(zmctest::ElfFile(ZMC_ENGINE_BINARY).DefinedNames(),
                UnorderedElementsAre("Esri_Pe_Initialize", "Esri_Pe_CreateFromString",
                                     "Esri_Pe_CreateFromCode", "Esri_Pe_Release"));
}

TEST(Exports, OfTheLoaderAreItsFourFunctions) {
    EXPECT_THAT(zmctest::ElfFile(ZMC_LOADER_BINARY).DefinedNames(),
                UnorderedElementsAre(HasSubstr("FindModule"), HasSubstr("OpenModule"),
                                     HasSubstr("CloseModule"), HasSubstr("StartXerces")));
}

std::string Readable(const std::string& name) {
    int status = 0;
    const std::unique_ptr<char, void (*)(void*)> text(
        abi::__cxa_demangle(name.c_str(), nullptr, nullptr, &status), std::free);
    return status == 0 ? text.get() : name;
}

// Classes with their members, and functions, by what stands behind the name of the room.
TEST(Exports, OfTheLibraryOfSourcesAreTheClassesAndFunctionsOfItsHeaders) {
    const std::regex ours("(?:(?:vtable|typeinfo|typeinfo name) for )?zelm::files::(\\w+)(.*)");
    std::set<std::string> owners, members;
    for (const std::string& name : zmctest::ElfFile(ZMC_FILES_BINARY).DefinedNames()) {
        const std::string text = Readable(name);
        std::smatch parts;
        ASSERT_TRUE(std::regex_match(text, parts, ours)) << text;
        owners.insert(parts[1]);
        members.insert(text);
        EXPECT_EQ(text.find("Border"), std::string::npos) << "that is between the faces";
    }
    EXPECT_THAT(owners, UnorderedElementsAre("ByteSource", "FileSource", "MemorySource",
                                             "RecordingSource", "LentName", "Lend", "FindLent",
                                             "LooksLent", "OpenSource", "RemoveSource"));
    // What a class derived elsewhere, and whoever uses it, binds to.
    EXPECT_THAT(members, testing::IsSupersetOf({"vtable for zelm::files::ByteSource",
                                                "typeinfo for zelm::files::ByteSource",
                                                "zelm::files::ByteSource::~ByteSource()",
                                                "zelm::files::ByteSource::Size() const"}));
}

#ifdef ZMC_PLUGIN_BINARY
TEST(Exports, OfThePlugInAreTheFunctionThatGdalCalls) {
    EXPECT_THAT(zmctest::ElfFile(ZMC_PLUGIN_BINARY).DefinedNames(),
                UnorderedElementsAre("GDALRegister_ZMCPyramid"));
}
#endif

}  // namespace
