// Stores through the dataset, on files whose operations fail.
#include <gtest/gtest.h>

#include <cerrno>

#include "pyramid/PyramidDataset.h"
#include "tests/support/FileFaults.h"
#include "tests/support/PyramidFiles.h"
#include "tests/support/ScratchDirectory.h"

namespace zmctest {

using namespace zelm;
namespace {

class StoreFaultsTest : public ::testing::Test {
protected:
    StoreFaultsTest() {
        zmctest::WriteText(name, HeaderText().File());
        Store(*Open(), 0);
        before = zmctest::ReadText(name);
        Store(*Open(), 1);
        after = zmctest::ReadText(name);
    }

    std::unique_ptr<PyramidDataset> Open() {
        auto dataset = std::make_unique<PyramidDataset>(String(name.c_str()));
        return dataset->ReadHeader() ? nullptr : std::move(dataset);
    }
    static void Store(PyramidDataset& dataset, std::uint32_t band) {
        RasterBandStats<unsigned char> stats;
        stats.band = band;
        Array<RasterBandStats<unsigned char>> records;
        records.Append(stats);
        dataset.SetBandStats(records);
    }

    zmctest::ScratchDirectory folder;
    std::string name = folder / "store.pyr";
    std::string before, after;
};

// A size that cannot be told is none of an empty file: nothing is cut, and no document replaced by
// one that knows nothing of it.
TEST_F(StoreFaultsTest, OneCallThatFailsLosesNothing) {
    for (const FileFaultAction action :
         {FileFaultAction::Error, FileFaultAction::Short, FileFaultAction::Nothing}) {
        std::size_t n = 1;
        for (bool reached = true; reached; ++n) {
            SCOPED_TRACE(n);
            zmctest::WriteText(name, before);
            {
                FileFault fault;
                fault.folder = folder.String();
                fault.n = n;
                fault.action = action;
                fault.error = EIO;
                const FileFaults faults(fault);
                if (const auto dataset = Open()) Store(*dataset, 1);
                reached = faults.Failed() != 0;
            }
            const std::string now = zmctest::ReadText(name);
            EXPECT_TRUE(now == before || now == after) << now.substr(HeaderText().File().size());
        }
        EXPECT_GT(n, 12u);
    }
}

}  // namespace
}  // namespace zmctest
