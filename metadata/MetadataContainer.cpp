#include "metadata/MetadataContainer.h"

MetadataContainer::~MetadataContainer() {
    for (const auto& [key, child] : children) delete child;
}

std::wstring MetadataContainer::GetValueText() const {
    std::wstring names;
    const wchar_t* separator = L"";
    for (const auto& [key, child] : children) {
        names += separator + key;
        separator = L", ";
    }
    return names;
}

const void* MetadataContainer::GetValueData(std::uint32_t& state) const {
    state = 0;
    return &children;
}

std::wstring MetadataContainer::Format(const std::wstring& name) const {
    std::wstring lines;
    for (const auto& [key, child] : children)
        if (child) lines += child->Format(name + key + L'/');
    return lines;
}
