// Items in the metadata document: what is put in comes back, whatever is stored behind it, and
// changes no answer.
#include "host/file/EmbeddedItems.h"

#include <gtest/gtest.h>

#include <memory>
#include <vector>

#include "files/FileSource.h"
#include "host/file/MetadataDocument.h"
#include "host/raster/Raster.h"
#include "tests/support/CountingSource.h"
#include "tests/support/FailureOf.h"
#include "tests/support/MemorySource.h"
#include "tests/support/ParseCounter.h"
#include "tests/support/ScratchDirectory.h"

namespace zmchost {
namespace {

using zelm::files::FileSource;
using zelm::files::OpenMode;
using zmctest::CountingSource;
using zmctest::DocumentParses;
using zmctest::FailureOf;
using zmctest::TestModule;
using Pixel = unsigned char;

const std::string kItems =
    "<PAMDataset>\n\t<SRS a=\"&quot;\">]]> &amp; \xC3\xA4 \xF0\x9F\x8C\x8D"
    "</SRS>  \n</PAMDataset>\n";

class EmbeddedItemsTest : public testing::Test {
protected:
    void Make(const std::string& path, bool withRecords) const {
        const zmctest::MemorySource<Pixel> source(4, 4, 2);
        Raster raster = Raster::Create(TestModule(), path, source.props, 0);
        raster.Write<Pixel>(0, {0, 0, 4, 4}, std::vector<Pixel>(32, 1));
        if (withRecords) StoreStatistics(raster, 1);
    }
    static void StoreStatistics(Raster& raster, double mean) {
        std::vector<zelm::RasterBandStats<Pixel>> records(2);
        for (std::uint32_t band = 0; band < 2; ++band) {
            records[band].band = band;
            records[band].flags = zelm::StatsFlag::Mean;
            records[band].mean = mean + band;
        }
        raster.SetStatistics<Pixel>(records);
    }
    static void StoreAllKinds(const std::string& path) {
        Raster raster = Raster::Open(TestModule(), path);
        if (!raster.HasStatistics(0)) StoreStatistics(raster, 7);
        zelm::RasterBandHistogram<Pixel> histogram;
        histogram.binCount = 2;
        histogram.counts = zelm::Array<std::uint64_t>();
        histogram.counts.Append(3);
        histogram.counts.Append(4);
        raster.SetHistograms<Pixel>({histogram});
        zelm::Palette palette;
        palette.AddColor(zelm::Color());
        raster.SetBandPalette(1, palette);
    }
    static std::shared_ptr<FileSource> OpenSource(const std::string& path) {
        return FileSource::Open(path.c_str(), OpenMode::Update);
    }
    static void Embed(const std::string& path, const std::string& items) {
        EmbedItems(*OpenSource(path), path, items);
    }
    static std::string Items(const std::string& path) {
        const auto source = OpenSource(path);
        return ReadEmbeddedItems(*source, path, PyramidHeader::Read(*source, path));
    }
    static std::string Bytes(const std::string& path) {
        const auto source = OpenSource(path);
        std::string bytes(static_cast<std::size_t>(source->Size()), '\0');
        EXPECT_EQ(source->ReadAt(0, bytes.data(), bytes.size()), bytes.size());
        return bytes;
    }
    static std::string Document(const std::string& path) {
        return Bytes(path).substr(PyramidHeader::Read(path).tileDataEnd);
    }
    static void Replace(const std::string& path, const std::string& document) {
        const auto source = OpenSource(path);
        const std::uint64_t start = PyramidHeader::Read(path).tileDataEnd;
        ASSERT_TRUE(source->Truncate(start));
        ASSERT_EQ(source->WriteAt(start, document.data(), document.size()), document.size());
    }

