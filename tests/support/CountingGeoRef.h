// A georeference that counts its living copies and remembers the sizes that it was told.
#ifndef ZMC_TESTS_SUPPORT_COUNTINGGEOREF_H
#define ZMC_TESTS_SUPPORT_COUNTINGGEOREF_H

#include <new>

#include "core/GeoRef.h"

namespace testsupport {

class CountingGeoRef : public zelm::GeoRef {
public:
    static inline int living = 0;
    std::uint32_t samples = 0;
    std::uint32_t lines = 0;
    int tellings = 0;

    CountingGeoRef() { ++living; }
    CountingGeoRef(const CountingGeoRef& other)
        : GeoRef(), samples(other.samples), lines(other.lines), tellings(other.tellings) {
        ++living;
    }
    ~CountingGeoRef() override { --living; }
    CountingGeoRef& operator=(const CountingGeoRef&) = delete;

    GeoRef* Clone() const override { return new (std::nothrow) CountingGeoRef(*this); }
    void SetRasterSize(std::uint32_t s, std::uint32_t l) override {
        samples = s;
        lines = l;
        ++tellings;
    }
};

}  // namespace testsupport

#endif
