// The host's side while memory is out: it throws std::bad_alloc or does what was asked; it says
// nothing about its input that is not so.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <new>
#include <optional>

#include "host/base/Error.h"
#include "host/base/Text.h"
#include "host/build/Strip.h"
#include "host/file/MetadataDocument.h"
#include "host/raster/Raster.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zmctest::AllocationFaults;
using zmctest::FaultMode;
using zmctest::FaultScope;
using zmctest::ForEachAllocationFailing;

// The result of `call`; none if there was no memory for it. Whatever else is thrown fails the test.
template <class Call>
auto ResultOf(AllocationFaults& faults, Call&& call) -> std::optional<decltype(call())> {
    try {
        std::optional<decltype(call())> result(call());
        faults.Disarm();
        return result;
    } catch (const std::bad_alloc&) {
        faults.Disarm();
    } catch (const std::exception& error) {
        faults.Disarm();
        ADD_FAILURE() << "thrown: " << error.what();
    } catch (...) {
        faults.Disarm();
        ADD_FAILURE() << "something else was thrown";
    }
    return std::nullopt;
}

TEST(HostFaults, StripsComeBackWithoutMemory) {
    MemoryMeter meter;
    StripStore store(meter, 0, 2, 1024, 1, 0);
    std::vector<StripStore::Loan> loans;
    std::vector<const Strip*> lent;
    for (int i = 0; i < 9; ++i) {
        loans.push_back(store.Take(1));
        lent.push_back(loans.back().get());
    }
    const std::uint64_t peak = meter.Peak();
    AllocationFaults faults(1, FaultMode::FromThenOn);
    for (auto& loan : loans) loan.reset();
    const std::size_t failed = faults.Failed();
    faults.Disarm();
    EXPECT_EQ(failed, 0u);
    // None was lost: the same ones are lent again.
    for (auto& loan : loans) {
        loan = store.Take(1);
        EXPECT_THAT(lent, testing::Contains(loan.get()));
    }
    EXPECT_EQ(meter.Peak(), peak);
}

TEST(HostFaults, AStoreOfStripsOutlivesAFailureToLend) {
    ForEachAllocationFailing([](AllocationFaults& faults) {
        faults.Disarm();
        MemoryMeter meter;
        StripStore store(meter, 0, 0, 64, 2, 1);
        const auto first = store.Take(0);
        faults.Rearm();
        const auto second = ResultOf(faults, [&] { return store.Take(0); });
        if (second) {
            EXPECT_NE(second->get(), first.get());
        }
    });
}

TEST(HostFaults, AValidNameIsNotCalledInvalid) {
    const auto thereAndBack = [](AllocationFaults& faults, const std::string& name) {
        const zelm::String wide = WideFileName(name);
        faults.Disarm();
        return Narrow(wide);
    };
    for (const std::string name : {"a.zmc", "/a/rather/long/folder/and/a/long/n\xC3\xA4me.zmc"}) {
        const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
            const auto text = ResultOf(faults, [&] { return thereAndBack(faults, name); });
            if (text) {
                EXPECT_EQ(*text, name);
            }
        });
        EXPECT_GT(points, 0u);
    }
}

TEST(HostFaults, DocumentsAreJudgedTrulyOrNotAtAll) {
    const std::string good = "<?xml version='1.0' encoding='UTF-8'?><DATASET><A>1</A></DATASET>\n";
    ASSERT_EQ(JudgeMetadataText(good), "");
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        const auto judged = ResultOf(faults, [&] { return JudgeMetadataText(good); });
        if (judged) {
            EXPECT_EQ(*judged, "");
        }
    });
    for (const std::string bad :
         {"<DATASET>", "<ROOT/>", "<!DOCTYPE a><DATASET/>", "\x1A<DATASET/>"})
        ForEachAllocationFailing([&](AllocationFaults& faults) {
            const auto judged = ResultOf(faults, [&] { return JudgeMetadataText(bad); });
            if (judged) {
                EXPECT_NE(*judged, "");
            }
        });
}

class HistogramFaults : public testing::Test {
protected:
    using Record = zelm::RasterBandHistogram<unsigned char>;

    HistogramFaults() {
        const zmctest::MemorySource<unsigned char> source(20, 10, 2);
        Raster raster = Raster::Create(zmctest::TestModule(), file, source.props, 0);
        raster.Write<unsigned char>(0, {0, 0, 20, 10}, std::vector<unsigned char>(400, 7));
        before = zmctest::ReadText(file);
        for (std::uint32_t band = 0; band < 2; ++band) {
            Record record;
            record.band = band;
            record.binCount = 3;
            for (const std::uint64_t count : {100u, 60u, 40u}) record.counts.Append(count + band);
            records.push_back(record);
        }
    }

    // What a reader finds in the file, by band.
    std::vector<std::vector<std::uint64_t>> Stored() const {
        std::vector<std::vector<std::uint64_t>> lists;
        const Raster raster = Raster::Open(zmctest::TestModule(), file);
        for (const Record& record : raster.Histograms<unsigned char>())
            lists.emplace_back(record.counts.data,
                               record.counts.data + record.counts.shape.elements);
        return lists;
    }

    const zmctest::ScratchDirectory folder;
    const std::string file = folder / "a.zmc";
    std::string before;
    std::vector<Record> records;
};

// Either they are all there, or the caller learns that they are not; zeros are never stored for
// counts that could not be copied.
TEST_F(HistogramFaults, CountsAreStoredOrTheCallFails) {
    const std::vector<std::vector<std::uint64_t>> all = {{100, 60, 40}, {101, 61, 41}};
    std::size_t stored = 0, points = 0;
    for (const FaultMode mode : {FaultMode::Once, FaultMode::FromThenOn}) {
        bool reached = true;
        for (std::size_t n = 1; reached; n += mode == FaultMode::Once ? 1 : 7) {
            SCOPED_TRACE(n);
            zmctest::WriteText(file, before);
            auto raster = std::make_optional(Raster::Open(zmctest::TestModule(), file));
            bool told = false;
            AllocationFaults faults(n, mode, FaultScope::Process);
            try {
                raster->SetHistograms<unsigned char>(records);
            } catch (const std::bad_alloc&) {
                told = true;
            } catch (const Error&) {
                told = true;
            }
            faults.Disarm();
            reached = faults.Failed() != 0;
            raster.reset();
            points += reached;
            stored += !told;
            if (told)
                EXPECT_THAT(Stored(), testing::AnyOf(testing::IsEmpty(), all));
            else
                EXPECT_EQ(Stored(), all);
        }
    }
    EXPECT_GT(points, 20u);
    EXPECT_GT(stored, 0u);
}

}  // namespace
}  // namespace zmchost
