// A reader that has properties and no pixels: all that the mask functions ask of one.
#ifndef ZMC_TESTS_DISPATCH_PROPSREADER_H
#define ZMC_TESTS_DISPATCH_PROPSREADER_H

#include "raster/ReaderRasterMemory.h"

namespace zmctest {

using namespace zelm;

template <class T>
ReaderRasterMemory<T> PropsReader(std::int32_t interleave, std::uint32_t bands = 3) {
    RasterProps props;
    props.interleave = interleave;
    props.bands = bands;
    props.pixelType = ElementTraits<T>::code;
    return ReaderRasterMemory<T>(nullptr, props);
}

}  // namespace zmctest

#endif
