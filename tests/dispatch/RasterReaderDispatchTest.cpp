#include "dispatch/RasterReaderDispatch.h"

#include <gtest/gtest.h>

#include "tests/dispatch/PropsReader.h"
#include "tests/support/ElementTypeList.h"

namespace zelm::test {
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
}  // namespace zelm::test
