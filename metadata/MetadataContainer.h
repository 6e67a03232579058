// MetadataContainer: the node that maps names to child nodes, and the root of every tree.
//
// A host fills it by hand, with nodes made by `new`, which the container then owns:
//     root.children[L"sensor"] = new MyTextNode(L"camera 2");
// Names may be any text; children are walked in the order of their names' code units. Locks are as
// for every node (MetadataObject.h). Texts throw std::bad_alloc.
#ifndef ZMC_METADATA_METADATACONTAINER_H
#define ZMC_METADATA_METADATACONTAINER_H

#include <map>
#include <string>

#include "metadata/MetadataObject.h"

class MetadataContainer : public MetadataObject {
public:
    static constexpr std::int32_t kTypeCode = 20;  // what GetTypeCode answers

    std::map<std::wstring, MetadataObject*> children;  // owned; null entries are tolerated

    MetadataContainer() = default;
    MetadataContainer(const MetadataContainer&) = delete;
    MetadataContainer& operator=(const MetadataContainer&) = delete;
    // Deletes the children, and theirs.
    ~MetadataContainer() override;

    // The names of the children, separated by ", ".
    std::wstring GetValueText() const override;
    // Sets `state` to 0 and returns the address of `children`.
    const void* GetValueData(std::uint32_t& state) const override;
    // One, however many children there are: the container itself is the value.
    std::uint32_t GetElementCount() const override { return 1; }
    std::wstring GetTypeName() const override { return L"container"; }
    std::int32_t GetTypeCode() const override { return kTypeCode; }
    // The lines of all children, each under `name`, its key and "/"; no line for itself.
    std::wstring Format(const std::wstring& name) const override;
};

#endif
