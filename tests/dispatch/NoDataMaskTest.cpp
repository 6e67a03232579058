#include "dispatch/NoDataMask.h"

#include <gtest/gtest.h>

#include <limits>
#include <vector>

#include "core/PixelVocabulary.h"
#include "tests/dispatch/PropsReader.h"
#include "tests/support/TileModel.h"

namespace zmctest {

using namespace zelm;
namespace {

using Bytes = std::vector<unsigned char>;

template <class T>
constexpr T kNaN = std::numeric_limits<T>::quiet_NaN();
template <class T>
constexpr T kInf = std::numeric_limits<T>::infinity();

// The mask of one line of one band, from mask bytes that were all `before`.
template <class T>
Bytes MaskOf(const ReaderRasterMemory<T>& reader, const std::vector<T>& line,
             unsigned char before = 0) {
    Bytes mask(line.size(), before);
    ComputeNoDataMask<T>(reader, static_cast<std::uint32_t>(line.size()), 1, 1, line.data(),
                         mask.data());
    return mask;
}

TEST(NoDataMask, ZeroSizesLeaveBothBuffersAlone) {
    for (const std::int32_t interleave : {Interleave::BIP, Interleave::BIL, Interleave::BSQ}) {
        auto reader = PropsReader<float>(interleave);
        reader.props.SetNoDataValue(0, 1);
        std::vector<float> pixels(8, 1);
        Bytes mask(8, 1);
        const std::uint32_t sizes[][3] = {{0, 2, 2}, {2, 0, 2}, {2, 2, 0}, {0, 0, 0}};
        for (const auto& [width, height, bands] : sizes) {
            mask.assign(8, 0);
            ComputeNoDataMask<float>(reader, width, height, bands, pixels.data(), mask.data());
            EXPECT_EQ(mask, Bytes(8, 0));
            mask.assign(8, 1);
            pixels.assign(8, 2);
            ApplyNoDataMask<float>(reader, width, height, bands, pixels.data(), mask.data());
            EXPECT_EQ(pixels, std::vector<float>(8, 2));
            pixels.assign(8, 1);
        }
    }
}

TEST(NoDataMask, SetsAndClearsBitZeroAlone) {
    auto reader = PropsReader<short>(Interleave::BSQ);
    reader.props.SetNoDataValue(0, 7);
    std::vector<short> line{7, 8};
    Bytes mask{0xFE, 0x03};
    ComputeNoDataMask<short>(reader, 2, 1, 1, line.data(), mask.data());
    EXPECT_EQ(mask, (Bytes{0xFF, 0x02}));
}

TEST(NoDataMask, FloatBandWhoseValueIsNaN) {
    auto reader = PropsReader<float>(Interleave::BSQ);
    reader.props.SetNoDataValue(0, kNaN<double>);
    EXPECT_EQ(MaskOf(reader, {kNaN<float>, kInf<float>, -kInf<float>, 0.f, 1.f, -0.f}),
              (Bytes{1, 1, 1, 0, 0, 0}));
}

TEST(NoDataMask, FloatBandWithValue) {
    auto reader = PropsReader<float>(Interleave::BSQ);
    reader.props.SetNoDataValue(0, -9999);
    EXPECT_EQ(MaskOf(reader, {-9999.f, kNaN<float>, kInf<float>, -kInf<float>, 0.f, 1.f}, 0xFE),
              (Bytes{0xFF, 0xFF, 0xFF, 0xFF, 0xFE, 0xFE}));
}

TEST(NoDataMask, FloatBandWithoutValueMarksWhatIsNotFinite) {
    const auto reader = PropsReader<double>(Interleave::BSQ);
    EXPECT_EQ(MaskOf(reader, {kNaN<double>, kInf<double>, -kInf<double>, 0., 1e308}, 1),
              (Bytes{1, 1, 1, 0, 0}));
}

TEST(NoDataMask, SignedZerosAreEqual) {
    auto reader = PropsReader<float>(Interleave::BSQ);
    reader.props.SetNoDataValue(0, -0.0);
    EXPECT_EQ(MaskOf(reader, {0.f, -0.f, std::numeric_limits<float>::denorm_min()}),
              (Bytes{1, 1, 0}));
}

TEST(NoDataMask, IntegerBandWithoutValueIsCleared) {
    for (const std::int32_t interleave : kInterleaves) {
        const auto reader = PropsReader<unsigned char>(interleave, 2);
        std::vector<unsigned char> pixels{0, 1, 2, 3};
        Bytes mask(4, 0xFF);
        ComputeNoDataMask<unsigned char>(reader, interleave == Interleave::None ? 4 : 2, 1, 2,
                                         pixels.data(), mask.data());
        EXPECT_EQ(mask, Bytes(4, 0xFE));
    }
}

TEST(NoDataMask, ComplexNeedsBothPartsToMatch) {
    auto reader = PropsReader<Complex<float>>(Interleave::BSQ);
    // A stored value has an imaginary part of 0.
    reader.props.SetNoDataValue(0, 1);
    using C = Complex<float>;
    EXPECT_EQ(MaskOf<C>(reader, {C(1, 3), C(1, 0), C(1, -0.f), C(0, 0), C(kNaN<float>, 0),
                                 C(0, kInf<float>), C(kNaN<float>, kInf<float>)}),
              (Bytes{0, 1, 1, 0, 1, 1, 1}));
}

// Values with two parts come from readers of other kinds.
class TwoPartReader final : public RasterReader<Complex<float>> {
public:
    ReaderRasterMemory<Complex<float>> inner = PropsReader<Complex<float>>(Interleave::BIP);

