// MetadataObject: abstract node of a metadata tree.
//
// The leaf kinds belong to whoever fills a tree; this module knows the node interface, the
// container, and the text form for diagnosis. The order of the virtual operations is fixed.
// No lock of its own: access to a tree goes under the lock of its LockableMetadataImpl.
//
// A host derives its leaves from it: one class for each kind of value, with a type code of its own
// beside 20, which is the container's. Texts are made by the leaf and owned by who asked.
#ifndef ZMC_METADATA_METADATAOBJECT_H
#define ZMC_METADATA_METADATAOBJECT_H

#include <cstdint>
#include <string>

class MetadataObject {
public:
    std::uint32_t rows = 0;     // rows of an array value, 0 if the value is no array
    std::uint32_t columns = 0;  // columns of an array value, likewise

    virtual ~MetadataObject() = default;
    // Place 2 of the interface; a fixed answer that leaf classes override.
    virtual std::uint32_t ReservedQuery() const { return 0; }
    // The value as text, for display.
    virtual std::wstring GetValueText() const = 0;
    // Borrowed pointer to the value, good while the node stands unchanged; `state` tells how to
    // take it, in numbers that the leaf kinds agree on with whoever reads them.
    virtual const void* GetValueData(std::uint32_t& state) const = 0;
    // Elements of the value: 1 if it is no array.
    virtual std::uint32_t GetElementCount() const = 0;
    // Places 6 to 29 of the interface: fixed answers that leaf classes override and that nothing
    // here asks for. They keep the places of what follows.
    virtual bool ReservedTest6() const { return false; }
    virtual bool ReservedTest7() const { return false; }
    virtual bool ReservedTest8() const { return false; }
    virtual bool ReservedTest9() const { return false; }
    virtual bool ReservedTest10() const { return false; }
    virtual bool ReservedTest11() const { return false; }
    virtual bool ReservedTest12() const { return false; }
    virtual bool ReservedTest13() const { return false; }
    virtual bool ReservedTest14() const { return false; }
    virtual bool ReservedTest15() const { return false; }
    virtual bool ReservedTest16() const { return false; }
    virtual bool ReservedTest17() const { return false; }
    virtual bool ReservedTest18() const { return false; }
    virtual bool ReservedTest19() const { return false; }
    virtual bool ReservedTest20() const { return false; }
    virtual bool ReservedTest21() const { return false; }
    virtual bool ReservedTest22() const { return false; }
    virtual bool ReservedTest23() const { return false; }
    virtual bool ReservedTest24() const { return false; }
    virtual bool ReservedTest25() const { return false; }
    virtual bool ReservedTest26() const { return false; }
    virtual bool ReservedTest27() const { return false; }
    virtual bool ReservedTest28() const { return false; }
    virtual bool ReservedTest29() const { return false; }
    // The kind of the node, as a word for display and as a number for code.
    virtual std::wstring GetTypeName() const = 0;
    virtual std::int32_t GetTypeCode() const = 0;
    // Whether the value has rows and columns.
    virtual bool IsArray() const { return rows > 0 && columns > 0; }
    // Stores both fields whatever the answer, which is that of IsArray.
    virtual bool GetArrayDimensions(std::uint32_t& rowCount, std::uint32_t& columnCount) const;
    // The lines that print this node under the path `name`. Throws std::bad_alloc.
    virtual std::wstring Format(const std::wstring& name) const;
};

#endif
