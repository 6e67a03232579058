// The checks of a release build, read back from the binaries that are shipped.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <ostream>
#include <string>

#include "tests/support/ElfFile.h"

namespace {

using ::testing::Contains;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::IsSupersetOf;

struct Shipped {
    const char* name;
    const char* path;
    bool program;
};

void PrintTo(const Shipped& shipped, std::ostream* out) { *out << shipped.name; }

class Hardening : public ::testing::TestWithParam<Shipped> {
protected:
    void SetUp() override {
#ifndef ZMC_HARDENED
        GTEST_SKIP() << "not a hardened build";
#endif
        ASSERT_TRUE(binary.IsElf()) << GetParam().path;
    }

    std::vector<Elf64_Phdr> Segments(Elf64_Word type) const {
        std::vector<Elf64_Phdr> found;
        for (const Elf64_Phdr& segment : binary.Segments())
            if (segment.p_type == type) found.push_back(segment);
        return found;
    }

    bool HasFlag(Elf64_Sxword tag, Elf64_Xword flag) const {
        const auto values = binary.Dynamic(tag);
        return std::any_of(values.begin(), values.end(),
                           [flag](Elf64_Xword value) { return (value & flag) != 0; });
    }

    const zmctest::ElfFile binary{GetParam().path};
};

// All names are bound before the first line runs, and the table of them is read-only from then on.
TEST_P(Hardening, BindsEarlyAndLocksTheTables) {
    EXPECT_EQ(Segments(PT_GNU_RELRO).size(), 1U);
    EXPECT_TRUE(HasFlag(DT_FLAGS, DF_BIND_NOW));
    EXPECT_TRUE(HasFlag(DT_FLAGS_1, DF_1_NOW));
    EXPECT_THAT(binary.Dynamic(DT_TEXTREL), IsEmpty());
}

TEST_P(Hardening, NothingIsWritableAndExecutable) {
    const auto stacks = Segments(PT_GNU_STACK);
    ASSERT_EQ(stacks.size(), 1U);
    EXPECT_EQ(stacks[0].p_flags & PF_X, 0U);
    for (const Elf64_Phdr& segment : Segments(PT_LOAD))
        EXPECT_FALSE((segment.p_flags & PF_W) != 0 && (segment.p_flags & PF_X) != 0);
}

TEST_P(Hardening, CanLieAnywhere) {
    EXPECT_EQ(binary.Header().e_type, ET_DYN);
    EXPECT_EQ(HasFlag(DT_FLAGS_1, DF_1_PIE), GetParam().program);
}

TEST_P(Hardening, GuardsTheStack) {
    EXPECT_THAT(binary.UndefinedNames(), Contains("__stack_chk_fail"));
}

// A frame of more than a page is taken page by page, each touched, so that none leaps over the
// guard page: no instruction takes more than a page from the stack pointer at once.
TEST_P(Hardening, TouchesEachPageOfTheStack) {
    const std::string code = binary.SectionBytes(".text");
    const std::string subtract("\x48\x81\xec", 3);  // sub $imm32, %rsp
    constexpr std::uint32_t page = 4096, most = 1U << 24;
    for (std::size_t at = code.find(subtract); at != std::string::npos;
         at = code.find(subtract, at + 1)) {
        std::uint32_t size = 0;
        if (at + 7 <= code.size()) std::memcpy(&size, code.data() + at + 3, sizeof size);
        // Larger numbers are bytes of something else that look alike.
        if (size >= most) continue;
        EXPECT_LE(size, page) << "at " << at;
    }
}

TEST_P(Hardening, ChecksTheStandardLibrary) {
    EXPECT_THAT(binary.UndefinedNames(), Contains(HasSubstr("__glibcxx_assert_fail")));
}

// Where control may arrive indirectly, there is a mark. The note that asks the loader to insist on
// marks is absent: the start-up objects of the C library lack theirs, and one object without the
// note takes it from the whole. So the marks themselves are looked at: every address of code that
// lies in data, as in the tables of virtual functions, leads to one, and so does every function
// that others can bind to.
TEST_P(Hardening, MarksTheTargetsOfIndirectCalls) {
    const Elf64_Shdr text = binary.SectionNamed(".text");
    const std::string code = binary.SectionBytes(".text");
    const std::string mark("\xf3\x0f\x1e\xfa", 4);  // endbr64
    auto addresses = binary.AddressesInData();
    const auto functions = binary.DefinedFunctions();
    addresses.insert(addresses.end(), functions.begin(), functions.end());
    std::size_t targets = 0;
    for (const Elf64_Addr address : addresses) {
        if (address < text.sh_addr || address >= text.sh_addr + text.sh_size) continue;
        ++targets;
        EXPECT_EQ(code.substr(address - text.sh_addr, mark.size()), mark) << std::hex << address;
    }
    // Two are of the compiler's start-up objects, which are there in any case.
    EXPECT_GT(targets, 2U);
}

// Those that format text or copy wide text, for which the C library has checking twins.
class HardeningOfTextWork : public Hardening {};

TEST_P(HardeningOfTextWork, CallsTheCheckingFunctionsOfTheCLibrary) {
    EXPECT_THAT(binary.UndefinedNames(), IsSupersetOf({"__snprintf_chk", "__wmemcpy_chk"}));
}

const Shipped textWorkers[]{
#ifdef ZMC_PLUGIN_BINARY
    {"Plugin", ZMC_PLUGIN_BINARY, false},
#endif
#ifdef ZMC_COMMAND_BINARY
    {"Command", ZMC_COMMAND_BINARY, true},
#endif
    {"Module", ZMC_MODULE_BINARY, false},
};
const Shipped others[]{
    {"Sibling", ZMC_ZMCG_BINARY, false},
    {"Engine", ZMC_ENGINE_BINARY, false},
    {"Loader", ZMC_LOADER_BINARY, false},
    {"Files", ZMC_FILES_BINARY, false},
};

std::string NameOf(const ::testing::TestParamInfo<Shipped>& instance) {
    return instance.param.name;
}
INSTANTIATE_TEST_SUITE_P(TextWorkers, Hardening, ::testing::ValuesIn(textWorkers), NameOf);
INSTANTIATE_TEST_SUITE_P(Others, Hardening, ::testing::ValuesIn(others), NameOf);
INSTANTIATE_TEST_SUITE_P(, HardeningOfTextWork, ::testing::ValuesIn(textWorkers), NameOf);

}  // namespace
