// The module's table of dynamic symbols, read from the file itself.
#include <elf.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "tests/support/ScratchDirectory.h"

namespace {

class ElfFile {
public:
    explicit ElfFile(const char* path) : bytes(support::ReadText(path)) {}

    bool IsElf() const {
        return bytes.size() > sizeof(Elf64_Ehdr) && std::memcmp(bytes.data(), ELFMAG, SELFMAG) == 0;
    }

    template <class Record>
    Record At(std::size_t offset) const {
        Record record{};
        if (offset + sizeof record <= bytes.size())
            std::memcpy(&record, bytes.data() + offset, sizeof record);
        return record;
    }

    Elf64_Shdr Section(std::size_t index) const {
        return At<Elf64_Shdr>(At<Elf64_Ehdr>(0).e_shoff + index * sizeof(Elf64_Shdr));
    }

    std::string Text(std::size_t offset) const {
        return offset < bytes.size() ? std::string(bytes.data() + offset) : std::string();
    }

    // Names that others can bind to.
    std::vector<std::string> DefinedNames() const {
        std::vector<std::string> names;
        for (std::size_t i = 0; i < At<Elf64_Ehdr>(0).e_shnum; ++i) {
            const Elf64_Shdr table = Section(i);
            if (table.sh_type != SHT_DYNSYM) continue;
            const std::size_t texts = Section(table.sh_link).sh_offset;
            for (std::size_t at = 0; at < table.sh_size; at += sizeof(Elf64_Sym)) {
                const auto symbol = At<Elf64_Sym>(table.sh_offset + at);
                if (symbol.st_shndx != SHN_UNDEF && ELF64_ST_BIND(symbol.st_info) != STB_LOCAL)
                    names.push_back(Text(texts + symbol.st_name));
            }
        }
        return names;
    }

private:
    std::string bytes;
};

TEST(ModuleSymbols, AreExactlyTheTwoFunctions) {
    const ElfFile module(ZMC_MODULE_PATH);
    ASSERT_TRUE(module.IsElf());
    EXPECT_THAT(module.DefinedNames(),
                ::testing::UnorderedElementsAre("CreateDataConnectionFactory",
                                                "DeleteDataConnectionFactory"));
}

}  // namespace