    bool IsValid() const override { return true; }
    std::uint32_t GetCapabilities() const override { return 0; }
    RasterProps GetRasterProps() const override { return inner.props; }
    std::uint32_t GetSamples(std::int32_t) const override { return 0; }
    std::uint32_t GetLines(std::int32_t) const override { return 0; }
    std::uint32_t GetBands() const override { return 0; }
    std::uint32_t GetBaseReduction() const override { return 0; }
    std::uint32_t GetLevelReduction() const override { return 0; }
    std::int32_t GetMinLevel() const override { return 0; }
    std::int32_t GetMaxLevel() const override { return 0; }
    bool HasPyramid() const override { return false; }
    bool BuildPyramid(std::int32_t, std::int32_t, std::int32_t, const std::int32_t*) override {
        return false;
    }
    bool CanBuildPyramid() const override { return false; }
    bool DeletePyramid() override { return false; }
    bool RefreshPyramidState() override { return false; }
    std::uint32_t GetStatsMask() const override { return 0; }
    bool HasBandStats(std::uint32_t) const override { return false; }
    bool CanStoreBandStats() const override { return false; }
    bool CanStoreHistograms() const override { return false; }
    bool HasNoDataValue(std::uint32_t) const override { return true; }
    bool SupportsNoData() const override { return true; }
    void SetNoDataValues(const RasterProps&) override {}
    bool HasPalette(std::uint32_t) const override { return false; }
    PalettePtr GetPalette(std::uint32_t) const override { return PalettePtr(); }
    bool SetPalette(std::uint32_t, const Palette&) override { return false; }
    bool ReservedReaderQuery() const override { return false; }
    bool IsValidLevel(std::int32_t) const override { return true; }
    RasterDataConnection* GetConnection() const override { return nullptr; }
    RasterBandStats<Complex<float>> GetBandStats(std::uint32_t) const override { return {}; }
    bool SetBandStats(const Array<RasterBandStats<Complex<float>>>&) override { return false; }
    Array<RasterBandHistogram<Complex<float>>> GetHistograms() const override { return {}; }
    bool SetHistograms(const Array<RasterBandHistogram<Complex<float>>>&) override { return false; }
    Complex<float> GetNoDataValue(std::uint32_t) const override { return {1, 2}; }
    bool ReadTile(std::int32_t, std::int32_t, std::uint32_t, std::uint32_t, const Array<int>&,
                  std::int32_t, Complex<float>*, unsigned char*) override {
        return false;
    }
    bool WriteTile(std::int32_t, std::int32_t, std::uint32_t, std::uint32_t, const Array<int>&,
                   std::int32_t, Complex<float>*, unsigned char*) override {
        return false;
    }
};

TEST(NoDataMask, ComplexValueWithTwoParts) {
    const TwoPartReader reader;
    using C = Complex<float>;
    std::vector<C> pixels{C(1, 3), C(1, 2), C(kNaN<float>, 2), C(0, kInf<float>)};
    Bytes mask(4, 0);
    ComputeNoDataMask<C>(reader, 2, 1, 2, pixels.data(), mask.data());
    EXPECT_EQ(mask, (Bytes{0, 1, 1, 1}));
    pixels.assign(4, C(5, 5));
    mask = {1, 0, 2, 3};
    ApplyNoDataMask<C>(reader, 4, 1, 1, pixels.data(), mask.data());
    EXPECT_TRUE(pixels[0] == C(1, 2) && pixels[1] == C(5, 5) && pixels[2] == C(5, 5) &&
                pixels[3] == C(1, 2));
}

TEST(NoDataMask, PlaceInTheTileIsTheNumberOfTheBand) {
    // A tile read with the bands (3, 1): its second band is tested against the value of band 1.
    auto reader = PropsReader<int>(Interleave::BSQ, 4);
    reader.props.SetNoDataValue(1, 5);
    std::vector<int> pixels{5, 6, 5, 6};
    Bytes mask(4, 0);
    ComputeNoDataMask<int>(reader, 2, 1, 2, pixels.data(), mask.data());
    EXPECT_EQ(mask, (Bytes{0, 0, 1, 0}));
}

TEST(NoDataMask, StampsMarkedSamplesOfBandsThatHaveAValue) {
    for (const std::int32_t interleave : {Interleave::BIP, Interleave::BIL, Interleave::BSQ}) {
        auto reader = PropsReader<float>(interleave, 2);
        reader.props.SetNoDataValue(1, -1);
        std::vector<float> pixels(8, 3);
        Bytes mask{1, 0, 0xFE, 3, 1, 0, 1, 0};
        const Bytes kept = mask;
        ApplyNoDataMask<float>(reader, 2, 2, 2, pixels.data(), mask.data());
        EXPECT_EQ(mask, kept);
        const Box box{2, 2, 2};
        for (std::size_t l = 0; l < 2; ++l) {
            for (std::size_t s = 0; s < 2; ++s) {
                EXPECT_EQ(pixels[box.Index(interleave, 0, l, s)], 3.f);
                const std::size_t at = box.Index(interleave, 1, l, s);
                EXPECT_EQ(pixels[at], (mask[at] & 1) != 0 ? -1.f : 3.f);
            }
        }
    }
}

TEST(NoDataMask, StampsNaN) {
    auto reader = PropsReader<float>(Interleave::BIP, 2);
    reader.props.SetNoDataValue(0, kNaN<double>);
    std::vector<float> pixels(4, 3);
    Bytes mask{1, 1, 0, 0};
    ApplyNoDataMask<float>(reader, 2, 1, 2, pixels.data(), mask.data());
    EXPECT_NE(pixels[0], pixels[0]);
    EXPECT_EQ(pixels[1], 3.f) << "the band has no value";
    EXPECT_EQ(pixels[2], 3.f);
}

TEST(NoDataMask, InterleaveNoneHasOnePlane) {
    auto reader = PropsReader<int>(Interleave::None);
    for (std::uint32_t b = 0; b < 3; ++b) reader.props.SetNoDataValue(b, 9);
    std::vector<int> pixels(12, 9);
    Bytes mask(12, 0);
    ComputeNoDataMask<int>(reader, 2, 2, 3, pixels.data(), mask.data());
    EXPECT_EQ(mask, (Bytes{1, 1, 1, 1, 0, 0, 0, 0, 0, 0, 0, 0}));
    pixels.assign(12, 4);
    mask.assign(12, 1);
    ApplyNoDataMask<int>(reader, 2, 2, 3, pixels.data(), mask.data());
    EXPECT_EQ(pixels, (std::vector<int>{9, 9, 9, 9, 4, 4, 4, 4, 4, 4, 4, 4}));
}

TEST(NoDataMask, UnknownInterleaveLeavesAllAsItIs) {
    for (const std::int32_t interleave : {7, -2, 3}) {
        auto reader = PropsReader<int>(interleave);
        reader.props.SetNoDataValue(0, 9);
        std::vector<int> pixels{9, 1};
        Bytes mask{2, 3};
        ComputeNoDataMask<int>(reader, 2, 1, 1, pixels.data(), mask.data());
        ApplyNoDataMask<int>(reader, 2, 1, 1, pixels.data(), mask.data());
        EXPECT_EQ(mask, (Bytes{2, 3}));
        EXPECT_EQ(pixels, (std::vector<int>{9, 1}));
    }
}

TEST(NoDataMask, NullBuffersAreIgnored) {
    auto reader = PropsReader<int>(Interleave::BIP);
    reader.props.SetNoDataValue(0, 9);
    std::vector<int> pixels{9};
    Bytes mask{2};
    ComputeNoDataMask<int>(reader, 1, 1, 1, nullptr, mask.data());
    ComputeNoDataMask<int>(reader, 1, 1, 1, pixels.data(), nullptr);
    ApplyNoDataMask<int>(reader, 1, 1, 1, nullptr, mask.data());
    ApplyNoDataMask<int>(reader, 1, 1, 1, pixels.data(), nullptr);
    EXPECT_EQ(mask, Bytes{2});
    EXPECT_EQ(pixels, std::vector<int>{9});
}

}  // namespace
}  // namespace zmctest
