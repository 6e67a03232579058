// The smallest host: links the interface, loads the module by path, asks it for a factory. Also
// proof that the package's headers and libraries are enough, and that both spellings of a header
// work.
#include <dlfcn.h>

#include <zmcraster/connection/RasterDataConnection.h>
#include <cstdio>

#include "connection/DataConnectionFactory.h"
#include "zmcg/zmcg.h"

using namespace zelm;

namespace {

int Fail(const char* what) {
    std::printf("failed: %s\n", what);
    return 1;
}

// Names every part of the interface that is not inline, so that a missing library shows.
bool InterfaceLinks() {
    Array<String> words;
    words.Append("word");
    RasterProps props;
    props.SetBands(1);
    props.SetNoDataValue(0, 1.0);
    Palette palette;
    palette.AddColor(Color());
    const RasterReaderDispatch dispatch;
    return words.data[0] == "word" && RasterProps(props).HasNoDataValue(0) &&
           palette.nextIndex == 1 && !dispatch.GetRasterProps().IsValid() &&
           GloballyUniqueObjectTypeCode("Object") == Object::typeCode;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 2) return Fail("no module named");
    if (!InterfaceLinks()) return Fail("interface");
    void* const module = dlopen(argv[1], RTLD_NOW | RTLD_LOCAL);
    if (!module) return Fail(dlerror());
    const auto create = reinterpret_cast<decltype(&CreateDataConnectionFactory)>(
        dlsym(module, "CreateDataConnectionFactory"));
    const auto destroy = reinterpret_cast<decltype(&DeleteDataConnectionFactory)>(
        dlsym(module, "DeleteDataConnectionFactory"));
    if (!create || !destroy) return Fail("entry points");
    DataConnectionFactory* const factory = create("MemoryRaster");
    if (!factory) return Fail("factory");
    Array<String> argument;
    argument.Append("MemoryRaster");
    argument.Append("samples=1;lines=1;pixeldata=0");
    if (!factory->IsRasterFactory() || !factory->Test(argument)) return Fail("test");
    if (factory->CreateDefault()) return Fail("default");
    destroy(factory);
    if (create("another")) return Fail("foreign kind");
    std::printf("host ran\n");
    return 0;
}
