#include "metadata/Metadata.h"

#include <new>

#include "core/ObjectCodes.h"
#include "metadata/MetadataParseLog.h"

namespace zelm {
namespace {

// Drawn for the vocabulary that all modules share; no class here answers to it.
[[maybe_unused]] const std::uint32_t lockableMapTypeCode =
    GloballyUniqueObjectTypeCode("LockableMap");

}  // namespace

const std::uint32_t Metadata::typeCode = GloballyUniqueObjectTypeCode("Metadata");

Metadata::Metadata() {
    auto* tree = new (std::nothrow) LockableMetadataImpl;
    if (!tree) return;
    // The first Metadata of a process is what makes the log read its settings.
    MetadataParseLog::GetInstance();
    InitializeCriticalSection(&tree->lock);
    impl.Reset(tree);
}

Metadata::Metadata(const Metadata& other) = default;

Metadata& Metadata::operator=(const Metadata& other) = default;

Metadata::~Metadata() = default;

String Metadata::ToString() const { return MakeObjectUrl("Metadata", this); }

}  // namespace zelm
