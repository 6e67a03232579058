// The documents of a dataset: from the file into a source, and from there into records and a tree.
#include <new>
#include <utility>

#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/parsers/SAXParser.hpp>
#include <xercesc/util/XMLException.hpp>

#include "format/DocumentParse.h"
#include "format/DocumentText.h"
#include "format/PyramidFront.h"
#include "format/PyramidXMLReaderHandlers.h"
#include "format/XercesText.h"
#include "pyramid/PyramidDataset.h"

namespace zelm {
namespace {

constexpr std::uint64_t kHeaderOffset = PyramidFront::kHeaderOffset;

// A source over a text, or null if memory ran out.
DocumentSource MakeSource(std::unique_ptr<XMLByte[]> text, std::size_t size, const char* name) {
    try {
        if (Utf8Document other = GuardText(text.get(), size); other.bytes) {
            text = std::move(other.bytes);
            size = other.size;
        }
        auto source = std::make_unique<xercesc::MemBufInputSource>(text.get(), size, name, true);
        text.release();
        return source;
    } catch (...) {
        return nullptr;
    }
}

// A source over `size` bytes of the file at `offset`, or null: too long, past the end of the file,
// or out of memory.
DocumentSource LoadText(files::ByteSource& file, std::uint64_t offset, std::uint64_t size,
                        const char* name) {
    const std::uint64_t fileSize = file.Size();
    if (size > kMaxDocumentBytes || offset > fileSize || size > fileSize - offset) return nullptr;
    std::unique_ptr<XMLByte[]> text(new (std::nothrow) XMLByte[static_cast<std::size_t>(size)]);
    if (!text) return nullptr;
    const std::size_t read = file.ReadAt(offset, text.get(), static_cast<std::size_t>(size));
    return MakeSource(std::move(text), read, name);
}

// The header document that ends at `end`. An end before its beginning wraps to a size that no file
// has.
DocumentSource LoadHeaderText(files::ByteSource& file, std::uint64_t end) {
    return LoadText(file, kHeaderOffset, end - kHeaderOffset, "ORVAPYRHEADER");
}

// Printed while memory may be out.
void PrintFailure(const xercesc::XMLException& exception) noexcept {
    PrintError("\nAn error occurred\n Error: ");
    PrintError(exception.getMessage());
    PrintError("\n\n");
}

int ResultOf(ParseEnd::Kind kind) {
    if (kind == ParseEnd::Kind::Parsed) return PyramidDataset::kParsed;
    if (kind == ParseEnd::Kind::Refused) return PyramidDataset::kParseError;
    PrintError("OutOfMemoryException\n");
    return PyramidDataset::kParseOutOfMemory;
}

}  // namespace

bool PyramidDataset::LoadHeaderDocument() {
    if (!File) return false;
    if (TileDataStart == kHeaderOffset) return true;
    HeaderSource = LoadHeaderText(*File, TileDataStart);
    HeaderLoaded = HeaderSource != nullptr;
    return false;
}

bool PyramidDataset::ParseHeaderDocument(PyramidHeaderRecord& out) {
    if (!HeaderLoaded && LoadHeaderDocument()) return true;
    return ParseHeaderText(HeaderSource, HeaderLoaded, out);
}

bool PyramidDataset::ParseHeaderText(DocumentSource& text, bool& loaded, PyramidHeaderRecord& out) {
    try {
        PyramidXMLReaderHandlers<char> handlers;
        if (ParseDocument(&handlers, text, loaded) != kParsed) return false;
        out = handlers.header;
        return true;
    } catch (...) {
        return false;
    }
}

// What LoadHeaderDocument and ParseHeaderDocument do, aside. An empty region leaves the record
// without a tile size, and with that refused.
bool PyramidDataset::ReadHeaderText(PyramidLayout& layout, DocumentSource& text) {
    if (layout.tileDataStart == kHeaderOffset) return true;
    text = LoadHeaderText(*File, layout.tileDataStart);
    bool loaded = text != nullptr;
    return ParseHeaderText(text, loaded, layout.header);
}

bool PyramidDataset::LoadMetaDocument() {
    if (!File) return false;
    DocumentText text = DocumentText::Take(*File, MetaDocumentOffset);
    MetaSource.reset();
    if (!text.bytes) return false;
    // A text under a store is judged like any other, and the next fetch looks again.
    const bool unfinished = text.IsUnfinished();
    MetaSource = MakeSource(std::move(text.bytes), text.size, "ORVAPYRMETA");
    MetaLoaded = MetaSource != nullptr && !unfinished;
    return MetaSource != nullptr;
}

int PyramidDataset::ParseDocument(xercesc::HandlerBase* handlers, DocumentSource& source,
                                  bool& loaded) {
    if (!source || !Parser) return kParseError;
    const ParseEnd end = RunParser(*Parser, handlers, *source, PrintFailure);
    if (end.thrown) {
        Parser = MakeDocumentParser();
        source.reset();
        loaded = false;
    }
    return ResultOf(end.kind);
}

void PyramidDataset::ReadMetaTree() {
    if (!File) return;
    if (MetaLoaded || LoadMetaDocument()) {
        metaUnknown = false;
        return MetaDocument.Await(MetaSource);
    }
    const std::uint64_t size = File->Size();
    metaUnknown = size == files::ByteSource::kUnknownSize;
    if (!metaUnknown && size > MetaDocumentOffset) MetaDocument.reset(PyramidXMLDocument::Make());
}

PyramidXMLDocument* PyramidDataset::EnsureMetaDocument() {
    if (metaUnknown) ReadMetaTree();
    return metaUnknown ? nullptr : MetaDocument.get();
}

}  // namespace zelm
