// The tests that every RasterReader has to pass, whatever holds its pixels.
//
// Instantiate with a fixture factory:
//
//   struct Fixture {
//       using Element = ...;                                // element type
//       static std::vector<std::int32_t> Interleaves();     // interleaves to be tested
//       static std::int32_t TileInterleave(std::int32_t);   // layout of tiles, by the raster's
//       static constexpr std::uint32_t kCapabilities;
//       static constexpr std::uint32_t kStatsMask;
//       Fixture(samples, lines, bands, interleave);         // a new raster; pixels of any value
//       RasterReader<Element>& Reader();                    // lives as long as the fixture
//       // Optional, for rasters that do not take every window as it is written:
//       static bool Arrives(const Window&, std::uint32_t bands);
//   };
//   INSTANTIATE_TYPED_TEST_SUITE_P(Name, ReaderConformance, ::testing::Types<Fixture, ...>);
//
// Masks go by the raster's interleave, so they are tested only where tiles have it too.
#ifndef ZMC_TESTS_SUPPORT_READERCONFORMANCE_H
#define ZMC_TESTS_SUPPORT_READERCONFORMANCE_H

#include <gtest/gtest.h>

#include <algorithm>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "core/NumericConversion.h"
#include "raster/RasterReader.h"
#include "tests/support/TileModel.h"

namespace zmctest {

using namespace zelm;

template <class Fixture>
class ReaderConformance : public ::testing::Test {
public:
    using T = typename Fixture::Element;
    using Tile = std::vector<T>;
    using Mask = std::vector<unsigned char>;

    static constexpr std::uint32_t kSamples = 37, kLines = 23;

    // Runs `test` on a new raster of each interleave, with one band and with three.
    template <class Test>
    void ForEachRaster(Test&& test) {
        for (const std::int32_t code : Fixture::Interleaves()) {
            for (const std::uint32_t count : {1u, 3u}) {
                if (code == Interleave::None && count != 1) continue;
                SCOPED_TRACE("interleave " + std::to_string(code) + ", bands " +
                             std::to_string(count));
                interleave = code;
                bands = count;
                fixture = std::make_unique<Fixture>(kSamples, kLines, count, code);
                ASSERT_NO_FATAL_FAILURE(test(fixture->Reader()));
            }
        }
    }

    std::int32_t TileInterleave() const { return Fixture::TileInterleave(interleave); }
    bool MasksFitTiles() const { return bands == 1 || TileInterleave() == interleave; }

    // The whole raster with samples of its own for each place, written at once.
    void Fill() {
        const Box whole{kSamples, kLines, bands};
        raster.assign(kSamples * kLines * bands, T{});
        Tile tile(raster.size());
        for (std::size_t b = 0; b < bands; ++b)
            for (std::size_t l = 0; l < kLines; ++l)
                for (std::size_t s = 0; s < kSamples; ++s)
                    tile[whole.Index(TileInterleave(), b, l, s)] = At(b, l, s) =
                        SampleOf<T>((b * kLines + l) * kSamples + s);
        Mask mask(tile.size(), 0);
        std::vector<int> list = AllBands(bands);
        ASSERT_TRUE(fixture->Reader().WriteTile(0, 0, kSamples, kLines, ListView(list), 0,
                                                tile.data(), mask.data()));
    }

    T& At(std::size_t b, std::size_t l, std::size_t s) {
        return raster[(b * kLines + l) * kSamples + s];
    }

    struct Window {
        std::size_t x, y;
        Box box;
        std::vector<int> list;
    };

    Window RandomWindow(Random& random) const {
        Window w;
        w.box.width = random.Between(1, kSamples);
        w.box.height = random.Between(1, kLines);
        w.x = random.Between(0, kSamples - w.box.width);
        w.y = random.Between(0, kLines - w.box.height);
        w.list = AllBands(bands);
        if (random.OneIn(2)) std::reverse(w.list.begin(), w.list.end());
        w.list.resize(random.Between(1, bands));
        w.box.bands = w.list.size();
        return w;
    }

