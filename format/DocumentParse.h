// One parse of a document of a pyramid file, whoever asks: the same text is believed or refused by
// the module and by hosts.
//
// Xerces-C++ has been started (XMLPlatformUtils::Initialize) by whoever comes here, and is not
// terminated before the last call. A parser serves one thread at a time.
#ifndef ZMC_FORMAT_DOCUMENTPARSE_H
#define ZMC_FORMAT_DOCUMENTPARSE_H

#include <cstddef>
#include <functional>
#include <memory>
#include <string>

#include "format/DocumentEncoding.h"
#include "format/ElementReader.h"

namespace XERCES_CPP_NAMESPACE {
class InputSource;
class SAXParseException;
class SAXParser;
class XMLException;
}  // namespace XERCES_CPP_NAMESPACE

namespace zelm {

// The parser for both documents (BoundedParser.h); null if memory ran out.
std::unique_ptr<xercesc::SAXParser> MakeDocumentParser();

// Makes the bytes of a text, in place, such that a parser judges all of them, and in proportion to
// their number. It takes a NUL behind the root element for the end of the text, and so it takes a
// character that lacks its last bytes, and would believe the front part of a torn document. It
// stores all attributes of an element before anybody is asked about it, in time and memory beyond
// all measure: behind the first that is one too many, the element ends. What is answered, if it has
// bytes, is to be parsed in place of the text: the same in an encoding that can be looked through.
// May throw std::bad_alloc.
[[nodiscard]] Utf8Document GuardText(unsigned char* text, std::size_t size);

struct ParseEnd {
    enum class Kind { Parsed, Refused, OutOfMemory };
    Kind kind = Kind::Refused;
    // Ended by an exception. The parser is of no more use: out of memory leaves one that takes
    // itself to be at work for good.
    bool thrown = false;
};

// Runs a parser over a text. What is wrong with it goes to the error handler, which `handlers`
// (null: nobody listens) are as well, or else to `report`: failures of the parser itself. Throws
// nothing.
ParseEnd RunParser(xercesc::SAXParser& parser, xercesc::HandlerBase* handlers,
                   const xercesc::InputSource& source,
                   const std::function<void(const xercesc::XMLException&)>& report) noexcept;

// What an error handler is told, for people: "line 3: ...". May throw std::bad_alloc.
std::string TextOfFault(const xercesc::SAXParseException& exception);

// Handlers for those who want to know what is wrong, and not to have it printed.
class FaultReader : public ElementReader {
public:
    std::string fault;  // the first: "line 3: ..."; empty if there is none

    // Each may throw std::bad_alloc.
    void error(const xercesc::SAXParseException& exception) override;
    void fatalError(const xercesc::SAXParseException& exception) override;

protected:
    void TakeText(ElementName name, std::string_view text) override;
};

// Parses a text of any kind: guarded, by a parser that is kept for the next caller. What is wrong
// with it, for people; empty if nothing. Throws std::bad_alloc. Any thread.
std::string ParseDocumentText(std::string text, FaultReader& reader);
// The same over bytes of the caller's, which are changed, with handlers of any kind, which leave
// the first fault that they are told of in `fault`.
std::string ParseDocumentBytes(unsigned char* bytes, std::size_t size,
                               xercesc::HandlerBase& handlers, std::string& fault);

}  // namespace zelm

#endif
