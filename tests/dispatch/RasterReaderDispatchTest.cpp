#include "dispatch/RasterReaderDispatch.h"

#include <gtest/gtest.h>

#include <optional>

#include "dispatch/ConnectionReader.h"
#include "tests/dispatch/PropsReader.h"
#include "tests/support/CountingGeoRef.h"
#include "tests/support/ElementTypeList.h"

namespace zmctest {

using namespace zelm;
namespace {

int BoundMembers(const RasterReaderDispatch& dispatch) {
    int bound = 0;
#define ZMC_X(type, name, code) bound += dispatch.reader##name ? 1 : 0;
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    return bound;
}

void ExpectInvalid(const RasterReaderDispatch& dispatch) {
    EXPECT_EQ(dispatch.pixelType, 0u);
    EXPECT_EQ(dispatch.error.flags, kErrorFlag);
    EXPECT_EQ(dispatch.error.code, RasterReaderErrorInvalid::errorCode);
    EXPECT_EQ(BoundMembers(dispatch), 0);
    EXPECT_FALSE(dispatch.IsValidLevel());
    const RasterProps props = dispatch.GetRasterProps();
    EXPECT_EQ(props.interleave, -1);
    EXPECT_TRUE(props.formatName == "Unknown");
    EXPECT_FALSE(props.geoRef);
    EXPECT_FALSE(dispatch.Visit([](auto&) { FAIL() << "there is no reader to visit"; }));
}

TEST(RasterReaderDispatch, WithoutReaderItIsInvalid) { ExpectInvalid(RasterReaderDispatch()); }

template <class T>
class TypedDispatch : public ::testing::Test {};

TYPED_TEST_SUITE(TypedDispatch, AllElementTypes, ElementTypeNames);

TYPED_TEST(TypedDispatch, EmptyPointerGivesAnInvalidOne) {
    ExpectInvalid(RasterReaderDispatch(RasterReaderPtr<TypeParam>()));
}

TYPED_TEST(TypedDispatch, BindsTheReaderOfItsTypeAlone) {
    using T = TypeParam;
    auto* typed = new ReaderRasterMemory<T>(nullptr, RasterProps());
    typed->props.samples = 11;
    const RasterReaderDispatch dispatch{RasterReaderPtr<T>(typed)};
    EXPECT_EQ(dispatch.pixelType, ElementTraits<T>::code);
    EXPECT_EQ(dispatch.error.flags, 0u);
    EXPECT_EQ(BoundMembers(dispatch), 1);
    EXPECT_EQ(dispatch.template As<T>().Get(), typed);
    EXPECT_EQ(dispatch.template As<T>().record->count, 1u) << "the argument is let go";
    EXPECT_EQ(dispatch.GetRasterProps().samples, 11u);
    EXPECT_FALSE(dispatch.IsValidLevel()) << "the reader has no pixels";
    void* visited = nullptr;
    EXPECT_TRUE(dispatch.Visit([&visited](auto& reader) { visited = &reader; }));
    EXPECT_EQ(visited, typed);
}

TYPED_TEST(TypedDispatch, PropertiesOfAGeoRefThatThrowsAreNeutral) {
    using T = TypeParam;
    auto* typed = new ReaderRasterMemory<T>(nullptr, RasterProps());
    const RasterReaderDispatch dispatch{RasterReaderPtr<T>(typed)};
    typed->props.pixelType = 1;
    typed->props.formatName = "MemoryRaster";
    typed->props.SetGeoRef(GeoRefPtr(new CountingGeoRef));
    for (int successes = 0; successes < 3; ++successes) {
        const ThrowingClones throwing(successes);
        std::optional<RasterProps> props;
        EXPECT_NO_THROW(props.emplace(dispatch.GetRasterProps()));
        ASSERT_TRUE(props);
        EXPECT_EQ(props->IsValid(), successes > 0) << "one clone is all that it takes";
        EXPECT_EQ(static_cast<bool>(props->geoRef), props->IsValid());
    }
}

// The connection has the reader's properties, or its own as they were, and never a mixture.
TEST(RefreshedProps, AreTakenWholeOrNotAtAll) {
    auto* typed = new ReaderRasterMemory<float>(nullptr, RasterProps());
    const RasterReaderDispatchPtr dispatch(new RasterReaderDispatch(RasterReaderPtr<float>(typed)));
    typed->props.samples = 9;
    typed->props.bands = 2;
    typed->props.pixelType = 4;
    typed->props.formatName = "MemoryRaster";
    typed->props.SetNoDataValue(1, 3.0);
    typed->props.SetGeoRef(GeoRefPtr(new CountingGeoRef));
    for (int successes = 0; successes < 5; ++successes) {
        RasterProps kept;
        kept.samples = 5;
        kept.formatName = "Pyramid";
        kept.SetGeoRef(GeoRefPtr(new CountingGeoRef));
        const GeoRef* const held = kept.geoRef.Get();
        std::optional<RasterProps> answer;
        {
            const ThrowingClones throwing(successes);
            EXPECT_NO_THROW(answer.emplace(RefreshedProps(dispatch, kept)));
        }
        ASSERT_TRUE(answer);
        const bool taken = answer->IsValid();
        EXPECT_EQ(taken, successes >= 2) << "one clone for each record";
        EXPECT_EQ(answer->samples, taken ? 9u : 0u);
        EXPECT_EQ(kept.samples, taken ? 9u : 5u);
        EXPECT_EQ(kept.noDataValues.size(), taken ? 1u : 0u);
        EXPECT_TRUE(kept.formatName == (taken ? "MemoryRaster" : "Pyramid"));
        EXPECT_EQ(kept.geoRef.Get() == held, !taken);
    }
}

TYPED_TEST(TypedDispatch, CopiedPointersShareOneDispatch) {
    using T = TypeParam;
    RasterReaderPtr<T> reader(new ReaderRasterMemory<T>(nullptr, RasterProps()));
    {
        const RasterReaderDispatchPtr first(new RasterReaderDispatch(reader));
        const RasterReaderDispatchPtr second(first);
        EXPECT_EQ(first.Get(), second.Get());
        EXPECT_EQ(reader.record->count, 2u);
    }
    EXPECT_EQ(reader.record->count, 1u) << "the dispatch has gone once, and its reference with it";
}

}  // namespace
}  // namespace zmctest
