#include "pyramid/DocumentOnDemand.h"

#include <utility>

#include <xercesc/framework/MemBufInputSource.hpp>

namespace zelm {

void DocumentOnDemand::reset(std::unique_ptr<PyramidXMLDocument> other) {
    document = std::move(other);
    text.reset();
    pending = false;
}

void DocumentOnDemand::Await(DocumentSource other) {
    document.reset();
    text = std::move(other);
    pending = true;
}

void DocumentOnDemand::Make() const {
    std::unique_ptr<PyramidXMLDocument> made = PyramidXMLDocument::Make();
    if (!made) return;
    using Taken = PyramidXMLDocument::Taken;
    if (text ? made->TakeTree(*text) == Taken::NoMemory : !made->CreateDocument()) return;
    document = std::move(made);
    text.reset();
    pending = false;
}

}  // namespace zelm
