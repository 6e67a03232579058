// String, Array and Pointer with each allocation failing in turn: nothing is thrown, nothing leaks,
// and what failed is in the state that its header tells.
#include <sstream>
#include <string>

#include "core/Array.h"
#include "core/ElementTypes.h"
#include "core/Lock.h"
#include "core/Pointer.h"
#include "core/String.h"
#include "raster/RasterBandHistogram.h"
#include "tests/support/AllocationFaults.h"

namespace zelm {
namespace {

using zmctest::AllocationFaults;
using zmctest::FaultMode;
using zmctest::ForEachAllocationFailing;

const WideChar* const kWide = reinterpret_cast<const WideChar*>(u"wide text");

TEST(StringFaults, NarrowTextKeepsItsLength) {
    AllocationFaults faults(1);
    const String s("narrow");
    faults.Disarm();
    EXPECT_EQ(s.wide, nullptr);
    EXPECT_EQ(s.length, 6u);
    EXPECT_EQ(s.GetUtf8(), nullptr);
}

TEST(StringFaults, WideTextAndCopiesBecomeNull) {
    const String source("source");
    AllocationFaults faults(1, FaultMode::FromThenOn);
    const String wide(kWide);
    const String copy(source);
    String assigned;
    assigned = source;
    faults.Disarm();
    for (const String* const s : {&wide, &copy, static_cast<const String*>(&assigned)}) {
        EXPECT_EQ(s->wide, nullptr);
        EXPECT_EQ(s->length, 0u);
    }
}

TEST(StringFaults, AFailedAppendLosesTheText) {
    String s("text");
    s.GetUtf8();
    const String more("more");
    AllocationFaults faults(1);
    s.Append(more);
    faults.Disarm();
    EXPECT_EQ(s.wide, nullptr);
    EXPECT_EQ(s.utf8, nullptr);
    EXPECT_EQ(s.length, 0u);
}

TEST(StringFaults, AFailedSumIsNullAndNotOneOfItsParts) {
    const String a("left");
    const String b("right");
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        const String sum = a + b;
        faults.Disarm();
        const bool failed = faults.Failed() != 0;
        EXPECT_EQ(sum.wide == nullptr, failed);
        EXPECT_EQ(sum.length, failed ? 0u : 9u);
    });
    EXPECT_EQ(points, 2u);
}

TEST(StringFaults, AFailedSubstringIntoItselfLeavesItEmpty) {
    String s("text");
    s.GetUtf8();
    AllocationFaults faults(1);
    s.Substring(1, 2, s);
    faults.Disarm();
    EXPECT_EQ(s.wide, nullptr);
    EXPECT_EQ(s.utf8, nullptr);
    EXPECT_EQ(s.length, 0u);
}

TEST(StringFaults, AFailedSubstringLeavesItsTargetEmpty) {
    const String s("text");
    String out("old");
    AllocationFaults faults(1);
    s.Substring(1, 2, out);
    faults.Disarm();
    EXPECT_EQ(out.wide, nullptr);
    EXPECT_EQ(out.length, 0u);
}

TEST(StringFaults, AFailedNarrowFormIsNotCached) {
    const String s("text");
    AllocationFaults faults(1, FaultMode::FromThenOn);
    const char* const utf8 = s.GetUtf8();
    const char* const ansi = s.GetAnsi();
    faults.Disarm();
    EXPECT_EQ(utf8, nullptr);
    EXPECT_EQ(ansi, nullptr);
    EXPECT_STREQ(s.GetUtf8(), "text");
    EXPECT_STREQ(s.GetAnsi(), "text");
}

TEST(StringFaults, EveryOperationSurvivesEveryFailure) {
    const std::string standard = "a standard text that is longer than a small buffer";
    std::istringstream stream;
    const std::size_t points = ForEachAllocationFailing([&](AllocationFaults& faults) {
        faults.Disarm();
        stream.clear();
        stream.str("  atokenthatislongerthanasmallbufferholds next");
        faults.Rearm();
        String a("one");
        String b(kWide);
        const String sum = a + b;
        b = sum;
        b = "narrow";
        b = kWide;
        b = standard;
        a += b;
        a.ToLower();
        sum.Substring(1, 3, b);
        static_cast<void>(a.Find(b));
        static_cast<void>(a == "one");
        static_cast<void>(a.Compare(sum));
        a.GetAnsi();
        a.GetUtf8();
        ReadTrimmedToken(stream, a);
    });
    EXPECT_GE(points, 15u);
}

template <class T>
class ArrayFaults : public ::testing::Test {
protected:
    static void ExpectFailed(const Array<T>& array) {
        EXPECT_FALSE(array.IsValid());
        EXPECT_EQ(array.error.flags, 4u);
        EXPECT_EQ(array.error.code, ObjectErrorOutOfMemory::errorCode);
        EXPECT_EQ(array.data, nullptr);
        EXPECT_EQ(array.shape.extents[0], 0u);
        for (int i = 1; i < 8; ++i) EXPECT_EQ(array.shape.extents[i], 1u);
        EXPECT_EQ(array.shape.dimensions, 1u);
        EXPECT_EQ(array.shape.elements, 0u);
        EXPECT_EQ(array.capacity, 0u);
        EXPECT_TRUE(array.owned);
    }

