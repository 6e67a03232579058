#include "format/DocumentLimits.h"

#include "format/ElementNames.h"

namespace zelm {

void DocumentLimits::Reset() {
    depth = 0;
    nodes = 0;
    foreignNames.clear();
}

const char* DocumentLimits::EnterElement(std::u16string_view name, std::size_t attributes) {
    if (++depth > kMaxDocumentDepth) return "elements are nested too deeply";
    if (attributes > kMaxAttributes) return "an element has too many attributes";
    if (const char* reason = TakeNode()) return reason;
    return FindElementName(name) >= 0 ? nullptr : TakeName(name);
}

const char* DocumentLimits::TakeName(std::u16string_view name) {
    if (foreignNames.find(name) != foreignNames.end()) return nullptr;
    if (foreignNames.size() >= kMaxForeignNames) return "too many unknown names";
    foreignNames.emplace(name);
    return nullptr;
}

const char* DocumentLimits::TakeNode() {
    return ++nodes > kMaxDocumentNodes ? "too many elements" : nullptr;
}

void DocumentLimits::LeaveElement() {
    if (depth > 0) --depth;
}

}  // namespace zelm
