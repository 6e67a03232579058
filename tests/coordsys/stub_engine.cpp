// Stand-ins for the projection engine. Each build lacks one entry point, or none (ZMC_STUB_LACKS,
// the number of the entry point from 1); 5 lacks none, and breaks its contract: it cannot start,
// and throws. They say on the error stream what was called.
#include <cstdio>
#include <memory>
#include <stdexcept>
#include <string>

#include "coordsys/CoordSys.h"
#include "zmcpe/CoordSysImpl.h"

#define STUB_EXPORT extern "C" __attribute__((visibility("default")))

namespace {

using zelm::CoordSysImpl;
using zelm::String;

// An object with as many references as its code says. Code 99 is one reference, and a coordinate
// system inside that is destroyed with it.
class StubCoordSys final : public CoordSysImpl {
public:
    explicit StubCoordSys(int code) : references(code == 99 ? 1 : code) {
        if (code != 99) return;
        inner = std::make_unique<zelm::CoordSys>();
        inner->impl = new StubCoordSys(1);
    }
    ~StubCoordSys() = default;

    std::int32_t ReleaseReference() override { return --references; }
    std::int32_t AddReference() override { return ++references; }
    void GetName(String& text) const override { text = "stub"; }
    void GetDatumName(String& text) const override { text = String(); }
    void GetUnitName(String& text) const override { text = "cubit"; }
    double GetUnitFactor() const override { return 0.4572; }
    std::uint32_t GetUnitKind() const override { return 0; }
    std::int32_t GetUnitCode() const override { return 0; }
    Kind GetKind() const override { return Kind::Other; }
    void GetWkt2(String& text) const override { text = String(); }
    std::size_t Transform(const CoordSysImpl&, std::size_t, double*, double*,
                          double*) const override {
        return 0;
    }

private:
    std::int32_t references;
    std::unique_ptr<zelm::CoordSys> inner;
};

}  // namespace

#if ZMC_STUB_LACKS != 1
STUB_EXPORT int Esri_Pe_Initialize(String& peDirectory, String& gdalDirectory) {
#if ZMC_STUB_LACKS == 5
    std::fprintf(stderr, "Initialize throws\n");
    throw std::runtime_error(peDirectory.GetUtf8() + std::string(gdalDirectory.GetUtf8()));
#else
    std::fprintf(stderr, "Initialize(%s,%s)\n", peDirectory.GetUtf8(), gdalDirectory.GetUtf8());
    return 1;
#endif
}
#endif
#if ZMC_STUB_LACKS != 2
STUB_EXPORT CoordSysImpl* Esri_Pe_CreateFromString(const String&) { return new StubCoordSys(1); }
#endif
#if ZMC_STUB_LACKS != 3
STUB_EXPORT CoordSysImpl* Esri_Pe_CreateFromCode(int code) { return new StubCoordSys(code); }
#endif
#if ZMC_STUB_LACKS != 4
STUB_EXPORT int Esri_Pe_Release(CoordSysImpl* impl) {
    std::fprintf(stderr, "Release\n");
    if (impl->AddReference() == 1) delete static_cast<StubCoordSys*>(impl);
    return 1;
}
#endif
