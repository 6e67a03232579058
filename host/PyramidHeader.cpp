#include "host/PyramidHeader.h"

#include <cstring>
#include <map>
#include <memory>
#include <sstream>
#include <vector>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/internal/XMLScanner.hpp>
#include <xercesc/parsers/SAXParser.hpp>
#include <xercesc/sax/HandlerBase.hpp>
#include <xercesc/sax/SAXParseException.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/XMLException.hpp>

#include "core/PixelVocabulary.h"
#include "host/Error.h"
#include "host/Text.h"
#include "host/Xerces.h"
#include "platform/File.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

// These stand in files and never change.
constexpr char kMagic[] = {'K', 'O', 'B', 'T'};
constexpr std::uint64_t kDocumentOffset = 20;
constexpr std::uint64_t kMaxDocument = 1 << 20;
constexpr std::uint32_t kMaxTileSize = 2048;
constexpr std::uint32_t kMaxLevel = 63;

[[noreturn]] void Refuse(const std::string& file, const std::string& reason) {
    throw Error(file, "read the header", reason);
}

// Text of the elements by name; the header's elements do not nest.
class Texts : public xercesc::HandlerBase {
public:
    std::map<std::string, std::string> byName;

    void startElement(const XMLCh* name, xercesc::AttributeList&) override {
        current = Narrow(zelm::String(name));
        byName[current].clear();
    }
    void endElement(const XMLCh*) override { current.clear(); }
    void characters(const XMLCh* text, XMLSize_t length) override {
        if (current.empty()) return;
        const std::u16string piece(text, length);
        byName[current] += Narrow(zelm::String(piece.c_str()));
    }
    void error(const xercesc::SAXParseException& failure) override { throw failure; }
    void fatalError(const xercesc::SAXParseException& failure) override { throw failure; }

private:
    std::string current;
};

// A header has no document type; one that has is hostile.
class Parser : public xercesc::SAXParser {
public:
    Parser() {
        setValidationScheme(Val_Never);
        setDoNamespaces(false);
        setDoSchema(false);
        setLoadExternalDTD(false);
        setDisableDefaultEntityResolution(true);
        const_cast<xercesc::XMLScanner&>(getScanner()).setDisallowDTD(true);
    }
};

std::map<std::string, std::string> ParseDocument(const std::string& file,
                                                 const std::vector<unsigned char>& document) {
    InitialiseXerces();
    try {
        Texts texts;
        Parser parser;
        parser.setDocumentHandler(&texts);
        parser.setErrorHandler(&texts);
        const xercesc::MemBufInputSource source(document.data(), document.size(), "header");
        parser.parse(source);
        return std::move(texts.byName);
    } catch (const xercesc::SAXException& failure) {
        Refuse(file, Narrow(zelm::String(failure.getMessage())));
    } catch (const xercesc::XMLException& failure) {
        Refuse(file, Narrow(zelm::String(failure.getMessage())));
    } catch (const xercesc::OutOfMemoryException&) {
        throw std::bad_alloc();
    }
}

std::vector<unsigned char> ReadDocument(const std::string& file, PyramidHeader& header) {
    const zelm::String name = WideFileName(file);
    const auto stream = platform::File::Open(name.wide, platform::File::Mode::Read);
    if (!stream) Refuse(file, platform::LastErrorText());
    unsigned char start[kDocumentOffset];
    if (stream->ReadAt(0, start, sizeof start) != sizeof start ||
        std::memcmp(start, kMagic, sizeof kMagic) != 0)
        Refuse(file, "it is no pyramid file");
    for (unsigned i = 0; i < 8; ++i) header.tileDataStart |= std::uint64_t{start[4 + i]} << (8 * i);
    header.fileSize = stream->Size();
    if (header.tileDataStart <= kDocumentOffset ||
        header.tileDataStart - kDocumentOffset > kMaxDocument ||
        header.tileDataStart > header.fileSize)
        Refuse(file, "its header is damaged or was never finished");
    std::vector<unsigned char> document(header.tileDataStart - kDocumentOffset);
    if (stream->ReadAt(kDocumentOffset, document.data(), document.size()) != document.size())
        Refuse(file, "its header cannot be read");
    return document;
}

class Fields {
public:
    explicit Fields(std::map<std::string, std::string> texts) : byName(std::move(texts)) {}

    std::uint32_t Number(const char* name) {
        std::uint32_t value = 0;
        Stream(name) >> value;
        return value;
    }
    template <class Code>
    Code Word(const char* name, void (*parse)(std::istream&, Code&)) {
        Code code{};
        auto stream = Stream(name);
        parse(stream, code);
        return code;
    }

private:
    std::istringstream Stream(const char* name) { return std::istringstream(byName[name]); }
    std::map<std::string, std::string> byName;
};

void Check(const std::string& file, const PyramidHeader& header) {
    if (header.tileSize == 0 || header.tileSize > kMaxTileSize)
        Refuse(file, "its tile size is " + std::to_string(header.tileSize));
    if (header.minLevel > header.maxLevel || header.maxLevel > kMaxLevel)
        Refuse(file, "its levels are " + std::to_string(header.minLevel) + " to " +
                         std::to_string(header.maxLevel));
    if (zelm::CheckedPixelType(header.pixelType) == 0) Refuse(file, "its pixel type is not known");
}

}  // namespace

std::uint64_t PyramidHeader::LevelBytes(std::uint32_t level) const {
    return (std::uint64_t{width} >> level) * (std::uint64_t{height} >> level) * bands *
           zelm::PixelSize(pixelType);
}

std::uint64_t PyramidHeader::LevelOffset(std::uint32_t level) const {
    std::uint64_t offset = tileDataStart;
    for (std::uint32_t coarser = maxLevel; coarser > level; --coarser)
        offset += LevelBytes(coarser);
    return offset;
}

PyramidHeader PyramidHeader::Read(const std::string& file) {
    PyramidHeader header;
    Fields fields(ParseDocument(file, ReadDocument(file, header)));
    header.versionMajor = fields.Number("HEADER_VERSION_MAJOR");
    header.versionMinor = fields.Number("HEADER_VERSION_MINOR");
    header.bands = fields.Number("HEADER_BANDS");
    header.width = fields.Number("HEADER_PIXEL_WIDTH");
    header.height = fields.Number("HEADER_PIXEL_HEIGHT");
    header.tileSize = fields.Number("HEADER_TILESIZE");
    header.minLevel = fields.Number("HEADER_LEVELMIN");
    header.maxLevel = fields.Number("HEADER_LEVELMAX");
    header.pixelType = fields.Word("HEADER_PIXEL_TYPE", zelm::ParsePixelType);
    header.interleave = fields.Word("HEADER_INTERLEAVE", zelm::ParseInterleave);
    header.tileOrdering = fields.Word("HEADER_BUILD_METHOD", zelm::ParseTileOrder);
    Check(file, header);
    header.tileDataEnd = header.LevelOffset(header.minLevel) + header.LevelBytes(header.minLevel);
    return header;
}

}  // namespace zmchost
