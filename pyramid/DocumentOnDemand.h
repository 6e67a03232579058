// DocumentOnDemand: the owner of a metadata document that is an empty one until it gets another.
//
// Used as the pointer that it stands for. The empty document and its tree are made when somebody
// first looks: an open that never stores would spend a fifth of its time on them. One thread at a
// time.
#ifndef ZMC_PYRAMID_DOCUMENTONDEMAND_H
#define ZMC_PYRAMID_DOCUMENTONDEMAND_H

#include <cstddef>
#include <memory>
#include <utility>

#include "pyramid/PyramidXMLDocument.h"

namespace zelm {

class DocumentOnDemand {
public:
    // Null if memory ran out for the empty document, which the next call tries again, or if that is
    // what reset was given.
    PyramidXMLDocument* get() const {
        if (pending) Make();
        return document.get();
    }
    PyramidXMLDocument* operator->() const { return get(); }
    PyramidXMLDocument& operator*() const { return *get(); }
    explicit operator bool() const { return get() != nullptr; }
    bool operator==(std::nullptr_t) const { return get() == nullptr; }

    // Takes the place of what was there.
    void reset(std::unique_ptr<PyramidXMLDocument> other = nullptr) {
        document = std::move(other);
        pending = false;
    }

private:
    void Make() const {
        std::unique_ptr<PyramidXMLDocument> made = PyramidXMLDocument::Make();
        if (!made || !made->CreateDocument()) return;
        document = std::move(made);
        pending = false;
    }

    mutable std::unique_ptr<PyramidXMLDocument> document;
    mutable bool pending = true;
};

}  // namespace zelm

#endif
