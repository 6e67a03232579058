// What every kind of connection does with the reader that it builds once and keeps.
#ifndef ZMC_DISPATCH_CONNECTIONREADER_H
#define ZMC_DISPATCH_CONNECTIONREADER_H

#include <cstdint>
#include <new>
#include <utility>

#include "core/ElementTypes.h"
#include "dispatch/RasterReaderDispatch.h"
#include "raster/RasterPropsCopy.h"

namespace zelm {

// A dispatch around make(std::type_identity<T>{}), which returns a new RasterReader<T>. A pixel
// type without a reader gives an invalid dispatch; memory that runs out gives a null pointer
// instead, which nobody should keep.
template <class Make>
RasterReaderDispatchPtr MakeDispatch(std::uint32_t pixelType, Make&& make) {
    RasterReaderDispatchPtr dispatch;
    const bool known = VisitElementType(pixelType, [&](auto type) {
        using T = typename decltype(type)::type;
        const RasterReaderPtr<T> typed(make(type));
        if (typed) dispatch.Reset(new (std::nothrow) RasterReaderDispatch(typed));
    });
    if (!known) dispatch.Reset(new (std::nothrow) RasterReaderDispatch);
    if (dispatch && known && dispatch->pixelType != pixelType) dispatch.Reset();
    return dispatch;
}

// The dispatch in `kept`, made on the first call; null, with nothing kept, where memory ran out.
template <class Make>
RasterReaderDispatchPtr KeptDispatch(RasterReaderDispatchPtr& kept, std::uint32_t pixelType,
                                     Make&& make) {
    try {
        if (!kept) kept = MakeDispatch(pixelType, make);
        return kept;
    } catch (...) {
        return RasterReaderDispatchPtr();
    }
}

// Takes the reader's properties over into `props` and returns a copy: no-data values that were set
// on the reader arrive so, and an invalid dispatch, whose record is the default one, resets them.
// Where memory ran out or the host's georeference threw, `props` stays and the default record is
// returned.
inline RasterProps RefreshedProps(const RasterReaderDispatchPtr& dispatch, RasterProps& props) {
    try {
        if (!dispatch) return props;
        RasterProps known = dispatch->GetRasterProps();
        if (known.interleave == kNoLayout) return RasterProps();
        RasterProps answer(known);
        props = std::move(known);
        return answer;
    } catch (...) {
        return RasterProps();
    }
}

}  // namespace zelm

#endif
