// A georeference that counts its living copies and remembers the sizes that it was told, and that
// throws when it is asked to.
#ifndef ZMC_TESTS_SUPPORT_COUNTINGGEOREF_H
#define ZMC_TESTS_SUPPORT_COUNTINGGEOREF_H

#include <new>
#include <stdexcept>

#include "core/GeoRef.h"

namespace zmctest {

class CountingGeoRef : public zelm::GeoRef {
public:
    static inline int living = 0;
    static inline int clonesBeforeThrow = -1;  // how many succeed before one throws; -1: all
    static inline bool sizeThrows = false;
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

    GeoRef* Clone() const override {
        if (clonesBeforeThrow == 0) throw std::runtime_error("clone");
        if (clonesBeforeThrow > 0) --clonesBeforeThrow;
        return new (std::nothrow) CountingGeoRef(*this);
    }
    void SetRasterSize(std::uint32_t s, std::uint32_t l) override {
        if (sizeThrows) throw std::runtime_error("size");
        samples = s;
        lines = l;
        ++tellings;
    }
};

// While one lives, the clone after the first `successes` throws.
class ThrowingClones {
public:
    explicit ThrowingClones(int successes = 0) { CountingGeoRef::clonesBeforeThrow = successes; }
    ~ThrowingClones() { CountingGeoRef::clonesBeforeThrow = -1; }
    ThrowingClones(const ThrowingClones&) = delete;
    ThrowingClones& operator=(const ThrowingClones&) = delete;
};

}  // namespace zmctest

#endif
