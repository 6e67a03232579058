// PyramidFileTest: a folder for files of a test, and datasets on them.
#ifndef ZMC_TESTS_SUPPORT_PYRAMIDFILETEST_H
#define ZMC_TESTS_SUPPORT_PYRAMIDFILETEST_H

#include <gtest/gtest.h>

#include <filesystem>
#include <memory>
#include <string>
#include <type_traits>
#include <vector>
#include <xercesc/util/PlatformUtils.hpp>

#include "core/ElementTypes.h"
#include "pyramid/PyramidDataset.h"
#include "tests/support/PyramidModel.h"

namespace zmctest {

// The parser library is the host's to initialise.
inline const bool kXercesReady = [] {
    xercesc::XMLPlatformUtils::Initialize();
    return true;
}();

// A band list that owns nothing.
class BandList {
public:
    BandList(std::vector<int> list) : bands(std::move(list)) {}
    zelm::Array<int> View() const {
        return zelm::Array<int>(const_cast<int*>(bands.data()),
                                zelm::ArrayShape(static_cast<std::uint32_t>(bands.size())));
    }
    std::vector<int> bands;
};

inline std::vector<int> AllBands(std::uint32_t count) {
    std::vector<int> list(count);
    for (std::uint32_t i = 0; i < count; ++i) list[i] = static_cast<int>(i);
    return list;
}

class PyramidFileTest : public testing::Test {
protected:
    PyramidFileTest() {
        std::string pattern = (std::filesystem::temp_directory_path() / "zmcpyrXXXXXX").string();
        directory = mkdtemp(pattern.data());
        path = directory / "test.pyr";
    }
    ~PyramidFileTest() override { std::filesystem::remove_all(directory); }

    // A dataset that is described but not made.
    std::unique_ptr<zelm::PyramidDataset> Describe(const PyramidDescription& d) const {
        zelm::RasterProps props;
        props.samples = d.samples;
        props.lines = d.lines;
        props.bands = d.bands;
        props.pixelType = d.type;
        props.interleave = 0;
        props.tileLines = d.ordering == 1 ? 256 : 0;
        auto dataset = std::make_unique<zelm::PyramidDataset>(zelm::String(path.c_str()), props);
        dataset->TileSize = d.tile;
        dataset->TileOrdering = d.ordering;
        return dataset;
    }

    std::unique_ptr<zelm::PyramidDataset> Create(const PyramidDescription& d) const {
        auto dataset = Describe(d);
        dataset->CreateFile(d.levelMin, d.levelMax);
        return dataset;
    }

    // A dataset on the file; null if it does not open.
    std::unique_ptr<zelm::PyramidDataset> Open() const {
        auto dataset = std::make_unique<zelm::PyramidDataset>(zelm::String(path.c_str()));
        if (dataset->ReadHeader()) return nullptr;
        return dataset;
    }

    std::uint64_t FileSize() const { return std::filesystem::file_size(path); }

    std::filesystem::path directory;
    std::filesystem::path path;
};

// The transfers of a dataset for its own pixel type, on plain bytes.
inline bool ReadBytes(zelm::PyramidDataset& dataset, std::uint32_t x, std::uint32_t y,
                      std::uint32_t width, std::uint32_t height, const BandList& list, int level,
                      Bytes& buffer) {
    bool result = false;
    zelm::VisitElementType(dataset.PixelType, [&](auto identity) {
        using T = typename decltype(identity)::type;
        std::vector<T> typed(buffer.size() / sizeof(T) + 1);
        std::copy(buffer.begin(), buffer.end(), reinterpret_cast<unsigned char*>(typed.data()));
        result = dataset.ReadTile<T>(x, y, width, height, list.View(), level, typed.data());
        std::copy_n(reinterpret_cast<unsigned char*>(typed.data()), buffer.size(), buffer.data());
    });
    return result;
}

inline Bytes ReadRect(zelm::PyramidDataset& dataset, std::uint32_t x, std::uint32_t y,
                      std::uint32_t width, std::uint32_t height, const BandList& list, int level) {
    const std::size_t n = list.bands.empty() ? dataset.BandCount : list.bands.size();
    Bytes buffer(std::size_t{width} * height * n * dataset.BytesPerSample, 0xA5);
    EXPECT_TRUE(ReadBytes(dataset, x, y, width, height, list, level, buffer));
    return buffer;
}

inline bool WriteBytes(zelm::PyramidDataset& dataset, std::uint32_t x, std::uint32_t y,
                       std::uint32_t width, std::uint32_t height, const BandList& list, int level,
                       const Bytes& buffer) {
    bool result = false;
    zelm::VisitElementType(dataset.PixelType, [&](auto identity) {
        using T = typename decltype(identity)::type;
        std::vector<T> typed(buffer.size() / sizeof(T) + 1);
        std::copy(buffer.begin(), buffer.end(), reinterpret_cast<unsigned char*>(typed.data()));
        result =
            dataset.TileOrdering < 2
                ? dataset.WriteTileInterleaved<T>(x, y, width, height, list.View(), level,
                                                  typed.data())
                : dataset.WriteTileMorton<T>(x, y, width, height, list.View(), level, typed.data());
    });
    return result;
}

// The rectangle of an image that ReadTile gives.
inline Bytes Crop(const Bytes& image, std::uint32_t imageWidth, std::size_t pixelBytes,
                  std::uint32_t x, std::uint32_t y, std::uint32_t width, std::uint32_t height) {
    Bytes out;
    out.reserve(width * std::size_t{height} * pixelBytes);
    for (std::uint32_t row = 0; row < height; ++row) {
        const auto start =
            image.begin() +
            static_cast<std::ptrdiff_t>(((std::size_t{y} + row) * imageWidth + x) * pixelBytes);
        out.insert(out.end(), start, start + static_cast<std::ptrdiff_t>(width * pixelBytes));
    }
    return out;
}

// The listed bands of every pixel.
inline Bytes PickBands(const Bytes& pixels, std::uint32_t bandCount, std::uint32_t sampleBytes,
                       const std::vector<int>& list) {
    Bytes out;
    const std::size_t pixelBytes = std::size_t{bandCount} * sampleBytes;
    for (std::size_t at = 0; at < pixels.size(); at += pixelBytes)
        for (const int band : list) {
            const auto start =
                pixels.begin() +
                static_cast<std::ptrdiff_t>(at + static_cast<std::size_t>(band) * sampleBytes);
            out.insert(out.end(), start, start + sampleBytes);
        }
    return out;
}

// Writes a level tile by tile, edge tiles in their exact size, as clients fill files.
inline void FillLevel(zelm::PyramidDataset& dataset, std::uint32_t level, const Bytes& image) {
    const std::uint32_t width = dataset.Samples >> level;
    const std::uint32_t height = dataset.Lines >> level;
    const std::size_t pixelBytes = std::size_t{dataset.BandCount} * dataset.BytesPerSample;
    const BandList all(AllBands(dataset.BandCount));
    for (std::uint32_t y = 0; y < height; y += dataset.TileSize)
        for (std::uint32_t x = 0; x < width; x += dataset.TileSize) {
            const std::uint32_t w = std::min(dataset.TileSize, width - x);
            const std::uint32_t h = std::min(dataset.TileSize, height - y);
            EXPECT_TRUE(WriteBytes(dataset, x, y, w, h, all, static_cast<int>(level),
                                   Crop(image, width, pixelBytes, x, y, w, h)));
        }
}

}  // namespace zmctest

#endif