    bool Read(Window& w, Tile& tile, Mask& mask) {
        return fixture->Reader().ReadTile(
            static_cast<int>(w.x), static_cast<int>(w.y), static_cast<std::uint32_t>(w.box.width),
            static_cast<std::uint32_t>(w.box.height), ListView(w.list), 0, tile.data(),
            mask.empty() ? nullptr : mask.data());
    }
    bool Write(Window& w, Tile& tile, Mask& mask) {
        return fixture->Reader().WriteTile(
            static_cast<int>(w.x), static_cast<int>(w.y), static_cast<std::uint32_t>(w.box.width),
            static_cast<std::uint32_t>(w.box.height), ListView(w.list), 0, tile.data(),
            mask.empty() ? nullptr : mask.data());
    }

    Tile Expected(const Window& w) {
        Tile tile(w.box.Elements(TileInterleave()));
        ForEachSample(w, [&](std::size_t index, std::size_t b, std::size_t l, std::size_t s) {
            tile[index] = At(b, l, s);
        });
        return tile;
    }

    template <class Visit>
    void ForEachSample(const Window& w, Visit&& visit) {
        for (std::size_t k = 0; k < w.box.bands; ++k)
            for (std::size_t l = 0; l < w.box.height; ++l)
                for (std::size_t s = 0; s < w.box.width; ++s)
                    visit(w.box.Index(TileInterleave(), k, l, s),
                          static_cast<std::size_t>(w.list[k]), w.y + l, w.x + s);
    }

    Window Whole() const { return {0, 0, {kSamples, kLines, bands}, AllBands(bands)}; }

