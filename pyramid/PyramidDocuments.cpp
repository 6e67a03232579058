// The documents of a dataset: from the file into a source, and from there into records and a tree.
#include <algorithm>
#include <new>
#include <utility>

#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/XMLException.hpp>

#include "format/BoundedParser.h"
#include "format/DocumentText.h"
#include "format/XercesText.h"
#include "pyramid/PyramidDataset.h"
#include "pyramid/PyramidXMLReaderHandlers.h"

namespace zelm {
namespace {

using PyramidFront::kHeaderOffset;

// A source over a text, or null if memory ran out.
std::unique_ptr<xercesc::MemBufInputSource> MakeSource(std::unique_ptr<XMLByte[]> text,
                                                       std::size_t size, const char* name) {
    // The parser takes a NUL behind the root element for the end of the text, and so it takes a
    // character that lacks its last bytes, and would believe the front part of a torn document. No
    // parser accepts this character anywhere, and no document ends with one outside ASCII.
    constexpr XMLByte refused = 1;
    std::replace(text.get(), text.get() + size, XMLByte{0}, refused);
    for (std::size_t end = size; end != 0 && text[end - 1] >= 0x80; --end) text[end - 1] = refused;
    try {
        auto source = std::make_unique<xercesc::MemBufInputSource>(text.get(), size, name, true);
        text.release();
        return source;
    } catch (...) {
        return nullptr;
    }
}

// A source over `size` bytes of the file at `offset`, or null: too long, past the end of the file,
// or out of memory.
std::unique_ptr<xercesc::MemBufInputSource> LoadText(files::ByteSource& file, std::uint64_t offset,
                                                     std::uint64_t size, const char* name) {
    const std::uint64_t fileSize = file.Size();
    if (size > kMaxDocumentBytes || offset > fileSize || size > fileSize - offset) return nullptr;
    std::unique_ptr<XMLByte[]> text(new (std::nothrow) XMLByte[static_cast<std::size_t>(size)]);
    if (!text) return nullptr;
    const std::size_t read = file.ReadAt(offset, text.get(), static_cast<std::size_t>(size));
    return MakeSource(std::move(text), read, name);
}

// The header document that ends at `end`. An end before its beginning wraps to a size that no file
// has.
std::unique_ptr<xercesc::MemBufInputSource> LoadHeaderText(files::ByteSource& file,
                                                           std::uint64_t end) {
    return LoadText(file, kHeaderOffset, end - kHeaderOffset, "ORVAPYRHEADER");
}

// Handlers live on the stack of their parse, so the parser forgets them with it.
class HandlerScope {
public:
    HandlerScope(xercesc::SAXParser& saxParser, xercesc::HandlerBase* handlers)
        : parser(saxParser) {
        Set(handlers);
    }
    ~HandlerScope() { Set(nullptr); }
    HandlerScope(const HandlerScope&) = delete;
    HandlerScope& operator=(const HandlerScope&) = delete;

private:
    void Set(xercesc::HandlerBase* handlers) {
        parser.setDocumentHandler(handlers);
        parser.setErrorHandler(handlers);
    }
    xercesc::SAXParser& parser;
};

int PrintOutOfMemory() {
    PrintError("OutOfMemoryException\n");
    return PyramidDataset::kParseOutOfMemory;
}

// Answers as ParseDocument does, and tells whether the parse ended by an exception.
int Parse(xercesc::SAXParser& parser, xercesc::HandlerBase* handlers,
          const xercesc::InputSource& source, bool& thrown) {
    thrown = true;
    try {
        const HandlerScope scope(parser, handlers);
        parser.parse(source);
        thrown = false;
        return parser.getErrorCount() == 0 ? PyramidDataset::kParsed : PyramidDataset::kParseError;
    } catch (const xercesc::OutOfMemoryException&) {
        return PrintOutOfMemory();
    } catch (const std::bad_alloc&) {
        return PrintOutOfMemory();
    } catch (const xercesc::XMLException& exception) {
        PrintError("\nAn error occurred\n Error: ");
        PrintError(exception.getMessage());
        PrintError("\n\n");
        return PyramidDataset::kParseError;
    } catch (const DocumentRefused&) {
        return PyramidDataset::kParseError;  // reported where it was found
    }
}

}  // namespace

std::unique_ptr<xercesc::SAXParser> MakeDocumentParser() {
    try {
        return std::make_unique<BoundedParser<xercesc::SAXParser>>();
    } catch (...) {
        return nullptr;
    }
}

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

bool PyramidDataset::ParseHeaderText(std::unique_ptr<xercesc::MemBufInputSource>& text,
                                     bool& loaded, PyramidHeaderRecord& out) {
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
bool PyramidDataset::ReadHeaderText(PyramidLayout& layout,
                                    std::unique_ptr<xercesc::MemBufInputSource>& text) {
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

int PyramidDataset::ParseDocument(xercesc::HandlerBase* handlers,
                                  std::unique_ptr<xercesc::MemBufInputSource>& source,
                                  bool& loaded) {
    if (!source || !Parser) return kParseError;
    bool thrown = false;
    int result = kParseError;
    try {
        result = Parse(*Parser, handlers, *source, thrown);
    } catch (...) {
        // Nothing else is thrown on purpose.
    }
    if (thrown) {
        // Out of memory leaves a parser that takes itself to be at work for good.
        Parser = MakeDocumentParser();
        source.reset();
        loaded = false;
    }
    return result;
}

void PyramidDataset::ReadMetaTree() {
    if (!File) return;
    const bool loaded = MetaLoaded || LoadMetaDocument();
    const std::uint64_t size = File->Size();
    metaUnknown = !loaded && size == files::ByteSource::kUnknownSize;
    if (metaUnknown || (!loaded && size <= MetaDocumentOffset)) return;
    std::unique_ptr<PyramidXMLDocument> document = PyramidXMLDocument::Make();
    if (document && loaded) document->ParseTree(*MetaSource);
    MetaDocument.reset(std::move(document));
}

PyramidXMLDocument* PyramidDataset::EnsureMetaDocument() {
    if (metaUnknown) ReadMetaTree();
    return metaUnknown ? nullptr : MetaDocument.get();
}

}  // namespace zelm
