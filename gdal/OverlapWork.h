// What becomes of samples where scenes lie over each other, by element type: functions over plain
// buffers, which touch no file.
#ifndef ZMC_GDAL_OVERLAPWORK_H
#define ZMC_GDAL_OVERLAPWORK_H

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <limits>
#include <optional>
#include <span>
#include <type_traits>
#include <vector>

#include "gdal/MosaicLayout.h"
#include "host/base/Int128.h"
#include "host/raster/NoData.h"
#include "host/reduce/Rounded.h"

namespace zmcgdal {

// A rectangle of a mosaic as samples, pixel-interleaved and without gaps, and which are shown.
struct Layer {
    zelm::Rectangle part;
    std::vector<std::byte> samples;
    std::vector<unsigned char> shown;
};

// What a gap is filled with: the no-data value if a sample can have it, else no number in floating
// types, and 0 in others.
template <class T>
T GapValue(const std::optional<double>& noData) {
    if (noData && zmchost::HoldsValue<T>(*noData)) return zelm::FromDouble<T>(*noData);
    if constexpr (zelm::kIsComplex<T> || std::is_floating_point_v<T>)
        return zelm::NoDataRule<T>::Unmatched();
    else
        return T{};
}

// Fills `pixels` pixels, each with the same samples.
template <class T>
void FillPixels(std::span<const T> pixel, std::size_t pixels, T* target) {
    const auto same = [&](const T& sample) {
        // Bytes are meant, of -0 and of what is not a number too.
        // NOLINTNEXTLINE(bugprone-suspicious-memory-comparison)
        return std::memcmp(&sample, &pixel[0], sizeof(T)) == 0;
    };
    if (std::all_of(pixel.begin(), pixel.end(), same)) {
        std::fill_n(target, pixels * pixel.size(), pixel[0]);
        return;
    }
    for (; pixels > 0; --pixels, target += pixel.size())
        std::copy(pixel.begin(), pixel.end(), target);
}

template <class T>
T MeanOf(std::span<const T> values, const zelm::NoDataRule<T>& rule) {
    if constexpr (zelm::kIsComplex<T>) {
        using Part = decltype(T::re);
        double re = 0, im = 0;
        for (const T& value : values) {
            re += static_cast<double>(value.re);
            im += static_cast<double>(value.im);
        }
        const auto count = static_cast<double>(values.size());
        return zmchost::KeptValid(zmchost::Joined(zmchost::RoundedFloat<Part>(re / count),
                                                  zmchost::RoundedFloat<Part>(im / count)),
                                  rule);
    } else if constexpr (std::is_floating_point_v<T>) {
        double sum = 0;
        for (const T value : values) sum += static_cast<double>(value);
        return zmchost::KeptValid(
            zmchost::RoundedFloat<T>(sum / static_cast<double>(values.size())), rule);
    } else {
        using Wide = std::conditional_t<sizeof(T) == 8, zmchost::Int128, std::int64_t>;
        Wide sum = 0;
        for (const T value : values) sum += static_cast<Wide>(value);
        return zmchost::KeptValid(
            zmchost::RoundedQuotient<T>(sum, static_cast<Wide>(values.size())), rule);
    }
}

// Of at least one value, in the order of the scenes; they may change places.
template <class T>
T Combined(Overlap overlap, std::span<T> values, const zelm::NoDataRule<T>& rule) {
    if (overlap == Overlap::Mean) return MeanOf<T>(values, rule);
    if constexpr (zelm::kIsComplex<T>) {
        return values.back();
    } else {
        if (overlap == Overlap::Minimum) return *std::min_element(values.begin(), values.end());
        if (overlap == Overlap::Maximum) return *std::max_element(values.begin(), values.end());
        const auto middle = values.begin() + static_cast<std::ptrdiff_t>((values.size() - 1) / 2);
        std::nth_element(values.begin(), middle, values.end());
        return *middle;
    }
}

// Lays a layer over a window that is laid out alike; hidden samples leave what is there.
template <class T>
void LayOver(const Layer& layer, const zelm::Rectangle& window, std::size_t bands, T* target) {
    const auto* from = reinterpret_cast<const T*>(layer.samples.data());
    const unsigned char* shown = layer.shown.data();
    const std::size_t count = layer.part.width * bands;
    for (std::uint32_t y = layer.part.y; y < layer.part.Bottom(); ++y) {
        T* const line =
            target + (std::size_t{y - window.y} * window.width + layer.part.x - window.x) * bands;
        for (std::size_t i = 0; i < count; ++i)
            if (shown[i]) line[i] = from[i];
        from += count;
        shown += count;
    }
}

// The samples of a layer from a pixel on, and which of them are shown.
template <class T>
struct Run {
    const T* samples;
    const unsigned char* shown;
};

// Samples [0, count) of a line that all of these layers have.
template <class T>
void CombineRun(Overlap overlap, std::span<const Run<T>> runs, std::size_t count,
                std::span<const zelm::NoDataRule<T>> rules, std::vector<T>& values, T* target) {
    if (runs.size() == 1) {
        for (std::size_t i = 0; i < count; ++i)
            if (runs[0].shown[i]) target[i] = runs[0].samples[i];
        return;
    }
    for (std::size_t i = 0; i < count; ++i) {
        values.clear();
        for (const Run<T>& run : runs)
            if (run.shown[i]) values.push_back(run.samples[i]);
        if (!values.empty()) target[i] = Combined<T>(overlap, values, rules[i % rules.size()]);
    }
}

// Makes of all layers, in the order of the scenes, what a window has, whose lines are `stride`
// samples apart; samples that no layer shows stay as they are. `rules` are the no-data values of
// the window's bands.
template <class T>
void Combine(Overlap overlap, std::span<const Layer> layers, const zelm::Rectangle& window,
             std::span<const zelm::NoDataRule<T>> rules, T* target, std::size_t stride) {
    const std::size_t bands = rules.size();
    std::vector<T> values;
    std::vector<Run<T>> runs;
    // Between two edges of layers a line has the same ones everywhere.
    std::vector<std::uint32_t> edges = {window.x};
    for (const Layer& layer : layers)
        edges.insert(edges.end(), {layer.part.x, static_cast<std::uint32_t>(layer.part.Right())});
    std::sort(edges.begin(), edges.end());
    edges.erase(std::unique(edges.begin(), edges.end()), edges.end());
    for (std::uint32_t y = window.y; y < window.Bottom(); ++y, target += stride)
        for (std::size_t edge = 0; edge + 1 < edges.size(); ++edge) {
            const std::uint32_t x = edges[edge];
            runs.clear();
            for (const Layer& layer : layers) {
                const zelm::Rectangle& part = layer.part;
                if (y < part.y || y >= part.Bottom() || x < part.x || x >= part.Right()) continue;
                const std::size_t place =
                    (std::size_t{y - part.y} * part.width + x - part.x) * bands;
                runs.push_back({reinterpret_cast<const T*>(layer.samples.data()) + place,
                                layer.shown.data() + place});
            }
            if (!runs.empty())
                CombineRun<T>(overlap, runs, (edges[edge + 1] - x) * bands, rules, values,
                              target + (x - window.x) * bands);
        }
}

}  // namespace zmcgdal

#endif
