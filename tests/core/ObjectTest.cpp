#include "core/Object.h"

#include <gtest/gtest.h>

#include <cinttypes>
#include <cstdio>
#include <set>
#include <string>
#include <type_traits>

#include "core/Array.h"
#include "core/ClassWords.h"
#include "core/Complex.h"
#include "core/ElementTypes.h"
#include "metadata/Metadata.h"

namespace zelm {
namespace {

std::string Hex(const void* address) {
    char text[24];
    std::snprintf(text, sizeof text, "%" PRIx64, reinterpret_cast<std::uint64_t>(address));
    return text;
}

TEST(Object, NewOneIsHealthyAndOfItsKind) {
    const Object object;
    EXPECT_TRUE(object.IsValid());
    EXPECT_EQ(object.error.flags, 0u);
    EXPECT_EQ(object.error.code, 0u);
    EXPECT_TRUE(object.IsKindOf(Object::typeCode));
    EXPECT_FALSE(object.IsKindOf(Metadata::typeCode));
    EXPECT_FALSE(object.IsKindOf(0));
}

TEST(Object, ArrayIsOfItsOwnKindAndAnObjectAndNoMetadata) {
    const Array<unsigned char> array;
    EXPECT_TRUE(array.IsValid());
    EXPECT_TRUE(array.IsKindOf(Array<unsigned char>::typeCode));
    EXPECT_TRUE(array.IsKindOf(Object::typeCode));
    EXPECT_FALSE(array.IsKindOf(Metadata::typeCode));
}

TEST(Object, TextFormIsWordAndAddress) {
    const Object object;
    EXPECT_EQ(std::string(object.ToString().GetUtf8()), "{Object}@" + Hex(&object));
    const Array<String> array;
    EXPECT_EQ(std::string(array.ToString().GetUtf8()), "{Object}@" + Hex(&array));
    EXPECT_STREQ(MakeObjectUrl("Word", nullptr).GetUtf8(), "{Word}@0");
    EXPECT_STREQ(MakeObjectUrl("W", reinterpret_cast<void*>(0xABCDEF0123u)).GetUtf8(),
                 "{W}@abcdef0123");
}

TEST(ObjectErrors, StateHasNoFlagAndErrorHasTheFlagFour) {
    EXPECT_EQ(ObjectErrorState(77).GetState().flags, 0u);
    EXPECT_EQ(ObjectErrorState(77).GetState().code, 77u);
    EXPECT_EQ(ObjectError(78).GetState().flags, 4u);
    EXPECT_EQ(ObjectError(78).GetState().code, 78u);
}

TEST(ObjectErrors, ClassesHaveCodesOfTheirOwn) {
    EXPECT_NE(ObjectErrorOutOfMemory::errorCode, 0u);
    EXPECT_NE(RasterReaderErrorInvalid::errorCode, 0u);
    EXPECT_NE(ObjectErrorOutOfMemory::errorCode, RasterReaderErrorInvalid::errorCode);
    EXPECT_EQ(ObjectErrorOutOfMemory().GetState().code, ObjectErrorOutOfMemory::errorCode);
    EXPECT_EQ(RasterReaderErrorInvalid().GetState().flags, 4u);
}

TEST(ObjectErrors, OnlyTheFlagFourMakesAnObjectInvalid) {
    Object object;
    object.SetError(ObjectErrorState(5));
    EXPECT_TRUE(object.IsValid());
    EXPECT_EQ(object.error.code, 5u);
    object.error.flags = ~4u;
    EXPECT_TRUE(object.IsValid());
    object.SetError(ObjectErrorOutOfMemory());
    EXPECT_FALSE(object.IsValid());
}

TEST(ObjectErrors, AFailedObjectStaysFailedAndItsCopyStartsHealthy) {
    Array<int> array;
    array.SetError(ObjectErrorOutOfMemory());
    EXPECT_TRUE(array.Append(1));
    EXPECT_FALSE(array.IsValid());
    const Array<int> copy(array);
    EXPECT_TRUE(copy.IsValid());
    EXPECT_EQ(copy.error.code, 0u);
    array = copy;
    EXPECT_FALSE(array.IsValid());
    EXPECT_EQ(array.error.code, ObjectErrorOutOfMemory::errorCode);
}

TEST(Complex, DefaultIsZeroAndPartsLieRealFirst) {
    const Complex<float> zero;
    EXPECT_EQ(zero.re, 0.0f);
    EXPECT_EQ(zero.im, 0.0f);
    const Complex<double> value(1.5, -2.5);
    const auto* parts = reinterpret_cast<const double*>(&value);
    EXPECT_EQ(parts[0], 1.5);
    EXPECT_EQ(parts[1], -2.5);
    EXPECT_FALSE(std::is_polymorphic_v<Complex<float>>);
}

TEST(Complex, NewArrayIsZeroed) {
    Array<Complex<double>> array;
    ASSERT_TRUE(array.SetShape(ArrayShape(50)));
    for (std::uint32_t i = 0; i < 50; ++i) EXPECT_EQ(array.data[i], Complex<double>());
}

template <class T>
void ExpectElement(std::uint32_t code, const char* word) {
    EXPECT_EQ(ElementTraits<T>::code, code);
    EXPECT_STREQ(ElementTraits<T>::word, word);
    bool same = false;
    EXPECT_TRUE(VisitElementType(code, [&same](auto visited) {
        same = std::is_same_v<decltype(visited), std::type_identity<T>>;
    }));
    EXPECT_TRUE(same) << word;
}

TEST(ElementTypes, ListHasTwelveDistinctCodesAndVisitsEachType) {
    std::set<std::uint32_t> codes;
#define ZMC_X(type, name, typeCode)       \
    ExpectElement<type>(typeCode, #name); \
    codes.insert(typeCode);
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
    EXPECT_EQ(codes, (std::set<std::uint32_t>{1, 2, 3, 4, 5, 6, 9, 12, 13, 14, 15, 99}));
    for (const std::uint32_t code : {0u, 7u, 8u, 95u, 96u, 98u, 100u})
        EXPECT_FALSE(VisitElementType(code, [](auto) { FAIL(); })) << code;
}

TEST(ElementTypes, CharIsSigned) {
    EXPECT_TRUE(std::is_signed_v<char>);
    EXPECT_EQ(static_cast<int>(static_cast<char>(200)), -56);
}

template <std::size_t N>
void CollectWords(const std::string_view (&words)[N], std::set<std::string_view>& all) {
    for (const std::string_view word : words) EXPECT_TRUE(all.insert(word).second) << word;
}

TEST(ClassWords, VocabularyHasEachWordOnce) {
    EXPECT_EQ(std::size(ClassWords::kOnceEach), 46u);
    EXPECT_EQ(std::size(ClassWords::kOncePerPixelType), 19u);
    EXPECT_EQ(std::size(ClassWords::kOncePerRealPixelType), 7u);
    EXPECT_EQ(std::size(ClassWords::kOncePerInstance), 8u);
    std::set<std::string_view> all;
    CollectWords(ClassWords::kOnceEach, all);
    CollectWords(ClassWords::kOncePerPixelType, all);
    CollectWords(ClassWords::kOncePerRealPixelType, all);
    CollectWords(ClassWords::kOncePerInstance, all);
    EXPECT_EQ(all.size(), 80u);
}

TEST(ClassWords, ArrayInstancesKeepVariablesOfTheirOwn) {
    EXPECT_NE(&Array<int>::typeCode, &Array<float>::typeCode);
    const std::uint32_t drawn = GloballyUniqueObjectTypeCode("Array");
    EXPECT_EQ(Array<int>::typeCode, drawn);
    EXPECT_EQ(Array<float>::typeCode, drawn);
    EXPECT_EQ(Array<String>::typeCode, drawn);
}

}  // namespace
}  // namespace zelm
