#include "host/reduce/Reduction.h"

#include <algorithm>

#include "core/ElementTypes.h"
#include "host/reduce/ReductionWindow.h"

namespace zmchost {
namespace {

template <class Kernel>
constexpr std::uint32_t HaloOf() {
    return Kernel::kReach - 1;
}

// Of each method: its word, the rows that it needs above and below a pair, and whether it is
// defined for values without an order. In the order of the enumeration.
struct MethodTraits {
    Resampling method;
    const char* word;
    std::uint32_t halo;
    bool forComplex;
};
constexpr MethodTraits kMethods[] = {
    {Resampling::Nearest, "nearest", 0, true},
    {Resampling::Average, "average", 0, true},
    {Resampling::Rms, "rms", 0, false},
    {Resampling::Mode, "mode", 0, false},
    {Resampling::Minimum, "minimum", 0, false},
    {Resampling::Maximum, "maximum", 0, false},
    {Resampling::Median, "median", 0, false},
    {Resampling::Bilinear, "bilinear", HaloOf<BilinearKernel>(), true},
    {Resampling::Cubic, "cubic", HaloOf<CubicKernel>(), true},
    {Resampling::Lanczos, "lanczos", HaloOf<LanczosKernel>(), true},
    {Resampling::Gauss, "gauss", HaloOf<GaussKernel>(), true},
    {Resampling::CubicSpline, "cubicspline", HaloOf<CubicSplineKernel>(), true},
};

constexpr bool MethodsAreInOrder() {
    std::uint32_t place = 0;
    for (const MethodTraits& traits : kMethods)
        if (static_cast<std::uint32_t>(traits.method) != place++) return false;
    return place == kResamplings;
}
static_assert(MethodsAreInOrder());

constexpr std::uint32_t LargestHalo() {
    std::uint32_t largest = 0;
    for (const MethodTraits& traits : kMethods) largest = std::max(largest, traits.halo);
    return largest;
}
static_assert(LargestHalo() == kMaxReductionHalo);

const MethodTraits& Traits(Resampling method) { return kMethods[static_cast<std::size_t>(method)]; }

}  // namespace

std::optional<Resampling> ParseResampling(std::string_view word) {
    for (const MethodTraits& traits : kMethods) {
        if (word == traits.word) return traits.method;
    }
    return std::nullopt;
}

const char* ResamplingName(Resampling method) { return Traits(method).word; }

bool SupportsElementType(Resampling method, std::uint32_t pixelType) {
    bool supported = false;
    zelm::VisitElementType(pixelType, [&]<class T>(std::type_identity<T>) {
        supported = !zelm::kIsComplex<T> || Traits(method).forComplex;
    });
    return supported;
}

std::uint32_t ReductionHalo(Resampling method) { return Traits(method).halo; }

}  // namespace zmchost
