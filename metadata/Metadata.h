// Metadata: handle on a shared, lockable tree of descriptive values.
//
// Copying a Metadata shares the tree, so a change made through one copy is seen through all. The
// module carries it and never looks inside; the keys are the host's. Handles may be copied and
// dropped on any thread; the nodes are for whoever holds `impl->lock`.
#ifndef ZMC_METADATA_METADATA_H
#define ZMC_METADATA_METADATA_H

#include "core/Object.h"
#include "metadata/LockableMetadataImpl.h"

namespace zelm {

class Metadata : public Object {
public:
    // The number of the class word "Metadata".
    // cppcheck-suppress duplInheritedMember ; each class has a code of its own by this name
    static const std::uint32_t typeCode;

    LockableMetadataImplPtr impl;  // holds no object if memory ran out

    Metadata();                                  // a new, empty tree
    Metadata(const Metadata& other);             // shares the tree of `other`
    Metadata& operator=(const Metadata& other);  // likewise, and lets go of its own
    ~Metadata() override;

    // Its own code alone: unlike other classes, Metadata does not answer to the code of Object.
    bool IsKindOf(std::uint32_t code) const override { return code == typeCode; }
    String ToString() const override;  // "{Metadata}@" and the address
};

// Shares one handle among its copies; what hosts hand to Open.
class MetadataPtr : public Pointer<Metadata> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
