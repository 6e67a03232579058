#include "host/file/MetadataDocument.h"

#include <set>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/internal/XMLScanner.hpp>
#include <xercesc/parsers/SAXParser.hpp>
#include <xercesc/sax/HandlerBase.hpp>
#include <xercesc/sax/SAXParseException.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/XMLException.hpp>

#include "host/base/Error.h"
#include "host/base/Text.h"
#include "host/base/Xerces.h"
#include "platform/File.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

// The bounds of readers, so that no text can make the parser slow or large; names of the format
// count here as well.
constexpr std::uint32_t kMaxDepth = 64;
constexpr std::uint32_t kMaxElements = 1u << 20;
constexpr std::size_t kMaxNames = 256 + 39;

struct Refused {
    std::string reason;
};

// Refuses document types; that method is not public.
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

class Watcher : public xercesc::HandlerBase {
public:
    void startElement(const XMLCh* const name, xercesc::AttributeList&) override {
        if (elements == 0) root = name;
        names.insert(name);
        if (++depth > kMaxDepth) throw Refused{"its elements are nested too deeply"};
        if (++elements > kMaxElements) throw Refused{"it has too many elements"};
        if (names.size() > kMaxNames) throw Refused{"it has too many different names"};
    }
    void endElement(const XMLCh* const) override { --depth; }
    void error(const xercesc::SAXParseException& fault) override { Refuse(fault); }
    void fatalError(const xercesc::SAXParseException& fault) override { Refuse(fault); }

    std::u16string root;

private:
    [[noreturn]] static void Refuse(const xercesc::SAXParseException& fault) {
        throw Refused{"line " + std::to_string(fault.getLineNumber()) + ": " +
                      Narrow(zelm::String(fault.getMessage()))};
    }
    std::set<std::u16string> names;
    std::uint32_t depth = 0;
    std::uint32_t elements = 0;
};

// Throws Refused.
void ParseText(std::string_view text, Watcher& watcher) {
    try {
        const xercesc::MemBufInputSource source(reinterpret_cast<const XMLByte*>(text.data()),
                                                text.size(), "metadata");
        Parser parser;
        parser.setDocumentHandler(&watcher);
        parser.setErrorHandler(&watcher);
        parser.parse(source);
    } catch (const xercesc::OutOfMemoryException&) {
        throw std::bad_alloc();
    } catch (const xercesc::XMLException& fault) {
        throw Refused{Narrow(zelm::String(fault.getMessage()))};
    }
}

}  // namespace

std::string JudgeMetadataText(std::string_view text) {
    const std::string subject = "the metadata document ";
    if (text.find_first_not_of(" \t\r\n") == text.npos) return subject + "is empty";
    if (text.front() == kUnfinishedStore) return subject + "is damaged: a store did not end";
    if (text.find('\0') != text.npos) return subject + "holds bytes of 0";
    // The parser would take the beginning of one for the end of the text.
    if ((text.back() & 0x80) != 0) return subject + "ends in the middle of a character";
    InitialiseXerces();
    Watcher watcher;
    try {
        ParseText(text, watcher);
    } catch (const Refused& refused) {
        return subject + "is malformed: " + refused.reason;
    }
    return watcher.root == u"DATASET" ? "" : subject + "has no root DATASET";
}

std::string ReadMetadataText(const std::string& file, const PyramidHeader& header) {
    const auto fail = [&](const std::string& reason) {
        throw Error(file, "read its metadata document", reason);
    };
    const auto stream = platform::File::Open(WideFileName(file).wide, platform::File::Mode::Read);
    if (!stream) fail(platform::LastErrorText());
    std::uint64_t size = 0;
    if (!stream->TellSize(size)) fail(platform::LastErrorText());
    if (size <= header.tileDataEnd) return "";
    if (size - header.tileDataEnd > kMaxMetadataDocument) fail("it is longer than 256 MiB");
    std::string text(static_cast<std::size_t>(size - header.tileDataEnd), '\0');
    if (stream->ReadAt(header.tileDataEnd, text.data(), text.size()) != text.size())
        fail(platform::LastErrorText());
    return text;
}

std::string JudgeMetadata(const std::string& file, const PyramidHeader& header) {
    const std::uint64_t size = platform::StatusOf(file).size;
    if (size > header.tileDataEnd && size - header.tileDataEnd > kMaxMetadataDocument)
        return "the metadata document is longer than 256 MiB";
    const std::string text = ReadMetadataText(file, header);
    return text.empty() ? "" : JudgeMetadataText(text);
}

}  // namespace zmchost
