// Datasets on sources that the process lends, good ones and bad ones.
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>
#include <fstream>

#include "files/FileSource.h"
#include "files/Lending.h"
#include "files/MemorySource.h"
#include "files/RecordingSource.h"
#include "tests/support/FaultySource.h"
#include "tests/support/PyramidFileTest.h"

namespace zmctest {
namespace {

using zelm::PyramidDataset;
using zelm::String;
using zelm::files::FileSource;
using zelm::files::Lend;
using zelm::files::LentName;
using zelm::files::MemorySource;
using zelm::files::OpenMode;
using zelm::files::RecordingSource;

class LentFileTest : public PyramidFileTest {
protected:
    static constexpr std::uint32_t kSide = 300;

    LentFileTest() {
        PyramidDescription description;
        description.samples = description.lines = kSide;
        description.bands = 2;
        description.ordering = 1;
        const auto dataset = Create(description);
        image.resize(std::size_t{kSide} * kSide * 2);
        for (std::size_t i = 0; i < image.size(); ++i) image[i] = static_cast<unsigned char>(i * 7);
        FillLevel(*dataset, 0, image);
    }

    MemorySource::Bytes FileBytes() const {
        std::ifstream stream(path, std::ios::binary);
        return {std::istreambuf_iterator<char>(stream), {}};
    }
    std::shared_ptr<MemorySource> InMemory(
        MemorySource::Access access = MemorySource::Access::Writable) const {
        return std::make_shared<MemorySource>(FileBytes(), access);
    }
    // Null if it does not open.
    static std::unique_ptr<PyramidDataset> OpenLent(const LentName& name) {
        auto dataset = std::make_unique<PyramidDataset>(String(name.Text()));
        if (dataset->ReadHeader()) return nullptr;
        return dataset;
    }
    Bytes ReadAll(PyramidDataset& dataset) const {
        return ReadRect(dataset, 0, 0, kSide, kSide, BandList({0, 1}), 0);
    }

