#include "zmcpe/ProjCoordSys.h"

#include <cmath>
#include <limits>
#include <utility>

namespace zelm {
namespace {

std::atomic<std::uint64_t> lastSerial{0};

bool IsFinite(const PJ_COORD& point) {
    return std::isfinite(point.xyz.x) && std::isfinite(point.xyz.y) && std::isfinite(point.xyz.z);
}

}  // namespace

ProjCoordSys* ProjCoordSys::Create(const char* definition) {
    ProjContext context;
    PJ_CONTEXT* const proj = context.Get();
    if (!proj) return nullptr;
    PjHolder crs(proj_create(proj, definition));
    if (!crs || !proj_is_crs(crs.get())) return nullptr;
    return new ProjCoordSys(context, std::move(crs));
}

ProjCoordSys::ProjCoordSys(ProjContext& context, PjHolder definition)
    : serial(++lastSerial),
      description(DescribeProj(context.Get(), definition.get())),
      crs(std::move(definition)) {
    context.Enlist(this);
}

ProjCoordSys::~ProjCoordSys() {
    ProjContext context;
    context.Dismiss(this);
    DropProj();
}

void ProjCoordSys::DropProj() {
    transformation.reset();
    transformationTarget = 0;
    crs.reset();
}

// Null if there is no way between the two.
PJ* ProjCoordSys::TransformationTo(ProjContext& context, const ProjCoordSys& target) const {
    if (transformation && transformationTarget == target.serial) return transformation.get();
    transformation.reset();
    PJ_CONTEXT* const proj = context.Get();
    if (!proj || !crs || !target.crs) return nullptr;
    const PjHolder plain(
        proj_create_crs_to_crs_from_pj(proj, crs.get(), target.crs.get(), nullptr, nullptr));
    if (!plain) return nullptr;
    transformation.reset(proj_normalize_for_visualization(proj, plain.get()));
    transformationTarget = target.serial;
    return transformation.get();
}

std::size_t ProjCoordSys::Transform(const CoordSysImpl& target, std::size_t count, double* x,
                                    double* y, double* z) const {
    ProjContext context;
    PJ* const pj = TransformationTo(context, static_cast<const ProjCoordSys&>(target));
    constexpr double kInfinite = std::numeric_limits<double>::infinity();
    std::size_t done = 0;
    for (std::size_t i = 0; i < count; ++i) {
        PJ_COORD point = proj_coord(x[i], y[i], z ? z[i] : 0.0, HUGE_VAL);
        if (pj && IsFinite(point)) point = proj_trans(pj, PJ_FWD, point);
        const bool good = pj && IsFinite(point);
        if (good) ++done;
        // NOLINTBEGIN(bugprone-narrowing-conversions): it holds infinity for no double.
        x[i] = good ? point.xyz.x : kInfinite;
        y[i] = good ? point.xyz.y : kInfinite;
        if (z) z[i] = good ? point.xyz.z : kInfinite;
        // NOLINTEND(bugprone-narrowing-conversions)
    }
    return done;
}

}  // namespace zelm
