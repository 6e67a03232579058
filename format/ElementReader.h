// ElementReader: hears a parser out, and tells which element a piece of text belongs to.
//
// SAX callbacks over a stack of element states: the state on top decides what a piece of text
// means, and nothing checks that an element has the right parent. One object serves one parse.
//
// The parser may deliver a text in pieces. Each piece is taken for a whole value: of a number the
// last piece counts.
#ifndef ZMC_FORMAT_ELEMENTREADER_H
#define ZMC_FORMAT_ELEMENTREADER_H

#include <cstdint>
#include <deque>
#include <string>
#include <string_view>

#include <xercesc/sax/HandlerBase.hpp>

#include "format/ElementNames.h"

namespace zelm {

// State of an open element: 0 for a name that is not in the list, else its place there counted from
// 1, except that HEADER and PALETTE have changed places.
constexpr std::int32_t StateOf(int position) {
    if (position == static_cast<int>(ElementName::PALETTE)) return 5;
    if (position == static_cast<int>(ElementName::HEADER)) return 4;
    return position + 1;
}
constexpr std::int32_t StateOf(ElementName name) { return StateOf(static_cast<int>(name)); }

class ElementReader : public xercesc::HandlerBase {
public:
    std::deque<std::int32_t> stateStack;  // of the open elements, the root first

    void startElement(const XMLCh* const name, xercesc::AttributeList& attributes) override;
    void endElement(const XMLCh* const name) override;
    void characters(const XMLCh* const text, const XMLSize_t length) override;

protected:
    // An element of that state was opened, or closed. Default: nothing.
    virtual void Enter(std::int32_t state);
    virtual void Leave(std::int32_t state);
    // A piece of text of an element that holds text. What is not ASCII has become '?'.
    virtual void TakeText(ElementName name, std::string_view text) = 0;

private:
    std::string narrow;  // the piece of text in hand
};

}  // namespace zelm

#endif
