#include "core/Array.h"

#include <gtest/gtest.h>
#include <rapidcheck/gtest.h>

#include <algorithm>
#include <numeric>
#include <type_traits>
#include <vector>

#include "core/ElementTypes.h"
#include "core/String.h"

namespace zelm {
namespace {

void ExpectEmptied(const ArrayShape& shape) {
    EXPECT_EQ(shape.extents[0], 0u);
    for (int i = 1; i < 8; ++i) EXPECT_EQ(shape.extents[i], 1u);
    EXPECT_EQ(shape.dimensions, 1u);
    EXPECT_EQ(shape.elements, 0u);
}

TEST(ArrayShape, AllExtentsZeroGiveNoDimensions) {
    const ArrayShape shape(0, 0, 0, 0, 0, 0, 0, 0);
    EXPECT_EQ(shape.dimensions, 0u);
    EXPECT_EQ(shape.elements, 0u);
    for (const std::uint32_t extent : shape.extents) EXPECT_EQ(extent, 1u);
}

TEST(ArrayShape, DimensionsReachToTheLastExtentInUse) {
    EXPECT_EQ(ArrayShape(5, 0, 0).dimensions, 1u);
    EXPECT_EQ(ArrayShape(5, 0, 0).elements, 5u);
    EXPECT_EQ(ArrayShape(0, 5).dimensions, 2u);
    EXPECT_EQ(ArrayShape(0, 5).elements, 5u);
    EXPECT_EQ(ArrayShape(0, 5).extents[0], 1u);
    EXPECT_EQ(ArrayShape(2, 3, 4).elements, 24u);
}

RC_GTEST_PROP(ArrayShapeProperty, IsTheProductUpToTheLastExtent, ()) {
    std::vector<std::uint32_t> e(8);
    for (auto& extent : e) extent = *rc::gen::inRange<std::uint32_t>(0, 12);
    const ArrayShape shape(e[0], e[1], e[2], e[3], e[4], e[5], e[6], e[7]);
    std::uint32_t dimensions = 8;
    while (dimensions > 0 && e[dimensions - 1] == 0) --dimensions;
    std::uint32_t product = dimensions == 0 ? 0 : 1;
    for (std::uint32_t i = 0; i < 8; ++i) {
        RC_ASSERT(shape.extents[i] == std::max(e[i], 1u));
        product *= std::max(e[i], 1u);
    }
    RC_ASSERT(shape.dimensions == dimensions);
    RC_ASSERT(shape.elements == product);
}

TEST(Array, DefaultIsEmptyAndOwning) {
    const Array<int> array;
    EXPECT_EQ(array.data, nullptr);
    for (const std::uint32_t extent : array.shape.extents) EXPECT_EQ(extent, 1u);
    EXPECT_EQ(array.shape.dimensions, 0u);
    EXPECT_EQ(array.shape.elements, 0u);
    EXPECT_EQ(array.capacity, 0u);
    EXPECT_TRUE(array.owned);
}

TEST(Array, ThreeAppendsGiveOneDimensionOfThree) {
    Array<String> array;
    for (const char* text : {"a", "b", "c"}) EXPECT_TRUE(array.Append(text));
    EXPECT_EQ(array.shape.dimensions, 1u);
    EXPECT_EQ(array.shape.extents[0], 3u);
    EXPECT_EQ(array.shape.elements, 3u);
    EXPECT_EQ(array.capacity, 3u);
    EXPECT_TRUE(array.data[0] == "a");
    EXPECT_TRUE(array.data[2] == "c");
}

TEST(Array, AppendingAnElementOfItself) {
    Array<String> array;
    array.Append("a");
    for (int i = 0; i < 4; ++i) EXPECT_TRUE(array.Append(array.data[0]));
    EXPECT_TRUE(array.data[4] == "a");
}

TEST(Array, NewStringElementsAreNull) {
    Array<String> array;
    ASSERT_TRUE(array.Allocate(3));
    for (int i = 0; i < 3; ++i) EXPECT_EQ(array.data[i].wide, nullptr);
}

TEST(Array, ClearLeavesOneDimension) {
    Array<int> array;
    array.Append(4);
    array.Clear();
    EXPECT_EQ(array.data, nullptr);
    EXPECT_EQ(array.capacity, 0u);
    ExpectEmptied(array.shape);
    EXPECT_TRUE(array.IsValid());
}

TEST(ArrayView, TakesTheBufferAndLeavesItAlone) {
    int buffer[6] = {1, 2, 3, 4, 5, 6};
    {
        Array<int> view(buffer, ArrayShape(2, 3));
        EXPECT_EQ(view.data, buffer);
        EXPECT_FALSE(view.owned);
        EXPECT_EQ(view.capacity, 6u);
        view.Clear();
        EXPECT_EQ(view.data, buffer);
        EXPECT_EQ(view.shape.dimensions, 2u);
        EXPECT_EQ(view.capacity, 6u);
    }
    EXPECT_EQ(buffer[5], 6);
}

TEST(ArrayView, RefusesToGrow) {
    int buffer[3] = {1, 2, 3};
    Array<int> view(buffer, ArrayShape(2));
    view.capacity = 3;
    EXPECT_FALSE(view.Append(9));
    EXPECT_EQ(view.shape.elements, 2u);
    EXPECT_EQ(buffer[2], 3);
    EXPECT_FALSE(view.Reserve(1));
    EXPECT_FALSE(view.SetShape(ArrayShape(4)));
    EXPECT_EQ(view.shape.elements, 2u);
    EXPECT_TRUE(view.SetShape(ArrayShape(3)));
    EXPECT_EQ(view.shape.elements, 3u);
    EXPECT_TRUE(view.IsValid());
}

TEST(ArrayView, AssigningOneToAnEmptyArrayMakesAViewOfTheSameBuffer) {
    int buffer[4] = {1, 2, 3, 4};
    Array<int> array;
    array = Array<int>(buffer, ArrayShape(2, 2));
    EXPECT_FALSE(array.owned);
    EXPECT_EQ(array.data, buffer);
    EXPECT_EQ(array.capacity, 4u);
    EXPECT_EQ(array.shape.dimensions, 2u);
}

TEST(ArrayView, CopyOfOneSharesTheBuffer) {
    int buffer[4] = {};
    const Array<int> view(buffer, ArrayShape(4));
    const Array<int> copy(view);
    EXPECT_EQ(copy.data, buffer);
    EXPECT_FALSE(copy.owned);
}

TEST(ArrayView, AssignmentToOneCopiesWhatFitsAndItStaysAView) {
    int buffer[4] = {1, 2, 3, 4};
    Array<int> view(buffer, ArrayShape(4));
    Array<int> source;
    for (int i = 10; i < 16; ++i) source.Append(i);
    view = source;  // six do not fit: the shape stands, four are copied
    EXPECT_FALSE(view.owned);
    EXPECT_EQ(view.data, buffer);
    EXPECT_EQ(view.shape.elements, 4u);
    EXPECT_EQ(buffer[3], 13);
    Array<int> shorter;
    shorter.Append(99);
    view = shorter;
    EXPECT_EQ(view.shape.elements, 1u);
    EXPECT_EQ(buffer[0], 99);
    EXPECT_EQ(buffer[1], 11);
}

TEST(Array, AssignmentToItselfChangesNothing) {
    Array<String> array;
    array.Append("a");
    const String* const data = array.data;
    const Array<String>& same = array;
    array = same;
    EXPECT_EQ(array.data, data);
    EXPECT_TRUE(array.data[0] == "a");
}

TEST(Array, AssignmentOfASmallerOneKeepsTheBuffer) {
    Array<int> large;
    for (int i = 0; i < 5; ++i) large.Append(i);
    Array<int> small;
    small.Append(7);
    const int* const data = large.data;
    large = small;
    EXPECT_EQ(large.data, data);
    EXPECT_EQ(large.capacity, 5u);
    EXPECT_EQ(large.shape.elements, 1u);
    EXPECT_EQ(large.data[0], 7);
}

TEST(Array, AllocateZeroIsNoFailure) {
    Array<int> array;
    EXPECT_TRUE(array.Allocate(0));
    EXPECT_TRUE(array.IsValid());
    EXPECT_EQ(array.capacity, 0u);
}

TEST(Array, ReserveLeavesTheOldBufferToTheCaller) {
    Array<int> array;
    array.Append(1);
    array.Append(2);
    int* const old = array.data;
    ASSERT_TRUE(array.Reserve(10));
    EXPECT_NE(array.data, old);
    EXPECT_EQ(old[1], 2);
    delete[] old;
    EXPECT_EQ(array.data[1], 2);
    EXPECT_EQ(array.capacity, 10u);
    EXPECT_EQ(array.shape.elements, 2u);
    int* const larger = array.data;
    ASSERT_TRUE(array.Reserve(1));  // smaller: copies what fits
    delete[] larger;
    EXPECT_EQ(array.data[0], 1);
}

// What an owning array holds, for comparison with a vector.
template <class T>
std::vector<T> Elements(const Array<T>& array) {
    return std::vector<T>(array.data, array.data + array.shape.elements);
}

template <class T>
T Sample(int value) {
    if constexpr (std::is_same_v<T, String>)
        return String(std::to_string(value).c_str());
    else if constexpr (kIsComplex<T>)
        return T(static_cast<decltype(T::re)>(value), 1);
    else
        return static_cast<T>(value);
}

// A row of random operations on two arrays and on two vectors.
template <class T>
void GrowsAndAssignsAsAVector() {
    Array<T> arrays[2];
    std::vector<T> models[2];
    const auto steps = *rc::gen::container<std::vector<std::pair<int, int>>>(
        rc::gen::pair(rc::gen::inRange(0, 6), rc::gen::inRange(0, 100)));
    for (const auto& [step, value] : steps) {
        const auto which = static_cast<std::size_t>(value % 2);
        Array<T>& array = arrays[which];
        std::vector<T>& model = models[which];
        if (step <= 2) {
            RC_ASSERT(array.Append(Sample<T>(value)));
            model.push_back(Sample<T>(value));
        } else if (step == 3) {
            array.Clear();
            model.clear();
        } else if (step == 4) {
            array = arrays[1 - which];
            model = models[1 - which];
        } else {
            // New elements of plain type have no value of their own.
            const auto size = static_cast<std::uint32_t>(value % 7 + 1);
            RC_ASSERT(array.SetShape(ArrayShape(size)));
            const std::size_t kept = std::min<std::size_t>(model.size(), size);
            for (std::size_t i = kept; i < size; ++i) array.data[i] = Sample<T>(value);
            model.resize(kept);
            model.resize(size, Sample<T>(value));
        }
        RC_ASSERT(Elements(array) == model);
        RC_ASSERT(array.capacity >= array.shape.elements);
        const Array<T> copy(array);
        RC_ASSERT(Elements(copy) == model);
        RC_ASSERT(!copy.data || copy.data != array.data);
    }
}

#define ZMC_X(type, name, code)                                        \
    RC_GTEST_PROP(ArrayProperty, name##GrowsAndAssignsAsAVector, ()) { \
        GrowsAndAssignsAsAVector<type>();                              \
    }
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
RC_GTEST_PROP(ArrayProperty, StringGrowsAndAssignsAsAVector, ()) {
    GrowsAndAssignsAsAVector<String>();
}

TEST(Array, LastDimensionVariesFastest) {
    Array<int> array;
    ASSERT_TRUE(array.SetShape(ArrayShape(2, 3, 4)));
    std::iota(array.data, array.data + 24, 0);
    const auto& e = array.shape.extents;
    EXPECT_EQ(array.data[(1 * e[1] + 2) * e[2] + 3], 23);
    EXPECT_EQ(array.data[(0 * e[1] + 1) * e[2] + 0], 4);
}

}  // namespace
}  // namespace zelm
