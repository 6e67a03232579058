// The shared part of Metadata: a tree and the lock that serialises access to it.
#ifndef ZMC_METADATA_LOCKABLEMETADATAIMPL_H
#define ZMC_METADATA_LOCKABLEMETADATAIMPL_H

#include "core/Pointer.h"
#include "metadata/MetadataContainer.h"
#include "platform/CriticalSection.h"

namespace zelm {

// A plain structure: whoever makes one initialises `lock`, and the last release deletes it.
struct LockableMetadataImpl {
    MetadataContainer root;
    CRITICAL_SECTION lock;  // to be held around every access to the nodes
};

// The structure has no virtual destructor, and its lock goes before its tree.
template <>
struct ObjectDestroyer<LockableMetadataImpl> {
    static void Destroy(LockableMetadataImpl* impl) {
        DeleteCriticalSection(&impl->lock);
        delete impl;
    }
};

class LockableMetadataImplPtr : public Pointer<LockableMetadataImpl> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
