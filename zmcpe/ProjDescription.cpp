#include "zmcpe/ProjDescription.h"

#include <cstdlib>
#include <numbers>

namespace zelm {
namespace {

constexpr double kDegreesPerRadian = 180.0 / std::numbers::pi;

// The horizontal system inside compound systems and those with a transformation tied to them;
// null if `crs` is one itself.
PjHolder Unwrapped(PJ_CONTEXT* context, const PJ* crs) {
    PjHolder inner;
    for (const PJ* at = crs; at; at = inner.get()) {
        const PJ_TYPE type = proj_get_type(at);
        if (type == PJ_TYPE_COMPOUND_CRS)
            inner.reset(proj_crs_get_sub_crs(context, at, 0));
        else if (type == PJ_TYPE_BOUND_CRS)
            inner.reset(proj_get_source_crs(context, at));
        else
            break;
    }
    return inner;
}

CoordSysImpl::Kind KindOf(const PJ* crs) {
    switch (proj_get_type(crs)) {
        case PJ_TYPE_GEOGRAPHIC_2D_CRS:
        case PJ_TYPE_GEOGRAPHIC_3D_CRS:
            return CoordSysImpl::Kind::Geographic;
        case PJ_TYPE_PROJECTED_CRS:
            return CoordSysImpl::Kind::Projected;
        default:
            return CoordSysImpl::Kind::Other;
    }
}

String NameOf(const PJ* object) { return object ? String(proj_get_name(object)) : String(); }

String DatumNameOf(PJ_CONTEXT* context, const PJ* crs) {
    const PjHolder geodetic(proj_crs_get_geodetic_crs(context, crs));
    const PjHolder datum(proj_crs_get_datum_forced(context, geodetic ? geodetic.get() : crs));
    return NameOf(datum.get());
}

// PROJ gives an angle's unit in radians, the same way as a length's in metres: only the type of
// the coordinate system, and the unit's own entry, tell the two apart.
bool IsAngular(PJ_CONTEXT* context, const PJ* system, const char* authority, const char* code) {
    const char* category = nullptr;
    if (authority && code &&
        proj_uom_get_info_from_database(context, authority, code, nullptr, nullptr, &category))
        return String(category) == "angular";
    return proj_cs_get_type(context, system) == PJ_CS_TYPE_ELLIPSOIDAL;
}

void DescribeUnit(PJ_CONTEXT* context, const PJ* crs, ProjDescription& description) {
    const PjHolder system(proj_crs_get_coordinate_system(context, crs));
    const char* name = nullptr;
    const char* authority = nullptr;
    const char* code = nullptr;
    double factor = 1.0;
    if (!system || !proj_cs_get_axis_info(context, system.get(), 0, nullptr, nullptr, nullptr,
                                          &factor, &name, &authority, &code))
        return;
    description.unitName = name;
    const bool isEpsg = authority && code && String(authority) == "EPSG";
    description.unitCode = isEpsg ? static_cast<std::int32_t>(std::strtol(code, nullptr, 10)) : 0;
    description.unitKind = IsAngular(context, system.get(), authority, code) ? 1 : 0;
    description.unitFactor = description.unitKind == 1 ? factor * kDegreesPerRadian : factor;
}

}  // namespace

ProjDescription DescribeProj(PJ_CONTEXT* context, const PJ* crs) {
    ProjDescription description;
    const PjHolder inner = Unwrapped(context, crs);
    const PJ* const horizontal = inner ? inner.get() : crs;
    description.name = NameOf(crs);
    description.kind = KindOf(horizontal);
    description.datumName = DatumNameOf(context, horizontal);
    DescribeUnit(context, horizontal, description);
    const char* const options[] = {"MULTILINE=NO", nullptr};
    description.wkt2 = proj_as_wkt(context, crs, PJ_WKT2_2019, options);
    return description;
}

}  // namespace zelm
