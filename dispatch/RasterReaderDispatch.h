// RasterReaderDispatch: a reader whose pixel type is known at run time alone.
//
// A tagged union of twelve reader pointers, of which the one of code `pixelType` holds the reader;
// in an invalid dispatch all are empty and `pixelType` is 0. The state is fixed by the constructor,
// so several threads may look at it.
//
// A host reaches the typed reader by Visit, whatever the type:
//     dispatch->Visit([&](auto& reader) { reader.ReadTile(...); });
// or, when it knows the type, by As<T>() or the member itself:
//     if (auto& reader = dispatch->As<float>()) reader->ReadTile(...);
//
// A reader belongs to one thread at a time, whichever way it was reached; so two threads that read
// at once open a connection each.
#ifndef ZMC_DISPATCH_RASTERREADERDISPATCH_H
#define ZMC_DISPATCH_RASTERREADERDISPATCH_H

#include <cstdint>
#include <utility>

#include "core/ElementTypes.h"
#include "core/ErrorState.h"
#include "core/Pointer.h"
#include "raster/RasterReader.h"

namespace zelm {

class RasterReaderDispatch : public ErrorState {
public:
    // readerByte, readerChar, ...: one pointer for each element type, in the order of the list.
#define ZMC_X(type, name, code) RasterReaderPtr<type> reader##name;
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    std::uint32_t pixelType = 0;  // 0 until a reader is bound

    RasterReaderDispatch();  // invalid
    // Takes a reference of its own; a pointer without a reader gives an invalid dispatch.
#define ZMC_X(type, name, code) explicit RasterReaderDispatch(RasterReaderPtr<type> reader);
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

    // The answers of the bound reader; a default record and false from an invalid dispatch. Neither
    // throws: properties that cannot be had, because memory runs out or the host's georeference
    // throws, are a record that is not valid and has no interleave, not even None.
    RasterProps GetRasterProps() const;
    bool IsValidLevel() const;

    // Calls visit(RasterReader<T>&) with the bound reader; false, without a call, if there is none.
    template <class Visitor>
    bool Visit(Visitor&& visit) const {
        switch (pixelType) {
#define ZMC_X(type, name, code)                      \
    case code:                                       \
        if (!reader##name) return false;             \
        std::forward<Visitor>(visit)(*reader##name); \
        return true;
            ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
            default:
                return false;
        }
    }

    // The pointer of element type T, which is empty unless T is the pixel type. Copy it to keep the
    // reader beyond the life of the dispatch.
    template <class T>
    const RasterReaderPtr<T>& As() const {
        return Member(std::type_identity<T>{});
    }

private:
#define ZMC_X(type, name, code) \
    const RasterReaderPtr<type>& Member(std::type_identity<type>) const { return reader##name; }
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

    void ResetReaders();
    template <class T>
    void Bind(RasterReaderPtr<T>& member, RasterReaderPtr<T> reader);
};

// Shares one dispatch among its copies; what RasterDataConnection::GetReader gives.
class RasterReaderDispatchPtr : public Pointer<RasterReaderDispatch> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