    std::unique_ptr<Fixture> fixture;
    std::int32_t interleave = 0;
    std::uint32_t bands = 0;
    Tile raster;  // what the reader holds: band, line, sample
};

TYPED_TEST_SUITE_P(ReaderConformance);

TYPED_TEST_P(ReaderConformance, TellsItsRaster) {
    this->ForEachRaster([this](RasterReader<typename TypeParam::Element>& reader) {
        EXPECT_TRUE(reader.IsValid());
        EXPECT_EQ(reader.GetCapabilities(), TypeParam::kCapabilities);
        EXPECT_EQ(reader.GetStatsMask(), TypeParam::kStatsMask);
        EXPECT_EQ(reader.GetSamples(0), this->kSamples);
        EXPECT_EQ(reader.GetLines(0), this->kLines);
        EXPECT_EQ(reader.GetBands(), this->bands);
        const RasterProps props = reader.GetRasterProps();
        EXPECT_EQ(props.IsValid(), !(props.formatName == "Unknown"));
        EXPECT_EQ(props.samples, this->kSamples);
        EXPECT_EQ(props.lines, this->kLines);
        EXPECT_EQ(props.bands, this->bands);
        EXPECT_EQ(props.interleave, this->interleave);
        EXPECT_EQ(props.pixelType, ElementTraits<typename TestFixture::T>::code);
        EXPECT_TRUE(reader.IsValidLevel(0));
        EXPECT_LE(reader.GetMinLevel(), 0);
        EXPECT_GE(reader.GetMaxLevel(), 0);
        EXPECT_FALSE(reader.ReservedReaderQuery());
        EXPECT_EQ(reader.GetConnection(), reader.connection);
    });
}

TYPED_TEST_P(ReaderConformance, PropertiesAreCopies) {
    this->ForEachRaster([](auto& reader) {
        RasterProps props = reader.GetRasterProps();
        props.SetNoDataValue(0, 5);
        props.samples = 1;
        EXPECT_FALSE(reader.HasNoDataValue(0));
        EXPECT_EQ(reader.GetRasterProps().samples, reader.GetSamples(0));
    });
}

TYPED_TEST_P(ReaderConformance, NothingIsStoredYet) {
    this->ForEachRaster([](auto& reader) {
        EXPECT_FALSE(reader.HasBandStats(0));
        EXPECT_FALSE(reader.HasPalette(0));
        EXPECT_EQ(reader.GetHistograms().shape.elements, 0u);
        EXPECT_EQ(reader.GetBandStats(0).flags, 0u);
    });
}

TYPED_TEST_P(ReaderConformance, ReadsWindowsAndBandLists) {
    this->ForEachRaster([this](auto&) {
        ASSERT_NO_FATAL_FAILURE(this->Fill());
        Random random(1);
        for (int round = 0; round < 60; ++round) {
            auto window = this->RandomWindow(random);
            const auto expected = this->Expected(window);
            typename TestFixture::Tile tile(expected.size());
            typename TestFixture::Mask mask;
            ASSERT_TRUE(this->Read(window, tile, mask));
            ASSERT_TRUE(SameBits(tile, expected)) << "round " << round;
        }
    });
}

TYPED_TEST_P(ReaderConformance, WritesWindowsAndNothingElse) {
    this->ForEachRaster([this](auto&) {
        ASSERT_NO_FATAL_FAILURE(this->Fill());
        Random random(2);
        for (int round = 0; round < 20; ++round) {
            auto window = this->RandomWindow(random);
            if constexpr (requires { TypeParam::Arrives(window, 1u); })
                if (!TypeParam::Arrives(window, this->bands)) continue;
            typename TestFixture::Mask mask(window.box.Elements(this->TileInterleave()), 0);
            auto tile = Samples<typename TestFixture::T>(mask.size(), random.Between(0, 50));
            const auto kept = tile;
            ASSERT_TRUE(this->Write(window, tile, mask));
            EXPECT_TRUE(SameBits(tile, kept));
            this->ForEachSample(window, [&](std::size_t index, std::size_t b, std::size_t l,
                                            std::size_t s) { this->At(b, l, s) = tile[index]; });
            auto whole = this->Whole();
            const auto expected = this->Expected(whole);
            typename TestFixture::Tile all(expected.size());
            mask.clear();
            ASSERT_TRUE(this->Read(whole, all, mask));
            ASSERT_TRUE(SameBits(all, expected)) << "round " << round;
        }
    });
}

TYPED_TEST_P(ReaderConformance, RefusesToWriteWithoutBufferOrMask) {
    this->ForEachRaster([this](auto& reader) {
        ASSERT_NO_FATAL_FAILURE(this->Fill());
        auto whole = this->Whole();
        const auto before = this->Expected(whole);
        auto tile = before;
        std::fill(tile.begin(), tile.end(), typename TypeParam::Element{});
        typename TestFixture::Mask none;
        typename TestFixture::Mask mask(tile.size(), 0);
        EXPECT_FALSE(this->Write(whole, tile, none));
        EXPECT_FALSE(reader.WriteTile(0, 0, 1, 1, ListView(whole.list), 0, nullptr, mask.data()));
        ASSERT_TRUE(this->Read(whole, tile, none));
        EXPECT_TRUE(SameBits(tile, before));
    });
}

TYPED_TEST_P(ReaderConformance, EmptyTilesMoveNothing) {
    this->ForEachRaster([this](auto& reader) {
        ASSERT_NO_FATAL_FAILURE(this->Fill());
        auto tile = Samples<typename TestFixture::T>(16, 5);
        const auto kept = tile;
        typename TestFixture::Mask mask(16, 0xFF);
        auto list = AllBands(this->bands);
        for (const auto& [width, height] : {std::pair{0u, 2u}, {2u, 0u}, {0u, 0u}}) {
            EXPECT_TRUE(
                reader.ReadTile(1, 1, width, height, ListView(list), 0, tile.data(), mask.data()));
            EXPECT_TRUE(
                reader.WriteTile(1, 1, width, height, ListView(list), 0, tile.data(), mask.data()));
        }
        EXPECT_TRUE(SameBits(tile, kept));
        EXPECT_EQ(mask, typename TestFixture::Mask(16, 0xFF));
        auto whole = this->Whole();
        typename TestFixture::Tile all(this->raster.size());
        mask.clear();
        ASSERT_TRUE(this->Read(whole, all, mask));
        EXPECT_TRUE(SameBits(all, this->Expected(whole)));
    });
}

TYPED_TEST_P(ReaderConformance, TakesNoDataValuesOfItsOwnBands) {
    this->ForEachRaster([this](auto& reader) {
        EXPECT_TRUE(reader.SupportsNoData());
        EXPECT_FALSE(reader.HasNoDataValue(0));
        EXPECT_TRUE(reader.GetNoDataValue(0) == typename TestFixture::T{});
        RasterProps source;
        source.SetBands(this->bands + 2);
        for (std::uint32_t b = 0; b < source.bands; ++b) source.SetNoDataValue(b, 7 + b);
        reader.SetNoDataValues(source);
        for (std::uint32_t b = 0; b < this->bands; ++b) {
            EXPECT_TRUE(reader.HasNoDataValue(b));
            EXPECT_TRUE(reader.GetNoDataValue(b) == FromDouble<typename TestFixture::T>(7 + b));
        }
        EXPECT_FALSE(reader.HasNoDataValue(this->bands));
        EXPECT_EQ(reader.GetRasterProps().noDataValues.size(), this->bands);
        reader.SetNoDataValues(RasterProps());
        EXPECT_FALSE(reader.HasNoDataValue(0));
    });
}

TYPED_TEST_P(ReaderConformance, MarksNoDataOnReading) {
    this->ForEachRaster([this](auto& reader) {
        if (!this->MasksFitTiles()) return;
        ASSERT_NO_FATAL_FAILURE(this->Fill());
        const typename TestFixture::T value = FromDouble<typename TestFixture::T>(8);
        this->At(0, 3, 4) = value;
        auto whole = this->Whole();
        auto tile = this->Expected(whole);
        typename TestFixture::Mask mask(tile.size(), 0);
        ASSERT_TRUE(this->Write(whole, tile, mask));
        RasterProps source;
        source.SetBands(1);
        source.SetNoDataValue(0, 8);
        reader.SetNoDataValues(source);
        // Bits 1 to 7 are the caller's, and bit 0 is set or cleared whatever it was.
        for (std::size_t i = 0; i < mask.size(); ++i) mask[i] = static_cast<unsigned char>(i);
        ASSERT_TRUE(this->Read(whole, tile, mask));
        this->ForEachSample(
            whole, [&](std::size_t index, std::size_t b, std::size_t l, std::size_t s) {
                const bool marked = b == 0 && this->At(b, l, s) == value;
                ASSERT_EQ(mask[index], (index & 0xFE) | (marked ? 1u : 0u)) << index;
            });
    });
}

TYPED_TEST_P(ReaderConformance, StampsNoDataOnWriting) {
    this->ForEachRaster([this](auto& reader) {
        if (!this->MasksFitTiles()) return;
        ASSERT_NO_FATAL_FAILURE(this->Fill());
        RasterProps source;
        source.SetBands(1);
        source.SetNoDataValue(0, 113);
        reader.SetNoDataValues(source);
        auto whole = this->Whole();
        auto tile = this->Expected(whole);
        typename TestFixture::Mask mask(tile.size(), 0xFE);
        for (std::size_t i = 0; i < mask.size(); i += 3) mask[i] = 1;
        const auto keptMask = mask;
        ASSERT_TRUE(this->Write(whole, tile, mask));
        EXPECT_EQ(mask, keptMask);
        this->ForEachSample(whole,
                            [&](std::size_t index, std::size_t b, std::size_t l, std::size_t s) {
                                if (b == 0 && (mask[index] & 1) != 0)
                                    this->At(b, l, s) = FromDouble<typename TestFixture::T>(113);
                            });
        EXPECT_TRUE(SameBits(tile, this->Expected(whole))) << "the stamps stay in the buffer";
        typename TestFixture::Tile stored(tile.size());
        typename TestFixture::Mask none;
        ASSERT_TRUE(this->Read(whole, stored, none));
        EXPECT_TRUE(SameBits(stored, tile));
    });
}

REGISTER_TYPED_TEST_SUITE_P(ReaderConformance, TellsItsRaster, PropertiesAreCopies,
                            NothingIsStoredYet, ReadsWindowsAndBandLists,
                            WritesWindowsAndNothingElse, RefusesToWriteWithoutBufferOrMask,
                            EmptyTilesMoveNothing, TakesNoDataValuesOfItsOwnBands,
                            MarksNoDataOnReading, StampsNoDataOnWriting);

}  // namespace zmctest

#endif
