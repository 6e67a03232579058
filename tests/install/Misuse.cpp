// Uses of the interface that its types forbid, one for each value of ZMC_MISUSE.
#include "colour/Palette.h"
#include "connection/DataConnectionFactory.h"
#include "connection/RasterDataConnection.h"
#include "dispatch/RasterReaderDispatch.h"
#include "metadata/Metadata.h"

using namespace zelm;

struct FirstBase {
    virtual ~FirstBase() = default;
    int first = 1;
};
struct SecondBase {
    virtual ~SecondBase() = default;
    int second = 2;
};
struct OfTwo : FirstBase, SecondBase {};
struct OfVirtual : virtual FirstBase {};
struct PlainBase {
    int plain = 3;
};
struct OfPlain : PlainBase {
    PalettePtr owned;
};

void Misuse(RasterReaderDispatch& dispatch, RasterReaderPtr<int> ints, DataConnectionPtr connection,
            RasterDataConnectionPtr raster, PalettePtr palette, Palette& colors, Color& color) {
#if ZMC_MISUSE == 1
    RasterReaderPtr<int> reader = dispatch.As<float>();  // misuse 1: a reader of another type
#elif ZMC_MISUSE == 2
    Pointer<DataConnection> other(palette);  // misuse 2: a pointer to an unrelated class
#elif ZMC_MISUSE == 3
    RasterDataConnectionPtr narrowed(connection);  // misuse 3: from base to derived
#elif ZMC_MISUSE == 4
    PalettePtr taken = &colors;  // misuse 4: ownership taken silently
#elif ZMC_MISUSE == 5
    Palette copy(colors);  // misuse 5: a copy that would share the colours
#elif ZMC_MISUSE == 6
    color = Color();  // misuse 6: assignment that would slice
#elif ZMC_MISUSE == 7
    DataConnectionFactory factory;  // misuse 7: an interface is not an object
#elif ZMC_MISUSE == 8
    Pointer<SecondBase> second{Pointer<OfTwo>()};  // misuse 8: a base at another address
#elif ZMC_MISUSE == 9
    Pointer<FirstBase> first{Pointer<OfVirtual>()};  // misuse 9: a base somewhere in the object
#elif ZMC_MISUSE == 10
    Pointer<PlainBase> plain{Pointer<OfPlain>()};  // misuse 10: a destructor that would be skipped
#elif ZMC_MISUSE == 11
    Pointer<PlainBase> plain(new OfPlain);  // misuse 11: likewise, of an object taken over
#elif ZMC_MISUSE == 12
    Pointer<PlainBase>().Reset(new OfPlain);  // misuse 12: likewise, later
#else
    Pointer<FirstBase> first{Pointer<OfTwo>()};
    first.Reset(new OfVirtual);
    Pointer<SecondBase> second(new OfTwo);
    Pointer<PlainBase> plain(new PlainBase);
    plain.Reset(new PlainBase);
    plain.Reset(nullptr);
    Pointer<OfPlain> derived(new OfPlain);
    RasterReaderPtr<int> reader = dispatch.As<int>();
    Pointer<DataConnection> other(raster);
    RasterReaderDispatch bound(ints);
    PalettePtr taken(new Palette);
    Palette copy;
    colors.CopyTo(copy);
    color.Assign(Color());
    DataConnectionFactory* factory = nullptr;
    static_cast<void>(factory);
    static_cast<void>(connection);
    static_cast<void>(palette);
#endif
}
