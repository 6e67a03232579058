#include "core/Pointer.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <optional>
#include <vector>

#include "connection/RasterDataConnection.h"
#include "metadata/Metadata.h"

namespace zelm {
namespace {

struct Counted {
    static inline int living = 0;
    int value = 7;
    Counted() { ++living; }
    virtual ~Counted() { --living; }
};
struct Derived : Counted {
    int extra = 8;
};

TEST(Pointer, EmptyOneHasARecordAndNoObject) {
    Pointer<Counted> empty;
    ASSERT_NE(empty.record, nullptr);
    EXPECT_EQ(empty.record->count, 1u);
    EXPECT_EQ(empty.record->object, nullptr);
    EXPECT_FALSE(empty.record->noDelete);
    EXPECT_FALSE(empty);
    empty.Release();
    EXPECT_EQ(empty.record, nullptr);
    EXPECT_EQ(empty.Get(), nullptr);
    empty.Release();
}

TEST(Pointer, CopiesDroppedInAnyOrderDeleteTheObjectOnce) {
    std::vector<int> order{0, 1, 2, 3};
    do {
        std::optional<Pointer<Counted>> pointers[4];
        pointers[0].emplace(new Counted);
        for (int i = 1; i < 4; ++i) pointers[i].emplace(*pointers[0]);
        EXPECT_EQ(pointers[3]->record->count, 4u);
        for (std::size_t i = 0; i < order.size(); ++i) {
            EXPECT_EQ(Counted::living, 1);
            pointers[order[i]].reset();
        }
        EXPECT_EQ(Counted::living, 0);
    } while (std::next_permutation(order.begin(), order.end()));
}

TEST(Pointer, NoDeleteLeavesTheObjectAlone) {
    Counted object;
    {
        Pointer<Counted> pointer(&object);
        ASSERT_TRUE(pointer.record);
        pointer.record->noDelete = true;
        const Pointer<Counted> copy(pointer);
    }
    EXPECT_EQ(Counted::living, 1);
}

TEST(Pointer, AssignmentDropsTheOldAndSharesTheNew) {
    Pointer<Counted> a(new Counted);
    Pointer<Counted> b(new Counted);
    a = b;
    EXPECT_EQ(Counted::living, 1);
    EXPECT_EQ(a.record, b.record);
    EXPECT_EQ(a.record->count, 2u);
    const Pointer<Counted>& same = a;
    a = same;
    EXPECT_EQ(a.record->count, 2u);
    const Pointer<Counted> sharing(a);
    a = sharing;
    EXPECT_EQ(a.record->count, 3u);
}

TEST(Pointer, AssigningOneWithoutRecordLeavesNoRecord) {
    Pointer<Counted> released;
    released.Release();
    const Pointer<Counted> copy(released);
    EXPECT_EQ(copy.record, nullptr);
    Pointer<Counted> target(new Counted);
    target = released;
    EXPECT_EQ(target.record, nullptr);
    EXPECT_EQ(Counted::living, 0);
}

struct Node {
    Pointer<Node> next;
    virtual ~Node() = default;
};

TEST(Pointer, AssignmentFromInsideTheReleasedObject) {
    Pointer<Node> list(new Node);
    list->next.Reset(new Node);
    Node* const second = list->next.Get();
    list = list->next;
    EXPECT_EQ(list.Get(), second);
    EXPECT_EQ(list.record->count, 1u);
}

TEST(Pointer, ResetReleasesAndBinds) {
    Pointer<Counted> pointer(new Counted);
    const Pointer<Counted> copy(pointer);
    pointer.Reset(new Counted);
    EXPECT_EQ(Counted::living, 2);
    EXPECT_NE(pointer.record, copy.record);
    EXPECT_EQ(copy.record->count, 1u);
    pointer.Reset();
    EXPECT_EQ(Counted::living, 1);
    ASSERT_NE(pointer.record, nullptr);
    EXPECT_FALSE(pointer);
}

TEST(Pointer, RecordWithCountZeroGoesAtTheFirstRelease) {
    Pointer<Counted> pointer(new Counted);
    pointer.record->count = 0;
    pointer.Release();
    EXPECT_EQ(Counted::living, 0);
    EXPECT_EQ(pointer.record, nullptr);
}

TEST(Pointer, ReleaseOfASharedRecordStillNamesIt) {
    Pointer<Counted> pointer(new Counted);
    Pointer<Counted> copy(pointer);
    pointer.Release();
    EXPECT_EQ(pointer.record, copy.record);
    EXPECT_EQ(copy.record->count, 1u);
    pointer.record = nullptr;
}

TEST(Pointer, ConversionToABaseSharesTheRecord) {
    Pointer<Derived> derived(new Derived);
    Pointer<Counted> base(derived);
    EXPECT_EQ(static_cast<const void*>(base.record), static_cast<const void*>(derived.record));
    EXPECT_EQ(base->value, 7);
    derived.Reset();
    EXPECT_EQ(Counted::living, 1);
    base.Reset();
    EXPECT_EQ(Counted::living, 0);
}

static_assert(std::is_constructible_v<DataConnectionPtr, RasterDataConnectionPtr>);
static_assert(!std::is_constructible_v<RasterDataConnectionPtr, DataConnectionPtr>);
static_assert(!std::is_constructible_v<Pointer<Counted>, Pointer<Node>>);
static_assert(!std::is_convertible_v<Counted*, Pointer<Counted>>);

}  // namespace
}  // namespace zelm
