// The metadata document of a file: whatever text stands there is read for one of the element types,
// added to, and read again by another dataset. The length of the input chooses the type.
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <xercesc/framework/MemBufInputSource.hpp>

#include "core/ElementTypes.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/Host.h"
#include "fuzz/support/InputBytes.h"
#include "fuzz/support/MemoryFile.h"
#include "fuzz/support/Records.h"
#include "fuzz/support/StoreCheck.h"
#include "pyramid/PyramidDataConnection.h"
#include "pyramid/PyramidDataset.h"
#include "pyramid/PyramidRasterReader.h"
#include "tests/support/PyramidFiles.h"

namespace {

using namespace zelm;
using zmcfuzz::InputBytes;
using zmcfuzz::MemoryFile;

// An array that is a view of somebody's buffer takes what fits in it.
template <class T>
void ExpectFits(PyramidDataset& dataset, const zmcfuzz::Records<T>& all) {
    RasterBandStats<T> room[2];
    Array<RasterBandStats<T>> view(room, ArrayShape(2));
    ZMC_EXPECT(dataset.LoadBandStats(view) == all.readable);
    for (std::uint32_t i = 0; i < 2 && i < all.stats.shape.elements; ++i)
        ZMC_EXPECT(zmcfuzz::Same(room[i], all.stats.data[i]));
}

// A connection as hosts have it: all answers of the reader, a store, and another dataset that finds
// what the first one left.
template <class T>
void UseAsHost(MemoryFile& file, InputBytes& input) {
    // A document that is too long to read is left alone.
    if (input.UpTo(31) == 31) file.Extend(kMaxDocumentBytes + 1);
    Array<String> name;
    ZMC_EXPECT(name.Append(String(file.Name().c_str())));
    PyramidDataConnection connection;
    ZMC_EXPECT(connection.Open(name, GeoRefPtr(), MetadataPtr()));
    PyramidDataset& dataset = *connection.dataset;
    zmcfuzz::Records<T> here, there;
    here.Load(dataset);
    ExpectFits(dataset, here);
    const PyramidRasterReader<T> reader(&connection, GeoRefPtr(), MetadataPtr());
    zmcfuzz::ExpectAnswers<T>(reader, here, input.UpTo(3));
    zmcfuzz::StoreCheck<T>(dataset, file).Run(input);
    here.Load(dataset);
    PyramidDataset other(String(file.Name().c_str()));
    ZMC_EXPECT(!other.ReadHeader());
    there.Load(other);
    ZMC_EXPECT(here == there);
}

// The same document put under a dataset that stays open, as opening one reads it, and stored to:
// the parser goes from input to input, and most of the time goes to the document.
template <class T>
void UseOpenDataset(MemoryFile& file, InputBytes& input) {
    static PyramidDataset dataset(String(file.Name().c_str()));
    if (!dataset.File) ZMC_EXPECT(!dataset.ReadHeader());
    dataset.MetaLoaded = false;
    dataset.MetaSource.reset();
    dataset.MetaDocument = DocumentOnDemand();
    if (file.Size() > dataset.MetaDocumentOffset) dataset.ReadMetaTree();
    zmcfuzz::StoreCheck<T>(dataset, file).Run(input);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static MemoryFile file;
    static const std::string front = zmctest::HeaderText{.width = 1, .height = 1}.File();
    const std::string_view text(reinterpret_cast<const char*>(data), size);
    const std::size_t type = size % 12;
    file.Assign(front + std::string(text));
    // The records to store are made of the document's own bytes.
    InputBytes input(data + size / 3, size - size / 3);
    const bool asHost = input.UpTo(3) == 0;
    std::size_t next = 0;
#define ZMC_X(type_, name, code) \
    if (next++ == type) asHost ? UseAsHost<type_>(file, input) : UseOpenDataset<type_>(file, input);
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    return 0;
}
