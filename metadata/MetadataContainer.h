// MetadataContainer: the node that maps names to child nodes, and the root of every tree.
#ifndef ZMC_METADATA_METADATACONTAINER_H
#define ZMC_METADATA_METADATACONTAINER_H

#include <map>
#include <string>

#include "metadata/MetadataObject.h"

class MetadataContainer : public MetadataObject {
public:
    static constexpr std::int32_t kTypeCode = 20;

    std::map<std::wstring, MetadataObject*> children;  // owned; null entries are tolerated

    MetadataContainer() = default;
    MetadataContainer(const MetadataContainer&) = delete;
    MetadataContainer& operator=(const MetadataContainer&) = delete;
    ~MetadataContainer() override;

    // The names of the children, separated by ", ".
    std::wstring GetValueText() const override;
    // Sets `state` to 0 and returns the address of `children`.
    const void* GetValueData(std::uint32_t& state) const override;
    std::uint32_t GetElementCount() const override { return 1; }
    std::wstring GetTypeName() const override { return L"container"; }
    std::int32_t GetTypeCode() const override { return kTypeCode; }
    // The lines of all children, each under `name`, its key and "/"; no line for itself.
    std::wstring Format(const std::wstring& name) const override;
};

#endif
