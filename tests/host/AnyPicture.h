// Pictures of random samples and masks, of every type: whole numbers close together, or anything
// that the type holds, with what is marked set to what must not matter.
#ifndef ZMC_TESTS_HOST_ANYPICTURE_H
#define ZMC_TESTS_HOST_ANYPICTURE_H

#include <cmath>
#include <cstring>
#include <limits>
#include <random>
#include <vector>

#include "core/ElementTypes.h"
#include "dispatch/NoDataRule.h"
#include "tests/host/NaiveReduction.h"

namespace naive {

using zelm::NoDataRule;

using Random = std::mt19937_64;

template <class T>
T AnySample(Random& random, bool extreme) {
    if constexpr (zelm::kIsComplex<T>) {
        using P = decltype(T::re);
        return {AnySample<P>(random, extreme), AnySample<P>(random, extreme)};
    } else if constexpr (std::is_floating_point_v<T>) {
        if (!extreme) return static_cast<T>(static_cast<int>(random() % 9) - 4);
        return std::ldexp(static_cast<T>(static_cast<std::int64_t>(random())),
                          static_cast<int>(random() % 30) - 60);
    } else {
        if (!extreme) return static_cast<T>(random() % 5);
        const T ends[] = {std::numeric_limits<T>::min(), std::numeric_limits<T>::max(), T(0), T(1)};
        return random() % 3 == 0 ? ends[random() % 4] : static_cast<T>(random());
    }
}

template <class T>
bool SameBits(const T& a, const T& b) {
    return std::memcmp(&a, &b, sizeof(T)) == 0;
}

enum class MaskKind { None, Clear, Noise, Runs, Full };

template <class T>
Picture<T> AnyPicture(Random& random, std::uint32_t halo, std::uint32_t bands, std::uint32_t width,
                      MaskKind kind, const std::vector<NoDataRule<T>>& rules, bool extreme) {
    Picture<T> picture{bands, width, halo, {}, {}};
    const std::uint32_t count = 2 + 2 * halo;
    const std::uint32_t above =
        random() % 3 == 0 ? static_cast<std::uint32_t>(random()) % (halo + 1) : 0;
    const std::uint32_t below =
        random() % 3 == 0 ? static_cast<std::uint32_t>(random()) % (halo + 1) : 0;
    for (std::uint32_t r = 0; r < count; ++r) {
        const bool outside = r < above || r >= count - below;
        std::vector<T> row(outside ? 0 : std::size_t{width} * bands);
        for (std::size_t i = 0; i < row.size(); ++i) {
            const NoDataRule<T>& rule = rules[i % bands];
            do row[i] = AnySample<T>(random, extreme);
            while (rule.hasValue && row[i] == rule.value);
        }
        std::vector<unsigned char> mask(row.size());
        std::size_t left = 0;
        bool marked = false;
        for (std::size_t i = 0; i < mask.size(); ++i) {
            if (left-- == 0) {
                left = random() % 150;
                marked = random() % 2 == 0;
            }
            const bool on = kind == MaskKind::Full ||
                            (kind == MaskKind::Noise && random() % 2 == 0) ||
                            (kind == MaskKind::Runs && marked);
            mask[i] = static_cast<unsigned char>((random() & 0xFE) | (on ? 1 : 0));
            // What is marked must not matter, so it is anything, and often no number.
            if (on) row[i] = AnySample<T>(random, true);
            if constexpr (std::is_floating_point_v<T>) {
                if (on) row[i] = std::numeric_limits<T>::quiet_NaN();
            }
        }
        picture.rows.push_back(std::move(row));
        if (kind != MaskKind::None) picture.masks.push_back(std::move(mask));
    }
    return picture;
}

}  // namespace naive

#endif
