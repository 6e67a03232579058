#include "metadata/MetadataObject.h"

#include <iomanip>
#include <sstream>

bool MetadataObject::GetArrayDimensions(std::uint32_t& rowCount, std::uint32_t& columnCount) const {
    rowCount = rows;
    columnCount = columns;
    return IsArray();
}

// The widths keep the columns of a printed tree aligned, arrays and scalars alike.
std::wstring MetadataObject::Format(const std::wstring& name) const {
    std::wostringstream line;
    line.imbue(std::locale::classic());
    line << std::left << std::setw(80) << name << L" = (";
    line << std::right << std::setw(7) << GetTypeName() << L' ';
    if (IsArray())
        line << std::setw(4) << rows << L',' << std::setw(3) << columns;
    else
        line << std::setw(8) << GetElementCount();
    line << L") = " << std::left << std::setw(50) << GetValueText() << L'\n';
    return std::move(line).str();
}
