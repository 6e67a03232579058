#include "dispatch/RasterReaderDispatch.h"

#include "raster/RasterPropsCopy.h"

namespace zelm {

RasterReaderDispatch::RasterReaderDispatch() {
    ResetReaders();
    SetError(RasterReaderErrorInvalid());
}

#define ZMC_X(type, name, code)                                                \
    RasterReaderDispatch::RasterReaderDispatch(RasterReaderPtr<type> reader) { \
        Bind(reader##name, reader);                                            \
    }
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

RasterProps RasterReaderDispatch::GetRasterProps() const {
    try {
        RasterProps props;
        Visit([&props](auto& reader) { props = reader.GetRasterProps(); });
        return props;
    } catch (...) {  // a reader of somebody else's
        return PropsNotCopied();
    }
}

bool RasterReaderDispatch::IsValidLevel() const {
    bool valid = false;
    Visit([&valid](auto& reader) { valid = reader.IsValidLevel(0); });
    return valid;
}

void RasterReaderDispatch::ResetReaders() {
#define ZMC_X(type, name, code) reader##name.Reset();
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    pixelType = 0;
}

template <class T>
void RasterReaderDispatch::Bind(RasterReaderPtr<T>& member, RasterReaderPtr<T> reader) {
    ResetReaders();
    member = reader;
    if (member)
        pixelType = ElementTraits<T>::code;
    else
        SetError(RasterReaderErrorInvalid());
}

}  // namespace zelm
