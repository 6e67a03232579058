// BoundedParser<Parser>: a Xerces parser (SAXParser or XercesDOMParser) that is safe on documents
// of unknown origin.
//
// Document types are refused, and with them all entities; nothing outside the text is ever opened;
// DocumentLimits holds. What is refused is reported to the error handler as a fatal error, and
// leaves parse as a DocumentRefused. Error handlers see all other faults as usual.
#ifndef ZMC_FORMAT_BOUNDEDPARSER_H
#define ZMC_FORMAT_BOUNDEDPARSER_H

#include <string>

#include <xercesc/framework/XMLAttr.hpp>
#include <xercesc/framework/XMLElementDecl.hpp>
#include <xercesc/framework/XMLErrorReporter.hpp>
#include <xercesc/internal/XMLScanner.hpp>
#include <xercesc/parsers/SAXParser.hpp>
#include <xercesc/util/XMLUni.hpp>

#include "format/DocumentEncoding.h"
#include "format/DocumentLimits.h"

namespace zelm {

// Thrown out of parse for a document beyond the limits.
struct DocumentRefused {};

template <class Parser>
class BoundedParser : public Parser {
public:
    BoundedParser() {
        Parser::setValidationScheme(Parser::Val_Auto);
        Parser::setDoNamespaces(false);
        Parser::setDoSchema(false);
        Parser::setValidationSchemaFullChecking(false);
        Parser::setLoadExternalDTD(false);
        Parser::setDisableDefaultEntityResolution(true);
        Scanner().setDisallowDTD(true);
    }

    // GuardText leaves no other: it would not have seen what such a text may hide.
    void XMLDecl(const XMLCh* const version, const XMLCh* const encoding,
                 const XMLCh* const standalone, const XMLCh* const actual) override {
        if (encoding && *encoding != 0 && !IsPlainEncoding(encoding))
            Demand("its encoding is declared in a way that is not read");
        Parser::XMLDecl(version, encoding, standalone, actual);
    }

    void startDocument() override {
        limits.Reset();
        Parser::startDocument();
    }

    void startElement(const xercesc::XMLElementDecl& declaration, const unsigned int url,
                      const XMLCh* const prefix,
                      const xercesc::RefVectorOf<xercesc::XMLAttr>& attributes,
                      const XMLSize_t attributeCount, const bool isEmpty,
                      const bool isRoot) override {
        const std::uint32_t outside = limits.depth;
        Demand(limits.EnterElement(declaration.getFullName(), attributeCount));
        for (XMLSize_t i = 0; i < attributeCount; ++i)
            Demand(limits.TakeName(attributes.elementAt(i)->getQName()));
        Parser::startElement(declaration, url, prefix, attributes, attributeCount, isEmpty, isRoot);
        // For an empty element one of the two parsers calls endElement and the other does not.
        if (isEmpty) limits.depth = outside;
    }

    void endElement(const xercesc::XMLElementDecl& declaration, const unsigned int url,
                    const bool isRoot, const XMLCh* const prefix) override {
        limits.LeaveElement();
        Parser::endElement(declaration, url, isRoot, prefix);
    }

    void docCharacters(const XMLCh* const text, const XMLSize_t length,
                       const bool isCData) override {
        if (isCData) Demand(limits.TakeNode());
        Parser::docCharacters(text, length, isCData);
    }

    void docComment(const XMLCh* const text) override {
        Demand(limits.TakeNode());
        Parser::docComment(text);
    }

    void docPI(const XMLCh* const target, const XMLCh* const text) override {
        Demand(limits.TakeNode());
        Parser::docPI(target, text);
    }

protected:
    DocumentLimits limits;

private:
    static xercesc::XMLScanner& AsScanner(xercesc::XMLScanner* scanner) { return *scanner; }
    static xercesc::XMLScanner& AsScanner(const xercesc::XMLScanner& scanner) {
        return const_cast<xercesc::XMLScanner&>(scanner);
    }
    xercesc::XMLScanner& Scanner() { return AsScanner(Parser::getScanner()); }

    void Demand(const char* reason) {
        if (!reason) return;
        const std::string narrow(reason);
        const std::u16string text(narrow.begin(), narrow.end());
        const xercesc::Locator& where = *Scanner().getLocator();
        Parser::error(0, xercesc::XMLUni::fgXMLErrDomain, xercesc::XMLErrorReporter::ErrType_Fatal,
                      text.c_str(), where.getSystemId(), where.getPublicId(), where.getLineNumber(),
                      where.getColumnNumber());
        throw DocumentRefused();
    }
};

}  // namespace zelm

#endif
