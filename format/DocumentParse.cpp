#include "format/DocumentParse.h"

#include <atomic>
#include <cstring>
#include <new>
#include <utility>

#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/sax/SAXParseException.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/XMLException.hpp>

#include "format/BoundedParser.h"
#include "format/NumberText.h"
#include "format/XercesText.h"

namespace zelm {
namespace {

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

// A parser costs three times as much to make as to use, so one is kept for the next caller; who
// finds it in other hands makes another. The last is not destroyed: its library may go before.
std::atomic<xercesc::SAXParser*> keptParser = nullptr;

std::unique_ptr<xercesc::SAXParser> TakeParser() {
    std::unique_ptr<xercesc::SAXParser> parser(keptParser.exchange(nullptr));
    if (!parser) parser = MakeDocumentParser();
    if (!parser) throw std::bad_alloc();
    return parser;
}

void KeepParser(std::unique_ptr<xercesc::SAXParser> parser) {
    const std::unique_ptr<xercesc::SAXParser> other(keptParser.exchange(parser.release()));
}

// Null if there is none. Texts are long, and this is quicker than a look at each byte.
unsigned char* FindNul(unsigned char* text, const unsigned char* behind) {
    const auto size = static_cast<std::size_t>(behind - text);
    return size == 0 ? nullptr : static_cast<unsigned char*>(std::memchr(text, 0, size));
}

// Guards a text, and parses it with the kept parser.
bool ParseWithKept(unsigned char* bytes, std::size_t size, xercesc::HandlerBase& handlers,
                   const std::function<void(const xercesc::XMLException&)>& report) {
    GuardText(bytes, size);
    std::unique_ptr<xercesc::SAXParser> parser = TakeParser();
    ParseEnd end;
    try {
        const xercesc::MemBufInputSource source(bytes, size, "document");
        end = RunParser(*parser, &handlers, source, report);
    } catch (const xercesc::OutOfMemoryException&) {
        throw std::bad_alloc();
    }
    if (!end.thrown) KeepParser(std::move(parser));
    if (end.kind == ParseEnd::Kind::OutOfMemory) throw std::bad_alloc();
    return end.kind == ParseEnd::Kind::Parsed;
}

}  // namespace

std::unique_ptr<xercesc::SAXParser> MakeDocumentParser() {
    try {
        return std::make_unique<BoundedParser<xercesc::SAXParser>>();
    } catch (...) {
        return nullptr;
    }
}

void GuardText(unsigned char* text, std::size_t size) {
    // No parser accepts this character anywhere, and no document ends with one outside ASCII.
    constexpr unsigned char refused = 1;
    unsigned char* const behind = text + size;
    for (unsigned char* at = text; (at = FindNul(at, behind)) != nullptr; ++at) *at = refused;
    for (std::size_t end = size; end != 0 && text[end - 1] >= 0x80; --end) text[end - 1] = refused;
}

ParseEnd RunParser(xercesc::SAXParser& parser, xercesc::HandlerBase* handlers,
                   const xercesc::InputSource& source,
                   const std::function<void(const xercesc::XMLException&)>& report) noexcept {
    using Kind = ParseEnd::Kind;
    try {
        const HandlerScope scope(parser, handlers);
        parser.parse(source);
        return {parser.getErrorCount() == 0 ? Kind::Parsed : Kind::Refused, false};
    } catch (const xercesc::OutOfMemoryException&) {
        return {Kind::OutOfMemory, true};
    } catch (const std::bad_alloc&) {
        return {Kind::OutOfMemory, true};
    } catch (const xercesc::XMLException& exception) {
        report(exception);
        return {Kind::Refused, true};
    } catch (...) {
        // A DocumentRefused, reported where it was found. Nothing else is thrown on purpose.
        return {Kind::Refused, true};
    }
}

std::string TextOfFault(const xercesc::SAXParseException& exception) {
    return "line " + FormatDecimal(exception.getLineNumber()) + ": " +
           ToNarrow(exception.getMessage());
}

void FaultReader::error(const xercesc::SAXParseException& exception) {
    if (fault.empty()) fault = TextOfFault(exception);
}

void FaultReader::fatalError(const xercesc::SAXParseException& exception) { error(exception); }

void FaultReader::TakeText(ElementName, std::string_view) {}

std::string ParseDocumentText(std::string text, FaultReader& reader) {
    return ParseDocumentBytes(reinterpret_cast<unsigned char*>(text.data()), text.size(), reader,
                              reader.fault);
}

std::string ParseDocumentBytes(unsigned char* bytes, std::size_t size,
                               xercesc::HandlerBase& handlers, std::string& fault) {
    const bool parsed = ParseWithKept(
        bytes, size, handlers,
        [&](const xercesc::XMLException& exception) { fault = ToNarrow(exception.getMessage()); });
    if (parsed) return "";
    return fault.empty() ? "it cannot be parsed" : fault;
}

}  // namespace zelm
