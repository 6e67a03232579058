// The engine's coordinate system on PROJ.
#ifndef ZMC_ZMCPE_PROJCOORDSYS_H
#define ZMC_ZMCPE_PROJCOORDSYS_H

#include <atomic>

#include "zmcpe/CoordSysImpl.h"
#include "zmcpe/ProjContext.h"
#include "zmcpe/ProjDescription.h"

namespace zelm {

class ProjCoordSys final : public CoordSysImpl, private ProjUser {
public:
    // The system of a PROJ definition; null if it is none. Throws std::bad_alloc.
    static ProjCoordSys* Create(const char* definition);
    ~ProjCoordSys();

    std::int32_t References() const { return references; }

    std::int32_t ReleaseReference() override { return --references; }
    std::int32_t AddReference() override { return ++references; }
    void GetName(String& text) const override { text = description.name; }
    void GetDatumName(String& text) const override { text = description.datumName; }
    void GetUnitName(String& text) const override { text = description.unitName; }
    double GetUnitFactor() const override { return description.unitFactor; }
    std::uint32_t GetUnitKind() const override { return description.unitKind; }
    std::int32_t GetUnitCode() const override { return description.unitCode; }
    Kind GetKind() const override { return description.kind; }
    void GetWkt2(String& text) const override { text = description.wkt2; }
    std::size_t Transform(const CoordSysImpl& target, std::size_t count, double* x, double* y,
                          double* z) const override;

private:
    ProjCoordSys(ProjContext& context, PjHolder definition) ZMC_REQUIRES(projMutex);
    void DropProj() override ZMC_REQUIRES(projMutex);
    PJ* TransformationTo(ProjContext& context, const ProjCoordSys& target) const
        ZMC_REQUIRES(projMutex);

    std::atomic<std::int32_t> references{1};
    const std::uint64_t serial;  // never given twice, unlike an address
    const ProjDescription description;
    PjHolder crs ZMC_GUARDED_BY(projMutex);
    // The transformation of the last call, since making one costs far more than using it.
    mutable PjHolder transformation ZMC_GUARDED_BY(projMutex);
    mutable std::uint64_t transformationTarget ZMC_GUARDED_BY(projMutex) = 0;
};

}  // namespace zelm

#endif
