#include "format/ElementReader.h"

#include "format/XercesText.h"

namespace zelm {

void ElementReader::startElement(const XMLCh* const name, xercesc::AttributeList&) {
    const std::u16string_view view = name ? name : std::u16string_view();
    stateStack.push_back(StateOf(FindElementName(view)));
    Enter(stateStack.back());
}

void ElementReader::endElement(const XMLCh* const) {
    if (stateStack.empty()) return;
    const std::int32_t state = stateStack.back();
    stateStack.pop_back();
    Leave(state);
}

void ElementReader::characters(const XMLCh* const text, const XMLSize_t length) {
    const std::int32_t state = stateStack.empty() ? 0 : stateStack.back();
    // The elements that hold elements, and those that nobody knows, have no text of their own.
    if (state < StateOf(ElementName::RSTC_LEVEL)) return;
    NarrowAscii({text, length}, narrow);
    TakeText(static_cast<ElementName>(state - 1), narrow);
}

void ElementReader::Enter(std::int32_t) {}

void ElementReader::Leave(std::int32_t) {}

}  // namespace zelm
