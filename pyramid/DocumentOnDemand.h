// DocumentOnDemand: the owner of a metadata document whose tree is made when somebody first looks:
// an empty one, or that of a text which it has been given.
//
// Used as the pointer that it stands for. A tree costs many times its text, in time and in memory,
// and whoever reads a file and never stores into it needs none. The text is that of the moment when
// it was given: what becomes of the file, or of the others that hold the text, changes nothing. It
// is let go of once its tree is made. One thread at a time.
#ifndef ZMC_PYRAMID_DOCUMENTONDEMAND_H
#define ZMC_PYRAMID_DOCUMENTONDEMAND_H

#include <cstddef>
#include <memory>

#include "pyramid/PyramidXMLDocument.h"

namespace XERCES_CPP_NAMESPACE {
class MemBufInputSource;
}  // namespace XERCES_CPP_NAMESPACE

namespace zelm {

// The bytes of a document, which nobody changes any more.
using DocumentSource = std::shared_ptr<xercesc::MemBufInputSource>;

class DocumentOnDemand {
public:
    // Null if memory ran out for the document, which the next call tries again, or if that is what
    // reset was given.
    PyramidXMLDocument* get() const {
        if (pending) Make();
        return document.get();
    }
    PyramidXMLDocument* operator->() const { return get(); }
    PyramidXMLDocument& operator*() const { return *get(); }
    explicit operator bool() const { return get() != nullptr; }
    bool operator==(std::nullptr_t) const { return get() == nullptr; }

    // Takes the place of what was there.
    void reset(std::unique_ptr<PyramidXMLDocument> other = nullptr);
    // The tree of that text takes the place of what was there, or a document without a tree if the
    // text is malformed.
    void Await(DocumentSource other);
    // A tree has been made, or none is to be.
    bool IsMade() const { return !pending; }

private:
    void Make() const;

    mutable std::unique_ptr<PyramidXMLDocument> document;
    mutable DocumentSource text;  // what the tree is to be made of; null for an empty one
    mutable bool pending = true;
};

}  // namespace zelm

#endif
