// Palettes, metadata, raster properties and codes with each allocation failing in turn.
#include <algorithm>
#include <memory>
#include <new>
#include <string>

#include "colour/ColorList.h"
#include "colour/Palette.h"
#include "core/ElementTypes.h"
#include "core/Object.h"
#include "metadata/Metadata.h"
#include "metadata/MetadataContainer.h"
#include "raster/RasterProps.h"
#include "tests/support/AllocationFaults.h"
#include "tests/support/CountingGeoRef.h"
#include "zmcg/zmcg.h"

namespace zelm {
namespace {

using zmctest::AllocationFaults;
using zmctest::CountingGeoRef;
using zmctest::FaultMode;
using zmctest::ForEachAllocationFailing;

RGBAColor Grey(unsigned char value) {
    unsigned char bytes[4] = {value, value, value, 255};
    return RGBAColor(Array<unsigned char>(bytes, ArrayShape(4)));
}

TEST(PaletteFaults, AColourThatCannotBeMadeLeavesItsEntryEmpty) {
    Palette palette;
    palette.colors[4];
    AllocationFaults faults(1, FaultMode::FromThenOn);
    const Color* const color = palette.GetColor(4);
    faults.Disarm();
    EXPECT_EQ(color, nullptr);
    EXPECT_FALSE(palette.colors[4]);
    EXPECT_NE(palette.GetColor(4), nullptr);
}

TEST(PaletteFaults, TheTableItselfThrows) {
    Palette palette;
    const RGBAColor grey = Grey(1);
    bool thrown = false;
    AllocationFaults faults(1, FaultMode::FromThenOn);
    try {
        palette.AddColor(grey);
    } catch (const std::bad_alloc&) {
        thrown = true;
    }
    faults.Disarm();
    EXPECT_TRUE(thrown);
    EXPECT_EQ(palette.nextIndex, 0u);
    EXPECT_TRUE(palette.colors.empty());
}

bool SameColors(const Palette& a, const Palette& b) {
    return a.nextIndex == b.nextIndex &&
           std::equal(a.colors.begin(), a.colors.end(), b.colors.begin(), b.colors.end(),
                      [](const auto& x, const auto& y) {
                          return x.first == y.first && x.second && y.second &&
                                 x.second->name == y.second->name && x.second->red == y.second->red;
                      });
}

// The target has all colours and the length of the source, or its own as they were.
TEST(PaletteFaults, ACopyIsWholeOrThrown) {
    Palette source;
    for (unsigned char value = 1; value <= 3; ++value) source.AddColor(Grey(value));
    std::size_t thrown = 0;
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        Palette target;
        target.AddColor(Grey(9));
        const Color* const held = target.GetColor(0);
        faults.Rearm();
        bool threw = false;
        try {
            source.CopyTo(target);
        } catch (const std::bad_alloc&) {
            threw = true;
        }
        faults.Disarm();
        if (threw) {
            EXPECT_EQ(target.nextIndex, 1u);
            EXPECT_EQ(target.colors.size(), 1u);
            EXPECT_EQ(target.GetColor(0), held);
        } else {
            EXPECT_TRUE(SameColors(target, source));
        }
        thrown += threw ? 1 : 0;
    });
    EXPECT_GE(thrown, 24u) << "entry, colour, name and record of each, in both modes";
}

TEST(PaletteFaults, APaletteOfAColorListIsWholeOrThrown) {
    ColorList list;
    Palette whole;
    for (unsigned char value = 1; value <= 3; ++value) {
        list.Add(ColorList::Pack(value, value, value, 255));
        whole.AddColor(Grey(value));
    }
    list.LookUp(5);
    whole.GetColor(5);
    std::size_t thrown = 0;
    ForEachAllocationFailing([&](AllocationFaults& faults) {
        Palette made;
        bool threw = false;
        try {
            list.CopyTo(made);
        } catch (const std::bad_alloc&) {
            threw = true;
        }
        faults.Disarm();
        EXPECT_TRUE(threw || SameColors(made, whole));
        thrown += threw ? 1 : 0;
    });
    EXPECT_GE(thrown, 32u) << "entry, colour, name and record of each, in both modes";
}

TEST(PaletteFaults, EveryOperationSurvivesEveryFailure) {
    const RGBAColor grey = Grey(3);
    const std::size_t points = ForEachAllocationFailing([&grey](AllocationFaults&) {
        Palette palette;
        Palette target;
        try {
            palette.AddColor(grey);
            palette.SetColor(0, Color());
            palette.SetColor(9, grey);
            palette.GetColor(5);
            palette.CopyTo(target);
            palette.Clear();
            palette.AddColor(Grey(7));
        } catch (const std::bad_alloc&) {
        }
        for (const auto& [index, color] : target.colors)
            if (color) static_cast<void>(color->red);
    });
    EXPECT_GE(points, 12u);
}

TEST(ObjectFaults, TextFormIsWholeOrNull) {
    const Object object;
    const String whole = object.ToString();
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        const String text = object.ToString();
        faults.Disarm();
        EXPECT_TRUE(text.wide == nullptr || text == whole);
        EXPECT_EQ(text == whole, faults.Failed() == 0);
    });
    EXPECT_GE(points, 1u);
}