    Bytes image;
};

TEST_F(LentFileTest, OpensAndReadsWhereverTheBytesAre) {
    const LentName name = Lend(InMemory());
    std::filesystem::remove(path);
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    EXPECT_TRUE(dataset->HasPyramid);
    EXPECT_TRUE(dataset->Writable);
    EXPECT_EQ(ReadAll(*dataset), image);
    EXPECT_TRUE(dataset->RefreshPyramidState());
    EXPECT_TRUE(dataset->HasPyramid) << "opened a second time";
    EXPECT_EQ(ReadAll(*dataset), image);
}

TEST_F(LentFileTest, ReadOnlySourceIsAReadOnlyFile) {
    const auto source = InMemory(MemorySource::Access::ReadOnly);
    const LentName name = Lend(source);
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    EXPECT_FALSE(dataset->Writable);
    const Bytes pixels(std::size_t{256} * 256 * 2, 1);
    EXPECT_TRUE(WriteBytes(*dataset, 0, 0, 256, 256, BandList({0, 1}), 0, pixels));
    EXPECT_EQ(source->Content(), FileBytes());
    dataset->DeleteFile();
    EXPECT_EQ(source->Content(), FileBytes());
}

TEST_F(LentFileTest, MakesItsFileInTheSource) {
    const auto source = std::make_shared<MemorySource>(MemorySource::Bytes(100, 'x'));
    const LentName name = Lend(source);
    path = name.Utf8();
    PyramidDescription description;
    description.samples = description.lines = kSide;
    description.bands = 2;
    description.ordering = 1;
    const auto made = Create(description);
    ASSERT_TRUE(made->File);
    FillLevel(*made, 0, image);
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    EXPECT_EQ(ReadAll(*dataset), image);
    path = directory / "test.pyr";
    EXPECT_EQ(source->Content(), FileBytes()) << "as a file of the same description";
    EXPECT_FALSE(std::filesystem::exists(name.Utf8()));
}

TEST_F(LentFileTest, RecordsAreStoredInTheSource) {
    const auto source = InMemory();
    const LentName name = Lend(source);
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    zelm::Palette palette;
    EXPECT_TRUE(dataset->SetPalette(1, palette));
    EXPECT_GT(source->Size(), FileBytes().size());
    zelm::Palette out;
    EXPECT_TRUE(OpenLent(name)->LoadPalette<unsigned char>(1, out));
}

TEST_F(LentFileTest, SecondOpeningIsOfTheSameSourceWhateverTheNameOfItsFileMeans) {
    const LentName name = Lend(FileSource::Open(path.c_str(), OpenMode::Read));
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    std::ofstream(directory / "other") << "something else";
    std::filesystem::rename(directory / "other", path);
    dataset->RefreshPyramidState();
    EXPECT_TRUE(dataset->HasPyramid);
    EXPECT_EQ(ReadAll(*dataset), image);
}

TEST_F(LentFileTest, DeletingRemovesWhatTheSourceStandsFor) {
    const LentName name = Lend(FileSource::Open(path.c_str(), OpenMode::Update));
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    dataset->DeleteFile();
    EXPECT_FALSE(std::filesystem::exists(path));
    EXPECT_FALSE(dataset->File);
    EXPECT_FALSE(dataset->HasPyramid);
}

TEST_F(LentFileTest, DeletingLeavesAFileThatTookTheNameMeanwhile) {
    const LentName name = Lend(FileSource::Open(path.c_str(), OpenMode::Update));
    const auto dataset = OpenLent(name);
    std::ofstream(directory / "other") << "something else";
    std::filesystem::rename(directory / "other", path);
    dataset->DeleteFile();
    EXPECT_TRUE(std::filesystem::exists(path));
}

TEST_F(LentFileTest, WithdrawnNameOpensNothingAndWhatIsOpenGoesOn) {
    LentName name = Lend(InMemory());
    const String text(name.Text());
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    name.Withdraw();
    PyramidDataset late(text);
    EXPECT_TRUE(late.ReadHeader()) << "true is failure";
    late.CreateFile(0, 0);
    EXPECT_FALSE(late.File);
    late.DeleteFile();
    EXPECT_EQ(ReadAll(*dataset), image);
    EXPECT_TRUE(dataset->RefreshPyramidState());
    EXPECT_FALSE(dataset->HasPyramid) << "the second opening finds nothing";
    EXPECT_FALSE(dataset->File);
    Bytes pixels(std::size_t{kSide} * kSide * 2, 9);
    EXPECT_TRUE(ReadBytes(*dataset, 0, 0, kSide, kSide, BandList({0, 1}), 0, pixels));
    EXPECT_EQ(pixels, Bytes(pixels.size(), 9));
}

TEST_F(LentFileTest, WithdrawnInTheMiddleOfAReadHarmsNobody) {
    auto source = std::make_shared<FaultySource>(InMemory());
    LentName name = Lend(source);
    const std::weak_ptr<FaultySource> watched = source;
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    source->beforeTransfer = [&name](std::size_t) { name.Withdraw(); };
    source.reset();
    EXPECT_EQ(ReadAll(*dataset), image);
    EXPECT_FALSE(watched.expired()) << "the dataset holds it";
    dataset->RefreshPyramidState();
    EXPECT_TRUE(watched.expired());
}

TEST_F(LentFileTest, TwoDatasetsShareOneSource) {
    const auto source = InMemory();
    const LentName name = Lend(source), again = Lend(source);
    const auto first = OpenLent(name), second = OpenLent(name), third = OpenLent(again);
    ASSERT_TRUE(first && second && third);
    const Bytes pixels(std::size_t{256} * 256 * 2, 1);
    EXPECT_TRUE(WriteBytes(*first, 0, 0, 256, 256, BandList({0, 1}), 0, pixels));
    for (PyramidDataset* each : {second.get(), third.get()})
        EXPECT_EQ(ReadRect(*each, 0, 0, 256, 256, BandList({0, 1}), 0), pixels);
}

// --- sources that misbehave ---

TEST_F(LentFileTest, SizeThatIsALieIsRefusedOrReadAsFarAsItGoes) {
    const auto source = std::make_shared<FaultySource>(InMemory());
    const LentName name = Lend(source);
    const std::uint64_t truth = FileBytes().size();
    for (const std::uint64_t claimed :
         {std::uint64_t{0}, std::uint64_t{10}, truth / 2, truth - 1, truth + 1, truth * 1000,
          zelm::files::ByteSource::kUnknownSize - 1, zelm::files::ByteSource::kUnknownSize}) {
        SCOPED_TRACE(claimed);
        source->claimedSize = claimed;
        const auto dataset = OpenLent(name);
        const bool told = claimed != zelm::files::ByteSource::kUnknownSize;
        EXPECT_EQ(dataset != nullptr, told && claimed > 1000);
        if (!dataset) continue;
        EXPECT_EQ(dataset->HasPyramid, claimed >= truth);
        EXPECT_EQ(ReadAll(*dataset), image);
        zelm::Palette palette;
        dataset->SetPalette(0, palette);
        source->claimedSize.reset();
        EXPECT_EQ(ReadAll(*dataset), image) << "tiles are not touched by a store";
    }
}

TEST_F(LentFileTest, SourceThatShrinksReadsAsZerosBehindItsEnd) {
    const auto source = InMemory();
    const LentName name = Lend(source);
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    ASSERT_TRUE(source->Truncate(dataset->TileDataStart));
    EXPECT_EQ(ReadAll(*dataset), Bytes(image.size(), 0));
    dataset->RefreshPyramidState();
    EXPECT_FALSE(dataset->HasPyramid);
    ASSERT_TRUE(source->Truncate(3));
    EXPECT_EQ(ReadAll(*dataset), Bytes(image.size(), 0));
    EXPECT_FALSE(OpenLent(name));
}

// Whichever transfer it is: the pixels of before or zeros, and the answers of a file.
TEST_F(LentFileTest, TransferThatGoesWrongIsZerosAndInTheRecord) {
    for (const SourceFault fault :
         {SourceFault::Fails, SourceFault::FailsPartway, SourceFault::AnswersTooMuch,
          SourceFault::AnswersNothing, SourceFault::RunsOutOfMemory, SourceFault::Throws,
          SourceFault::ThrowsANumber}) {
        std::size_t met = 0;
        for (std::size_t n = 1; n < 100; ++n) {
            const auto faulty = std::make_shared<FaultySource>(InMemory());
            const auto recording = std::make_shared<RecordingSource>(faulty);
            const LentName name = Lend(recording);
            faulty->n = n;
            faulty->fault = fault;
            const auto dataset = OpenLent(name);
            const bool opened = dataset != nullptr;
            if (recording->Take().Failures() != 0) {
                ++met;
                continue;
            }
            ASSERT_TRUE(opened);
            if (faulty->Transfers() >= n) continue;  // got over
            const Bytes read = ReadAll(*dataset);
            const zelm::files::FailureRecord record = recording->Take();
            if (record.Failures() == 0) {
                EXPECT_EQ(read, image);
                if (faulty->Transfers() < n) break;
                continue;
            }
            ++met;
            EXPECT_EQ(record.first->operation, zelm::files::Operation::Read);
            EXPECT_NE(record.first->error, 0);
            for (std::size_t i = 0; i < read.size(); ++i)
                ASSERT_TRUE(read[i] == image[i] || read[i] == 0) << i;
        }
        // One that gives nothing where there is more is asked again.
        if (fault == SourceFault::AnswersNothing)
            EXPECT_EQ(met, 0u);
        else
            EXPECT_GT(met, 3u) << static_cast<int>(fault);
    }
}

TEST_F(LentFileTest, ShortAnswersChangeNothing) {
    const auto faulty = std::make_shared<FaultySource>(InMemory());
    const LentName name = Lend(faulty);
    faulty->n = 1;
    faulty->fromThenOn = true;
    faulty->fault = SourceFault::AnswersShort;
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    EXPECT_EQ(ReadAll(*dataset), image);
}

TEST_F(LentFileTest, MergeThatCannotReadTheOldSamplesWritesNothing) {
    const auto memory = InMemory();
    const auto faulty = std::make_shared<FaultySource>(memory);
    const auto recording = std::make_shared<RecordingSource>(faulty);
    const LentName name = Lend(recording);
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    const auto before = memory->Content();
    const Bytes pixels(std::size_t{200} * 200 * 2, 1);
    faulty->n = faulty->Transfers() + 1;
    EXPECT_TRUE(WriteBytes(*dataset, 90, 90, 200, 200, BandList({0, 1}), 0, pixels));
    EXPECT_EQ(memory->Content(), before);
    EXPECT_EQ(recording->Take().reads, 1u);
    EXPECT_TRUE(WriteBytes(*dataset, 90, 90, 200, 200, BandList({0, 1}), 0, pixels));
    EXPECT_NE(memory->Content(), before);
    EXPECT_EQ(recording->Take().Failures(), 0u);
}

// A file that did not tell its size while it was opened is looked at again by the first store, so
// that no record goes.
TEST_F(LentFileTest, DocumentOfAFileThatDidNotTellItsSizeIsReadByTheFirstStore) {
    zelm::Array<zelm::RasterBandStats<unsigned char>> stats;
    stats.Append({});
    ASSERT_TRUE(Open()->SetBandStats(stats));
    std::size_t opened = 0;
    for (const bool fetchesFirst : {false, true})
        for (std::size_t from = 1; from < 10; ++from) {
            const auto memory = InMemory();
            const auto faulty = std::make_shared<FaultySource>(memory);
            faulty->beforeTransfer = [&](std::size_t n) {
                if (n == from) faulty->sizeError = EIO;
            };
            const LentName name = Lend(faulty);
            const auto dataset = OpenLent(name);
            faulty->beforeTransfer = nullptr;
            if (!dataset) continue;
            ++opened;
            const bool wasUnknown = faulty->sizeError != 0;
            EXPECT_EQ(dataset->SetBandStats(stats), !wasUnknown);
            faulty->sizeError = 0;
            if (fetchesFirst) {
                EXPECT_TRUE(dataset->HasBandStats<unsigned char>(0));
            }
            EXPECT_TRUE(dataset->SetBandStats(stats));
            const auto bytes = memory->Content();
            const std::string text(bytes.begin(), bytes.end());
            std::size_t records = 0;
            for (std::size_t at = 0; (at = text.find("<BANDSTATISTICS>", at)) != text.npos; ++at)
                ++records;
            EXPECT_EQ(records, wasUnknown ? 2u : 3u) << from;
        }
    EXPECT_GT(opened, 2u);
}

TEST_F(LentFileTest, AnswersOfASourceThatThrowsOutsideItsTransfersAreThoseOfAFailure) {
    const auto faulty = std::make_shared<FaultySource>(InMemory());
    const LentName name = Lend(faulty);
    const auto dataset = OpenLent(name);
    ASSERT_TRUE(dataset);
    faulty->othersThrow = true;
    EXPECT_EQ(ReadAll(*dataset), image);
    dataset->RefreshPyramidState();
    EXPECT_FALSE(dataset->HasPyramid) << "its size is not known";
    EXPECT_FALSE(OpenLent(name));
    dataset->DeleteFile();
    faulty->othersThrow = false;
    EXPECT_TRUE(OpenLent(name));
}

}  // namespace
}  // namespace zmctest
