// The pyramid that a build should give, made the simple way: whole levels in memory, one after the
// other, row by row.
#ifndef ZMC_TESTS_HOST_NAIVEPYRAMID_H
#define ZMC_TESTS_HOST_NAIVEPYRAMID_H

#include <cstdint>
#include <vector>

#include "host/raster/NoData.h"
#include "host/reduce/Reduction.h"
#include "host/reduce/Weighing.h"

namespace zmctest {

template <class T>
std::vector<unsigned char> NaiveMask(const std::vector<T>& pixels,
                                     const std::vector<zelm::NoDataRule<T>>& rules) {
    std::vector<unsigned char> mask;
    for (std::size_t i = 0; i < pixels.size(); ++i)
        mask.push_back(rules[i % rules.size()].Marks(pixels[i]) ? 1 : 0);
    return mask;
}

// `weighing` may be null; `hidden` tells of each sample whether a mask hides it, and may be empty.
template <class T>
std::vector<T> NaiveReduce(const std::vector<T>& fine, std::uint32_t width, std::uint32_t height,
                           zmchost::Resampling method,
                           const std::vector<zelm::NoDataRule<T>>& rules,
                           const zmchost::Weighing* weighing = nullptr,
                           const std::vector<unsigned char>& hidden = {}) {
    const auto bands = static_cast<std::uint32_t>(rules.size());
    const auto halo = static_cast<std::int64_t>(zmchost::ReductionHalo(method));
    std::vector<unsigned char> mask = NaiveMask(fine, rules);
    for (std::size_t i = 0; i < hidden.size(); ++i)
        if (hidden[i] != 0) mask[i] |= zmchost::kHiddenBit;
    const bool anyValue =
        std::any_of(rules.begin(), rules.end(), [](const auto& rule) { return rule.hasValue; });
    const std::size_t stride = std::size_t{width} * bands;
    std::vector<T> coarse(std::size_t{width / 2} * (height / 2) * bands);
    for (std::int64_t row = 0; row < height / 2; ++row) {
        std::vector<const T*> rows;
        std::vector<const unsigned char*> masks;
        for (std::int64_t line = 2 * row - halo; line < 2 * row + 2 + halo; ++line) {
            const bool inside = line >= 0 && line < height;
            const std::size_t place = inside ? static_cast<std::size_t>(line) * stride : 0;
            rows.push_back(inside ? fine.data() + place : nullptr);
            masks.push_back(inside ? mask.data() + place : nullptr);
        }
        zmchost::ReduceRow<T>(
            method, bands, width, {rows.data(), masks.data()}, anyValue ? rules.data() : nullptr,
            coarse.data() + static_cast<std::size_t>(row) * (width / 2) * bands, nullptr);
        std::vector<unsigned char> coarseMask(std::size_t{width / 2} * bands);
        if (!weighing) continue;
        T* const out = coarse.data() + static_cast<std::size_t>(row) * coarseMask.size();
        zmchost::ReduceRow<T>(method, bands, width, {rows.data(), masks.data()}, rules.data(), out,
                              coarseMask.data());
        zmchost::WeighRow<T>(method, bands, width, {rows.data(), masks.data()}, rules.data(),
                             *weighing, out, coarseMask.data());
    }
    return coarse;
}

}  // namespace zmctest

#endif
