#include "format/DocumentParse.h"

#include <algorithm>
#include <atomic>
#include <cstring>
#include <new>
#include <utility>

#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/sax/SAXParseException.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/XMLException.hpp>

#include "format/BoundedParser.h"
#include "format/DocumentLimits.h"
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
    const Utf8Document other = GuardText(bytes, size);
    if (other.bytes) {
        bytes = other.bytes.get();
        size = other.size;
    }
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

// A look through a text for elements with too many attributes. Where it is malformed the look may
// go astray: a parser does not come behind that place.
class AttributeGuard {
public:
    AttributeGuard(unsigned char* text, unsigned char* behind) : at(text), end(behind) {}

    void Run() {
        while ((at = Find(at, '<')) != end && ++at != end)
            if (*at == '?')
                Skip(1, '?', 1);
            else if (*at == '!')
                SkipMarkup();
            else
                Look();
    }

private:
    unsigned char* Find(unsigned char* from, unsigned char sign) const {
        const auto size = static_cast<std::size_t>(end - from);
        void* const found = size == 0 ? nullptr : std::memchr(from, sign, size);
        return found ? static_cast<unsigned char*>(found) : end;
    }

    // Comments and CDATA sections. Nothing is read behind a document type.
    void SkipMarkup() {
        const unsigned char kind = end - at > 1 ? at[1] : 0;
        if (kind == '-') return Skip(3, '-', 2);  // !--
        if (kind == '[') return Skip(8, ']', 2);  // ![CDATA[
        at = end;
    }

    // Goes behind what begins with so many bytes, may hold anything, and ends with a sign, given
    // once or twice, and the one that closes.
    void Skip(std::ptrdiff_t start, unsigned char sign, std::ptrdiff_t times) {
        if (end - at < start) {
            at = end;
            return;
        }
        unsigned char* const content = at + start;
        for (at = content; (at = Find(at, '>')) != end; ++at)
            if (at - content >= times &&
                std::all_of(at - times, at, [sign](unsigned char each) { return each == sign; }))
                return;
    }

    // Goes through one start tag.
    void Look() {
        std::uint32_t attributes = 0;
        for (; at != end && *at != '>' && *at != '<'; ++at) {
            if (*at == '=') ++attributes;
            if (*at != '"' && *at != '\'') continue;
            at = Find(at + 1, *at);
            if (at == end) return;
            if (attributes > kMaxAttributes && at + 1 != end) {
                at[1] = '>';
                at = end;
                return;
            }
        }
    }

    unsigned char* at;
    unsigned char* end;
};

}  // namespace

std::unique_ptr<xercesc::SAXParser> MakeDocumentParser() {
    try {
        return std::make_unique<BoundedParser<xercesc::SAXParser>>();
    } catch (...) {
        return nullptr;
    }
}

Utf8Document GuardText(unsigned char* text, std::size_t size) {
    // No parser accepts this character anywhere, and no document ends with one outside ASCII.
    constexpr unsigned char refused = 1;
    unsigned char* const behind = text + size;
    for (unsigned char* at = text; (at = FindNul(at, behind)) != nullptr; ++at) *at = refused;
    for (std::size_t end = size; end != 0 && text[end - 1] >= 0x80; --end) text[end - 1] = refused;
    Utf8Document other = ToUtf8(text, size);
    if (other.bytes)
        AttributeGuard(other.bytes.get(), other.bytes.get() + other.size).Run();
    else
        AttributeGuard(text, behind).Run();
    return other;
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

// cppcheck-suppress passedByValue ; the parse changes its own copy
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
