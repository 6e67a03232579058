// One file put before the module, as a host would, and its answers against FileOracle's.
//
// A file reaches the module by its name, or from a source that is lent. The short form takes one of
// the two ways for each file, which goes by its bytes; the full form takes both.
#ifndef ZMC_TESTS_CAMPAIGNS_FILETRIAL_H
#define ZMC_TESTS_CAMPAIGNS_FILETRIAL_H

#include <string>

#include "connection/DataConnectionFactory.h"
#include "files/Lending.h"
#include "tests/campaigns/AnyReader.h"
#include "tests/campaigns/Campaign.h"
#include "tests/campaigns/FileOracle.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {

// The module by its two exported functions. It stays loaded.
class LoadedModule {
public:
    LoadedModule();
    ~LoadedModule();
    LoadedModule(const LoadedModule&) = delete;
    LoadedModule& operator=(const LoadedModule&) = delete;
    zelm::DataConnectionPtr Open(const std::string& path) const;

private:
    zelm::DataConnectionFactory* factory = nullptr;
    void (*destroy)(zelm::DataConnectionFactory*) = nullptr;
};

class FileTrial {
public:
    struct Depth {
        bool pixels = true;   // read all levels
        bool records = true;  // fetch statistics, histograms and palettes
        bool tables = false;  // with any table of tile offsets that the limits allow
        bool stores = true;   // store records, refresh, write a tile; then look at the whole again
    };

    FileTrial();
    ~FileTrial();
    FileTrial(const FileTrial&) = delete;
    FileTrial& operator=(const FileTrial&) = delete;

    Verdict Try(const Bytes& file, const Depth& depth);

private:
    struct Session;  // a connection with its reader
    Verdict TryOnce(const Bytes& file, const Depth& depth);
    void Put(const Bytes& file);
    Bytes Take() const;
    void Look(const FileOracle& oracle, const Depth& depth, Verdict& verdict);
    void LookAtFields(const FileOracle& oracle, Session& session, Verdict& verdict);
    void LookAtPixels(const FileOracle& oracle, Session& session, Verdict& verdict);
    void LookAtRect(const FileOracle& oracle, Session& session, Verdict& verdict, const Rect& rect,
                    const std::vector<int>& list, std::int32_t level);
    void LookAtLevel(const FileOracle& oracle, Session& session, Verdict& verdict,
                     std::uint32_t level);
    void LookAtRecords(const FileOracle& oracle, Session& session, Verdict& verdict);
    void Store(const Bytes& before, const FileOracle& oracle, Verdict& verdict);
    void StoreFar(const Bytes& before, Session& session, Verdict& verdict);
    void WriteTile(const Bytes& before, const FileOracle& oracle, Verdict& verdict);

    LoadedModule module;
    zmctest::ScratchDirectory folder;
    std::string path;
    zelm::files::LentName lent;
    std::string name;  // what the module opens: `path`, or the name of the loan
    int descriptor = -1;
};

}  // namespace zmctest

#endif
