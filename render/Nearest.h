// Nearest: how numbers become levels of a picture, told once: floor(value + 0.5).
#ifndef ZMC_RENDER_NEAREST_H
#define ZMC_RENDER_NEAREST_H

namespace zmcrender {

// `value` is not negative, and Whole holds what comes of it. Halves go up, as in the formula of a
// style; the rounding of the C library, whose call costs more than all else, may take them
// elsewhere.
template <class Whole, class Real>
constexpr Whole Nearest(Real value) {
    // NOLINTNEXTLINE(bugprone-incorrect-roundings): as just said.
    return static_cast<Whole>(value + Real{0.5});
}

}  // namespace zmcrender

#endif
