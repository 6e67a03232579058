// A binary of 64 bits as it lies on disk: its segments, its dynamic section and its names.
//
// Everything is read from the file itself, so that a test sees what is shipped and not what was
// asked for. What lies outside the file reads as zeros.
#ifndef ZMC_TESTS_SUPPORT_ELFFILE_H
#define ZMC_TESTS_SUPPORT_ELFFILE_H

#include <elf.h>

#include <cstring>
#include <string>
#include <vector>

#include "tests/support/ScratchDirectory.h"

namespace zmctest {

class ElfFile {
public:
    explicit ElfFile(const char* path) : bytes(ReadText(path)) {}

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

    Elf64_Ehdr Header() const { return At<Elf64_Ehdr>(0); }

    std::vector<Elf64_Phdr> Segments() const {
        return Table<Elf64_Phdr>(Header().e_phoff, Header().e_phnum * sizeof(Elf64_Phdr));
    }

    std::vector<Elf64_Shdr> Sections() const {
        return Table<Elf64_Shdr>(Header().e_shoff, Header().e_shnum * sizeof(Elf64_Shdr));
    }

    // The bytes of a section by its name; empty if there is none.
    std::string SectionBytes(const std::string& name) const {
        const Elf64_Shdr section = SectionNamed(name);
        return section.sh_offset < bytes.size() ? bytes.substr(section.sh_offset, section.sh_size)
                                                : std::string();
    }

    Elf64_Shdr SectionNamed(const std::string& name) const {
        const std::size_t names = Sections().at(Header().e_shstrndx).sh_offset;
        for (const Elf64_Shdr& section : Sections())
            if (Text(names + section.sh_name) == name) return section;
        return {};
    }

    // The values of the dynamic section with this tag.
    std::vector<Elf64_Xword> Dynamic(Elf64_Sxword tag) const {
        std::vector<Elf64_Xword> values;
        for (const Elf64_Shdr& section : Sections()) {
            if (section.sh_type != SHT_DYNAMIC) continue;
            for (const auto& entry : Table<Elf64_Dyn>(section.sh_offset, section.sh_size))
                if (entry.d_tag == tag) values.push_back(entry.d_un.d_val);
        }
        return values;
    }

    // Names that others can bind to.
    std::vector<std::string> DefinedNames() const { return Names(true); }

    // Names that the binary finds elsewhere.
    std::vector<std::string> UndefinedNames() const { return Names(false); }

    // Addresses of the functions that others can bind to.
    std::vector<Elf64_Addr> DefinedFunctions() const {
        std::vector<Elf64_Addr> addresses;
        for (const Elf64_Sym& symbol : DynamicSymbols())
            if (symbol.st_shndx != SHN_UNDEF && ELF64_ST_TYPE(symbol.st_info) == STT_FUNC)
                addresses.push_back(symbol.st_value);
        return addresses;
    }

    // The addresses within the binary that lie in its data, to be filled in when it is loaded.
    std::vector<Elf64_Addr> AddressesInData() const {
        std::vector<Elf64_Addr> addresses;
        for (const Elf64_Shdr& section : Sections()) {
            if (section.sh_type != SHT_RELA) continue;
            for (const auto& entry : Table<Elf64_Rela>(section.sh_offset, section.sh_size))
                if (ELF64_R_TYPE(entry.r_info) == R_X86_64_RELATIVE)
                    addresses.push_back(static_cast<Elf64_Addr>(entry.r_addend));
        }
        return addresses;
    }

private:
    template <class Record>
    std::vector<Record> Table(std::size_t offset, std::size_t size) const {
        std::vector<Record> records;
        for (std::size_t at = 0; at + sizeof(Record) <= size; at += sizeof(Record))
            records.push_back(At<Record>(offset + at));
        return records;
    }

    std::string Text(std::size_t offset) const {
        return offset < bytes.size() ? std::string(bytes.data() + offset) : std::string();
    }

    std::vector<Elf64_Sym> DynamicSymbols() const {
        const Elf64_Shdr section = SectionNamed(".dynsym");
        return Table<Elf64_Sym>(section.sh_offset, section.sh_size);
    }

    std::vector<std::string> Names(bool defined) const {
        std::vector<std::string> names;
        const std::size_t texts = SectionNamed(".dynstr").sh_offset;
        for (const Elf64_Sym& symbol : DynamicSymbols())
            if ((symbol.st_shndx != SHN_UNDEF) == defined &&
                ELF64_ST_BIND(symbol.st_info) != STB_LOCAL)
                names.push_back(Text(texts + symbol.st_name));
        return names;
    }

    std::string bytes;
};

}  // namespace zmctest

#endif  // ZMC_TESTS_SUPPORT_ELFFILE_H
