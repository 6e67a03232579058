#include "metadata/Metadata.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>

namespace zelm {
namespace {

// A leaf that tells when it goes.
class Leaf : public MetadataObject {
public:
    explicit Leaf(int& livingLeaves) : living(livingLeaves) { ++living; }
    ~Leaf() override { --living; }
    std::wstring GetValueText() const override { return L"3.5"; }
    const void* GetValueData(std::uint32_t& state) const override {
        state = 1;
        return this;
    }
    std::uint32_t GetElementCount() const override { return 1; }
    std::wstring GetTypeName() const override { return L"float"; }
    std::int32_t GetTypeCode() const override { return 1; }

private:
    int& living;
};

TEST(Metadata, NewOneHasAnEmptyTree) {
    const Metadata metadata;
    ASSERT_TRUE(metadata.impl);
    EXPECT_TRUE(metadata.impl->root.children.empty());
    EXPECT_EQ(metadata.impl->root.rows, 0u);
    EXPECT_EQ(metadata.impl->root.columns, 0u);
    EXPECT_TRUE(metadata.IsValid());
    EnterCriticalSection(&metadata.impl->lock);
    LeaveCriticalSection(&metadata.impl->lock);
}

TEST(Metadata, CopiesShareTheTreeAndTheLastOneFreesIt) {
    int living = 0;
    auto first = std::make_unique<Metadata>();
    auto second = std::make_unique<Metadata>(*first);
    EXPECT_EQ(first->impl.Get(), second->impl.Get());
    second->impl->root.children[L"a"] = new Leaf(living);
    first.reset();
    EXPECT_EQ(living, 1);
    EXPECT_EQ(second->impl.record->count, 1u);
    second.reset();
    EXPECT_EQ(living, 0);
}

TEST(Metadata, AssignmentReleasesTheOldTree) {
    int living = 0;
    Metadata target;
    target.impl->root.children[L"a"] = new Leaf(living);
    const Metadata source;
    target = source;
    EXPECT_EQ(living, 0);
    EXPECT_EQ(target.impl.Get(), source.impl.Get());
    EXPECT_EQ(source.impl.record->count, 2u);
}

TEST(Metadata, SelfAssignmentLeavesTheCount) {
    Metadata metadata;
    const Metadata copy(metadata);
    const Metadata& same = metadata;
    metadata = same;
    EXPECT_EQ(metadata.impl.record->count, 2u);
}

TEST(Metadata, AnswersToItsOwnCodeAlone) {
    const Metadata metadata;
    EXPECT_TRUE(metadata.IsKindOf(Metadata::typeCode));
    EXPECT_FALSE(metadata.IsKindOf(Object::typeCode));
}

TEST(Metadata, TextFormHasItsWord) {
    const Metadata metadata;
    EXPECT_EQ(metadata.ToString().Find(String("{Metadata}@")), 0u);
    EXPECT_TRUE(metadata.ToString() == MakeObjectUrl("Metadata", &metadata));
}

TEST(Metadata, ErrorRecordsAreNotCopied) {
    Metadata failed;
    failed.SetError(ObjectErrorOutOfMemory());
    const Metadata copy(failed);
    EXPECT_TRUE(copy.IsValid());
    failed = copy;
    EXPECT_FALSE(failed.IsValid());
}

TEST(Metadata, MissingTreeIsTolerated) {
    Metadata metadata;
    metadata.impl.Release();
    const Metadata copy(metadata);
    Metadata target;
    target = metadata;
    EXPECT_FALSE(copy.impl);
    EXPECT_FALSE(target.impl);
}

}  // namespace
}  // namespace zelm