    zmctest::ScratchDirectory folder;
    const std::string file = folder / "a.pyr";
};

TEST_F(EmbeddedItemsTest, ComeBackAsTheyWentIn) {
    for (const bool withRecords : {false, true}) {
        Make(file, withRecords);
        EXPECT_EQ(Items(file), "");
        Embed(file, kItems);
        EXPECT_EQ(Items(file), kItems);
        EXPECT_EQ(JudgeMetadata(file, PyramidHeader::Read(file)), "");
    }
}

TEST_F(EmbeddedItemsTest, StandInFrontOfTheRecordsAndChangeNothingElse) {
    Make(file, true);
    const std::string before = Bytes(file);
    Embed(file, "<a>");
    const std::string element = "\n\n  <SIDECAR>&lt;a&gt;</SIDECAR>";
    std::string after = Bytes(file);
    const std::size_t at = after.find(element);
    ASSERT_NE(at, after.npos);
    EXPECT_EQ(after.substr(at - 9, 9), "<DATASET>");
    EXPECT_EQ(after.erase(at, element.size()), before);
}

TEST_F(EmbeddedItemsTest, SurviveEveryStore) {
    Make(file, true);
    Embed(file, kItems);
    for (int i = 0; i < 3; ++i) {
        StoreAllKinds(file);
        EXPECT_EQ(Items(file), kItems);
        EXPECT_EQ(Document(file).find("<SIDECAR>"), Document(file).rfind("<SIDECAR>"));
    }
}

// The next writer of the element finds it as this one wrote it: its beginning stays in place.
TEST_F(EmbeddedItemsTest, AStoreKeepsTheBeginningOfTheDocument) {
    for (const bool withRecords : {false, true}) {
        Make(file, withRecords);
        Embed(file, kItems);
        const std::string before = Document(file);
        StoreAllKinds(file);
        const std::size_t end = before.find("</SIDECAR>");
        EXPECT_EQ(Document(file).substr(0, end), before.substr(0, end));
    }
}

TEST_F(EmbeddedItemsTest, ChangeNoAnswer) {
    const std::string plain = folder / "plain.pyr";
    for (const std::string& path : {plain, file}) {
        Make(path, true);
        if (path == file) Embed(path, kItems);
        StoreAllKinds(path);
    }
    const Raster with = Raster::Open(TestModule(), file);
    const Raster without = Raster::Open(TestModule(), plain);
    for (std::uint32_t band = 0; band < 2; ++band) {
        EXPECT_EQ(with.Statistics<Pixel>(band).mean, without.Statistics<Pixel>(band).mean);
        EXPECT_EQ(with.HasPalette(band), without.HasPalette(band));
    }
    EXPECT_EQ(with.Statistics<Pixel>(1).mean, 2);
    ASSERT_EQ(with.Histograms<Pixel>().size(), 1U);
    EXPECT_EQ(with.Histograms<Pixel>()[0].counts.data[1], 4U);
    EXPECT_EQ(with.DocumentFault(), "");
    EXPECT_EQ(with.DocumentElements(), without.DocumentElements() + 1);
}

TEST_F(EmbeddedItemsTest, ControlCharactersBecomeReferences) {
    Make(file, false);
    Embed(file, std::string("a\rb\x01") + "c\x1F");
    EXPECT_EQ(Items(file), "a&#13;b&#1;c&#31;");
    StoreAllKinds(file);
    EXPECT_EQ(Items(file), "a&#13;b&#1;c&#31;");
}

// A parser hands on a long text in many pieces, and divides characters.
TEST_F(EmbeddedItemsTest, MayBeLong) {
    Make(file, true);
    std::string items;
    while (items.size() < 3000000) items += "<\xF0\x9F\x8C\x8D&";
    Embed(file, items);
    EXPECT_EQ(Items(file), items);
    StoreAllKinds(file);
    EXPECT_EQ(Items(file), items);
}

TEST_F(EmbeddedItemsTest, WhatNoDocumentTakesIsRefusedAndChangesNothing) {
    Make(file, true);
    const std::string before = Bytes(file);
    EXPECT_NE(FailureOf([&] { Embed(file, "\xE4"); }).find("is malformed"), std::string::npos);
    EXPECT_NE(FailureOf([&] { Embed(file, "\xEF\xBF\xBF"); }).find("is malformed"),
              std::string::npos);
    EXPECT_NE(FailureOf([&] {
                  Embed(file, std::string(std::size_t{256} << 20, 'a'));
              }).find("is longer than 256 MiB"),
              std::string::npos);
    EXPECT_EQ(Bytes(file), before);
    Embed(file, kItems);
    const std::string with = Bytes(file);
    EXPECT_NE(FailureOf([&] { Embed(file, kItems); }).find("keeps metadata already"),
              std::string::npos);
    EXPECT_EQ(Bytes(file), with);
}

TEST_F(EmbeddedItemsTest, OfAnIncompleteFileOrOfAnotherWritersDocumentAreRefused) {
    Make(file, false);
    Replace(file, "<DATASET></DATASET>");
    EXPECT_NE(FailureOf([&] { Embed(file, kItems); }).find("begins in another way"),
              std::string::npos);
    ASSERT_TRUE(OpenSource(file)->Truncate(PyramidHeader::Read(file).tileDataEnd - 1));
    EXPECT_NE(FailureOf([&] { Embed(file, kItems); }).find("is incomplete"), std::string::npos);
}

TEST_F(EmbeddedItemsTest, AMalformedDocumentHasNone) {
    Make(file, true);
    Embed(file, kItems);
    const std::string good = Document(file);
    for (const std::string& bad : {good.substr(0, good.size() - 4), good.substr(0, 200),
                                   "\x1A" + good.substr(1), good + "<a/>", good.substr(0, 30)}) {
        Replace(file, bad);
        EXPECT_EQ(Items(file), "");
    }
    Replace(file, good);
    EXPECT_EQ(Items(file), kItems);
}

TEST_F(EmbeddedItemsTest, TheFirstElementOfTheRootCountsAlone) {
    Make(file, false);
    Embed(file, "a");
    std::string text = Document(file);
    text.insert(text.find("</DATASET>"),
                "<SIDECAR>b</SIDECAR><PALETTE><SIDECAR>c</SIDECAR></PALETTE>");
    Replace(file, text);
    EXPECT_EQ(Items(file), "a");
    const std::string element = "\n\n  <SIDECAR>a</SIDECAR>";
    Replace(file, text.erase(text.find(element), element.size()));
    EXPECT_EQ(Items(file), "");
}

TEST_F(EmbeddedItemsTest, AFileWithoutThemCostsOneShortRead) {
    Make(file, true);
    const PyramidHeader header = PyramidHeader::Read(file);
    CountingSource source(OpenSource(file));
    const std::size_t parses = DocumentParses();
    EXPECT_EQ(ReadEmbeddedItems(source, file, header), "");
    EXPECT_EQ(source.reads, 1);
    EXPECT_LT(source.bytes, 128U);
    EXPECT_EQ(DocumentParses(), parses);
}

}  // namespace
}  // namespace zmchost
