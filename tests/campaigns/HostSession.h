// What hosts do with pyramid files, in one go and without looking at the answers, so that it can be
// interrupted anywhere; and what may be in the file afterwards.
#ifndef ZMC_TESTS_CAMPAIGNS_HOSTSESSION_H
#define ZMC_TESTS_CAMPAIGNS_HOSTSESSION_H

#include <cstdint>
#include <map>
#include <ostream>
#include <string>
#include <vector>

#include "files/ByteSource.h"
#include "files/Lending.h"
#include "host/raster/Module.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {

struct Layout {
    const char* name;
    std::uint32_t bands;
    std::uint32_t tileLines;  // of the properties that the file is made from
    bool lent = false;        // the module gets the file from a source, not by its name
};
// For the names of tests.
inline void PrintTo(const Layout& layout, std::ostream* out) { *out << layout.name; }

inline constexpr Layout kLayouts[] = {{"Scanline", 2, 1}, {"Blocked", 2, 256}, {"Morton", 9, 256}};
inline constexpr Layout kLentLayouts[] = {
    {"LentScanline", 2, 1, true}, {"LentBlocked", 2, 256, true}, {"LentMorton", 9, 256, true}};

// Stores of a session, as bits.
enum Stores : unsigned { kStatistics = 1, kHistograms = 2, kPalette = 4, kAllStores = 7 };

class HostSession {
public:
    static constexpr std::uint32_t kSamples = 260, kLines = 258;

    explicit HostSession(const Layout& layout);

    const std::string& Path() const { return path; }
    const std::string& Folder() const { return folderName; }
    // The files before and after an Update, and after a Create, that nothing went wrong in.
    const std::string& OldFile() const { return oldFile; }
    const std::string& NewFile() const { return newFile; }
    const std::string& CreatedFile() const { return createdFile; }
    void Put(const std::string& bytes) const { zmctest::WriteText(path, bytes); }
    std::string Take() const { return zmctest::ReadText(path); }

    // Opens the file, reads all tiles, writes one, stores, fetches, refreshes.
    void Update(unsigned stores = kAllStores) const;
    // Makes the file, writes all tiles, stores, refreshes.
    void Create() const;
    // Opens the file and deletes it.
    void Delete() const;

    // Calls of readers that an exception came out of, since the last question.
    std::size_t TakeThrows() const;

    // What is wrong with the file after an Update that was interrupted anywhere; empty if nothing
    // is. `outcome` becomes "old", "new", "part" (of the stores) or "damaged", by its document.
    std::string FaultAfterUpdate(std::string& outcome) const;
    // After a Create: "absent", "unfinished", "complete".
    std::string FaultAfterCreate(std::string& outcome) const;

private:
    // How the module comes to the file, for one piece of work: its name, or that of a loan, which
    // is nobody's where the source does not open.
    struct Way {
        Way(const HostSession& session, zelm::files::OpenMode mode);
        std::string name;
        zelm::files::LentName lent;
    };
    std::string DocumentOf(const std::string& file) const;
    bool TellsOfRecords() const;

    Layout layout;
    zmchost::ModulePtr module;
    zmctest::ScratchDirectory folder;
    std::string folderName, path;
    std::uint64_t documentOffset = 0;
    std::string oldFile, newFile, createdFile;
    std::map<std::string, unsigned> documents;  // what each set of stores makes
};

// Descriptors that this process holds open.
std::size_t OpenDescriptors();

// "old 3, new 4" of counted outcomes.
std::string Figures(const std::map<std::string, std::size_t>& outcomes);

}  // namespace zmctest

#endif