TEST(MetadataFaults, WithoutATreeTheHandleHoldsNothing) {
    AllocationFaults faults(2);  // the first is the record of the empty pointer
    const Metadata metadata;
    const Metadata copy(metadata);
    faults.Disarm();
    ASSERT_NE(metadata.impl.record, nullptr);
    EXPECT_FALSE(metadata.impl);
    EXPECT_FALSE(copy.impl);
    EXPECT_TRUE(metadata.IsValid());
}

TEST(MetadataFaults, EveryOperationSurvivesEveryFailure) {
    const std::size_t points = ForEachAllocationFailing([](AllocationFaults&) {
        Metadata metadata;
        const Metadata copy(metadata);
        Metadata other;
        other = copy;
        metadata = Metadata();
        metadata.ToString();
        MetadataPtr held(new (std::nothrow) Metadata(other));
    });
    EXPECT_GE(points, 9u);
}

// A leaf whose texts are too long to lie in a string itself.
class LongLeaf : public MetadataObject {
public:
    std::wstring GetValueText() const override { return std::wstring(200, L'v'); }
    const void* GetValueData(std::uint32_t&) const override { return nullptr; }
    std::uint32_t GetElementCount() const override { return 1; }
    std::wstring GetTypeName() const override { return std::wstring(100, L't'); }
    std::int32_t GetTypeCode() const override { return 3; }
};

TEST(MetadataFaults, FormatThrowsOrGivesTheWholeText) {
    MetadataContainer tree;
    tree.children[L"scalar"] = new LongLeaf;
    auto* const array = new LongLeaf;
    array->rows = array->columns = 7;
    tree.children[L"array"] = array;
    const std::wstring whole = tree.Format(L"");
    std::size_t thrown = 0;
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        std::wstring text;
        try {
            text = tree.Format(L"");
            faults.Disarm();
            EXPECT_EQ(text, whole);
            EXPECT_EQ(faults.Failed(), 0u);
        } catch (const std::bad_alloc&) {
            ++thrown;
        }
    });
    EXPECT_GE(points, 6u);
    EXPECT_EQ(thrown, 2 * points);
}

TEST(RasterPropsFaults, AGeoRefThatCannotBeClonedIsNone) {
    RasterProps props;
    const GeoRefPtr geoRef(new CountingGeoRef);
    AllocationFaults faults(1, FaultMode::FromThenOn);
    props.SetGeoRef(geoRef);
    faults.Disarm();
    EXPECT_FALSE(props.geoRef);
    EXPECT_EQ(CountingGeoRef::living, 1);
}

TEST(RasterPropsFaults, EveryOperationSurvivesEveryFailure) {
    const GeoRefPtr geoRef(new CountingGeoRef);
    const std::size_t points = ForEachAllocationFailing([&geoRef](AllocationFaults&) {
        try {
            RasterProps props;
            props.SetSamples(5);
            props.SetBands(3);
            props.SetNoDataValue(1, 2.0);
            props.SetNoDataFlag(2, true);
            props.GetNoDataValue(0) = 1.0;
            props.SetGeoRef(geoRef);
            const RasterProps copy(props);
            RasterProps other;
            other = copy;
            other.TakeNoDataValues(props);
            static_cast<void>(other.IsValid());
        } catch (const std::bad_alloc&) {  // from the map alone
        }
    });
    EXPECT_GE(points, 20u);
    EXPECT_EQ(CountingGeoRef::living, 1);
}

TEST(RasterPropsFaults, AnAssignmentThatThrowsLeavesARecordThatCanBeUsed) {
    const GeoRefPtr geoRef(new CountingGeoRef);
    RasterProps source;
    source.SetBands(2);
    source.SetNoDataValue(0, 1.0);
    source.SetGeoRef(geoRef);
    ForEachAllocationFailing([&source](AllocationFaults& faults) {
        faults.Disarm();
        RasterProps target;
        faults.Rearm();
        try {
            target = source;
        } catch (const std::bad_alloc&) {
        }
        faults.Disarm();
        EXPECT_TRUE(!target.geoRef || target.geoRef.Get() != source.geoRef.Get());
        target = source;
        EXPECT_EQ(target.noDataValues, source.noDataValues);
        EXPECT_TRUE(target.geoRef);
    });
}

TEST(CodeFaults, CodesAreDrawnWithoutMemory) {
    int word = 0;
    ForEachAllocationFailing([&word](AllocationFaults& faults) {
        faults.Disarm();
        const std::string first = "fault word " + std::to_string(++word);
        const std::string second = "fault word " + std::to_string(++word);
        const String a(first.c_str());
        const String b(second.c_str());
        const unsigned object = Object::typeCode;
        faults.Rearm();
        const unsigned codeOfA = GloballyUniqueObjectTypeCode(a);
        const unsigned codeOfB = GloballyUniqueObjectTypeCode(b);
        const unsigned error = GloballyUniqueObjectErrorCode();
        faults.Disarm();
        EXPECT_NE(codeOfA, 0u);
        EXPECT_NE(codeOfA, codeOfB);
        EXPECT_NE(error, 0u);
        EXPECT_NE(codeOfA, GloballyUniqueObjectTypeCode(String()));
        EXPECT_EQ(GloballyUniqueObjectTypeCode("Object"), object);
        const unsigned later = GloballyUniqueObjectTypeCode(a);
        EXPECT_EQ(GloballyUniqueObjectTypeCode(a), later);
        EXPECT_NE(later, codeOfB);
    });
}

}  // namespace
}  // namespace zelm
