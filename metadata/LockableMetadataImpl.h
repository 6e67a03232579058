// The shared part of Metadata: a tree and the lock that serialises access to it.
//
// Whoever looks at the nodes, or changes them, holds the lock meanwhile, and takes nothing out of
// the tree but copies:
//     EnterCriticalSection(&metadata.impl->lock);
//     const std::wstring text = metadata.impl->root.Format(L"");
//     LeaveCriticalSection(&metadata.impl->lock);
// An exception from in between would leave it locked, so a host puts the two calls into a guard.
#ifndef ZMC_METADATA_LOCKABLEMETADATAIMPL_H
#define ZMC_METADATA_LOCKABLEMETADATAIMPL_H

#include "core/Pointer.h"
#include "metadata/MetadataContainer.h"
#include "platform/CriticalSection.h"

namespace zelm {

// A plain structure: whoever makes one initialises `lock`, and the last release deletes it.
struct LockableMetadataImpl {
    MetadataContainer root;  // the tree, with the host's keys
    CRITICAL_SECTION lock;   // to be held around every access to the nodes
};

// The structure has no virtual destructor, and its lock goes before its tree.
template <>
struct ObjectDestroyer<LockableMetadataImpl> {
    static void Destroy(LockableMetadataImpl* impl) {
        DeleteCriticalSection(&impl->lock);
        delete impl;
    }
};

// Shares one tree among the handles on it.
class LockableMetadataImplPtr : public Pointer<LockableMetadataImpl> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
