#include "tests/campaigns/AnyReader.h"

#include <cmath>

#include "core/ElementTypes.h"
#include "core/NumericConversion.h"

namespace zmctest {
namespace {

using namespace zelm;

Array<int> View(const std::vector<int>& list) {
    return Array<int>(const_cast<int*>(list.data()),
                      ArrayShape(static_cast<std::uint32_t>(list.size())));
}

template <class T>
double ToReal(const T& value) {
    if constexpr (kIsComplex<T>)
        return static_cast<double>(value.re);
    else
        return static_cast<double>(value);
}

template <class T>
class Typed final : public AnyReader {
public:
    explicit Typed(RasterReader<T>& wrapped) : reader(wrapped) {}

    BasicRasterReader& Basic() override { return reader; }

    bool Read(const Rect& rect, const std::vector<int>& list, std::int32_t level,
              Bytes& buffer) override {
        return reader.ReadTile(static_cast<std::int32_t>(rect.x), static_cast<std::int32_t>(rect.y),
                               rect.width, rect.height, View(list), level,
                               reinterpret_cast<T*>(buffer.data()), nullptr);
    }

    bool Write(const Rect& rect, const std::vector<int>& list, std::int32_t level,
               Bytes& buffer) override {
        Bytes mask(buffer.size() / sizeof(T), 0);
        return reader.WriteTile(
            static_cast<std::int32_t>(rect.x), static_cast<std::int32_t>(rect.y), rect.width,
            rect.height, View(list), level, reinterpret_cast<T*>(buffer.data()), mask.data());
    }

    StatsRecord Stats(std::uint32_t position) override {
        const RasterBandStats<T> stats = reader.GetBandStats(position);
        return {stats.band,
                stats.flags,
                ToReal(stats.minimum),
                ToReal(stats.maximum),
                stats.mean,
                stats.standardDeviation,
                stats.sum,
                stats.sumOfSquares,
                stats.rootMeanSquare};
    }

    std::vector<HistogramRecord> Histograms() override {
        const Array<RasterBandHistogram<T>> all = reader.GetHistograms();
        std::vector<HistogramRecord> records;
        for (std::uint32_t i = 0; i < all.shape.elements; ++i) {
            const RasterBandHistogram<T>& one = all.data[i];
            HistogramRecord record;
            record.band = one.band;
            record.level = one.level;
            record.source = one.source;
            record.binCount = one.binCount;
            record.binSize = one.binSize;
            record.minimum = ToReal(one.minimum);
            record.maximum = ToReal(one.maximum);
            if (one.counts.data)
                record.counts.assign(one.counts.data, one.counts.data + one.counts.shape.elements);
            records.push_back(record);
        }
        return records;
    }

    PaletteRecord PaletteOf(std::uint32_t band) override {
        const PalettePtr palette = reader.GetPalette(band);
        PaletteRecord record;
        if (!palette) return record;
        for (std::uint32_t i = 0; i < palette->nextIndex; ++i) {
            const Color* color = palette->GetColor(i);
            if (color)
                record.colors.push_back({color->red, color->green, color->blue, color->alpha});
        }
        return record;
    }

    bool StoreStats(const StatsRecord& record) override {
        Array<RasterBandStats<T>> stats;
        stats.Append({});
        RasterBandStats<T>& one = stats.data[0];
        one.band = record.band;
        one.flags = record.flags;
        one.minimum = FromDouble<T>(record.minimum);
        one.mean = record.mean;
        return reader.SetBandStats(stats);
    }

    bool StorePalette(std::uint32_t band, const PaletteRecord& record) override {
        Palette palette;
        for (std::array<std::uint8_t, 4> color : record.colors)
            palette.AddColor(RGBAColor(Array<unsigned char>(color.data(), ArrayShape(4))));
        return reader.SetPalette(band, palette);
    }

    bool AsPixel(double& value) const override {
        if constexpr (std::is_integral_v<T>) {
            if (!(std::abs(value) < 2e9)) return false;
            value = static_cast<double>(static_cast<T>(static_cast<std::int64_t>(value)));
        } else if constexpr (std::is_same_v<T, float> || std::is_same_v<T, Complex<float>>) {
            if (std::isfinite(value) && std::abs(value) > 3e38) return false;
            value = static_cast<double>(static_cast<float>(value));
        }
        return true;
    }

private:
    RasterReader<T>& reader;
};

}  // namespace

std::unique_ptr<AnyReader> AnyReader::Over(const RasterReaderDispatchPtr& dispatch) {
    std::unique_ptr<AnyReader> any;
    if (!dispatch) return any;
    dispatch->Visit(
        [&]<class T>(RasterReader<T>& reader) { any = std::make_unique<Typed<T>>(reader); });
    return any;
}

}  // namespace zmctest