    static Array<T> OfTwo() {
        Array<T> array;
        array.Append(T{});
        array.Append(T{});
        return array;
    }
};

template <class... Types>
using TestTypes = ::testing::Types<Types...>;
using ArrayTypes = TestTypes<unsigned char, Complex<double>, String, RasterBandHistogram<float>>;
TYPED_TEST_SUITE(ArrayFaults, ArrayTypes);

TYPED_TEST(ArrayFaults, AllocateFailsForGood) {
    Array<TypeParam> array;
    AllocationFaults faults(1);
    EXPECT_FALSE(array.Allocate(3));
    faults.Disarm();
    this->ExpectFailed(array);
    EXPECT_TRUE(array.Append(TypeParam{}));
    EXPECT_EQ(array.shape.elements, 1u);
    EXPECT_FALSE(array.IsValid());
}

TYPED_TEST(ArrayFaults, AllocateZeroIsNoFailureEvenThen) {
    Array<TypeParam> array;
    AllocationFaults faults(1);
    const bool allocated = array.Allocate(0);
    faults.Disarm();
    EXPECT_TRUE(allocated);
    EXPECT_TRUE(array.IsValid());
    EXPECT_EQ(array.capacity, 0u);
}

TYPED_TEST(ArrayFaults, GrowthThatFailsEmptiesTheArray) {
    Array<TypeParam> appended = this->OfTwo();
    Array<TypeParam> shaped = this->OfTwo();
    Array<TypeParam> reserved = this->OfTwo();
    TypeParam* const old = reserved.data;
    const TypeParam value{};
    AllocationFaults faults(1, FaultMode::FromThenOn);
    const bool answers[] = {appended.Append(value), shaped.SetShape(ArrayShape(3)),
                            reserved.Reserve(3)};
    faults.Disarm();
    for (const bool answer : answers) EXPECT_FALSE(answer);
    this->ExpectFailed(appended);
    this->ExpectFailed(shaped);
    this->ExpectFailed(reserved);
    delete[] old;  // Reserve leaves it to its caller, also when it fails
}

TYPED_TEST(ArrayFaults, CopyAndAssignmentThatFailAreEmpty) {
    const Array<TypeParam> source = this->OfTwo();
    Array<TypeParam> target;
    target.Append(TypeParam{});
    AllocationFaults faults(1, FaultMode::FromThenOn);
    const Array<TypeParam> copy(source);
    target = source;
    faults.Disarm();
    this->ExpectFailed(copy);
    this->ExpectFailed(target);
    EXPECT_TRUE(source.IsValid());
}

TYPED_TEST(ArrayFaults, EveryOperationSurvivesEveryFailure) {
    const std::size_t points = ForEachAllocationFailing([](AllocationFaults&) {
        Array<TypeParam> array;
        for (int i = 0; i < 3; ++i) array.Append(TypeParam{});
        Array<TypeParam> other(array);
        other.SetShape(ArrayShape(2, 3));
        array = other;
        TypeParam* const old = array.data;
        array.Reserve(9);
        if (array.data != old) delete[] old;
        array.ToString();
        array.Clear();
        array.Allocate(2);
    });
    EXPECT_GE(points, 8u);
}

TEST(ArrayFaultsOfElements, AnElementThatCannotBeCopiedIsNull) {
    Array<String> source;
    source.Append("first");
    AllocationFaults faults(2);  // the first is the buffer, the second the text
    const Array<String> copy(source);
    faults.Disarm();
    EXPECT_TRUE(copy.IsValid());
    ASSERT_EQ(copy.shape.elements, 1u);
    EXPECT_EQ(copy.data[0].wide, nullptr);
}

struct Counted {
    static inline int living = 0;
    Counted() { ++living; }
    virtual ~Counted() { --living; }
};

TEST(PointerFaults, WithoutARecordTheObjectGoesAndThePointerIsEmpty) {
    auto* const object = new Counted;
    AllocationFaults faults(1, FaultMode::FromThenOn);
    Pointer<Counted> pointer(object);
    const Pointer<Counted> copy(pointer);
    Pointer<Counted> assigned(copy);
    assigned = pointer;
    faults.Disarm();
    EXPECT_EQ(Counted::living, 0);
    EXPECT_EQ(pointer.record, nullptr);
    EXPECT_FALSE(copy);
    EXPECT_FALSE(assigned);
    pointer.Reset(new Counted);
    EXPECT_TRUE(pointer);
}

TEST(PointerFaults, ResetWithoutARecordReleasesTheOldObject) {
    Pointer<Counted> pointer(new Counted);
    auto* const object = new Counted;
    AllocationFaults faults(1);
    pointer.Reset(object);
    faults.Disarm();
    EXPECT_EQ(Counted::living, 0);
    EXPECT_FALSE(pointer);
}

TEST(LockFaults, WithoutMemoryNoLockIsHeld) {
    CRITICAL_SECTION section;
    InitializeCriticalSection(&section);
    AllocationFaults faults(1);
    const auto lock = HoldLock(&section);
    faults.Disarm();
    EXPECT_EQ(lock, nullptr);
    EXPECT_TRUE(section.Mutex().try_lock());
    section.Mutex().unlock();
    DeleteCriticalSection(&section);
}

}  // namespace
}  // namespace zelm
