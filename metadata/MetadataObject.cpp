#include "metadata/MetadataObject.h"

#include <algorithm>
#include <string>
#include <utility>

namespace {

std::wstring Left(std::wstring text, std::size_t width) {
    text.resize(std::max(text.size(), width), L' ');
    return text;
}

std::wstring Right(std::wstring text, std::size_t width) {
    if (text.size() < width) text.insert(0, width - text.size(), L' ');
    return text;
}

}  // namespace

bool MetadataObject::GetArrayDimensions(std::uint32_t& rowCount, std::uint32_t& columnCount) const {
    rowCount = rows;
    columnCount = columns;
    return IsArray();
}

// The widths keep the columns of a printed tree aligned, arrays and scalars alike. No stream makes
// the text: a stream keeps to itself that memory ran out, and gives what it has.
std::wstring MetadataObject::Format(const std::wstring& name) const {
    const std::wstring size =
        IsArray() ? Right(std::to_wstring(rows), 4) + L',' + Right(std::to_wstring(columns), 3)
                  : Right(std::to_wstring(GetElementCount()), 8);
    return Left(name, 80) + L" = (" + Right(GetTypeName(), 7) + L' ' + size + L") = " +
           Left(GetValueText(), 50) + L'\n';
}
