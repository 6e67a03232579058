// Reference counts under threads; meant for the thread sanitizer as well.
#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <thread>
#include <vector>

#include "metadata/Metadata.h"
#include "raster/RasterProps.h"

namespace zelm {
namespace {

constexpr int kThreads = 8;
constexpr int kRounds = 5000;

struct Counted {
    static inline std::atomic<int> living{0};
    Counted() { ++living; }
    virtual ~Counted() { --living; }
};
struct Derived : Counted {};

template <class Work>
void OnAllThreads(Work work) {
    std::vector<std::thread> threads;
    for (int i = 0; i < kThreads; ++i) threads.emplace_back(work);
    for (auto& thread : threads) thread.join();
}

TEST(ReferenceCountThreads, PointerCopiesAndDrops) {
    const Pointer<Derived> shared(new Derived);
    OnAllThreads([&shared] {
        for (int i = 0; i < kRounds; ++i) {
            Pointer<Derived> copy(shared);
            const Pointer<Counted> base(copy);
            Pointer<Derived> other;
            other = copy;
            copy.Reset();
        }
    });
    EXPECT_EQ(shared.record->count, 1u);
    EXPECT_EQ(Counted::living, 1);
}

// The first thread lets go of the first reference, so that any of them may drop the last.
TEST(ReferenceCountThreads, TheLastDropDeletesOnceWhoeverDoesIt) {
    for (int round = 0; round < 200; ++round) {
        std::vector<Pointer<Counted>> copies;
        {
            const Pointer<Counted> first(new Counted);
            for (int i = 0; i < kThreads; ++i) copies.emplace_back(first);
        }
        std::vector<std::thread> threads;
        for (auto& copy : copies) threads.emplace_back([&copy] { copy.Release(); });
        for (auto& thread : threads) thread.join();
        EXPECT_EQ(Counted::living, 0);
        for (auto& copy : copies) copy.record = nullptr;
    }
}

TEST(ReferenceCountThreads, MetadataHandlesShareOneTree) {
    auto original = std::make_unique<Metadata>();
    const LockableMetadataImplPtr tree(original->impl);
    OnAllThreads([&original] {
        for (int i = 0; i < kRounds; ++i) {
            const Metadata copy(*original);
            Metadata other;
            other = copy;
        }
    });
    EXPECT_EQ(tree.record->count, 2u);
    original.reset();
    EXPECT_EQ(tree.record->count, 1u);
}

TEST(ReferenceCountThreads, RecordsOfARasterShareOneTree) {
    const RasterProps original;
    OnAllThreads([&original] {
        for (int i = 0; i < kRounds / 10; ++i) {
            const RasterProps copy(original);
            RasterProps other;
            other = copy;
        }
    });
    EXPECT_EQ(original.metadata.impl.record->count, 1u);
}

TEST(ReferenceCountThreads, TreeIsWrittenUnderItsLock) {
    const Metadata original;
    OnAllThreads([handle = original] {
        for (int i = 0; i < kRounds; ++i) {
            EnterCriticalSection(&handle.impl->lock);
            ++handle.impl->root.rows;
            LeaveCriticalSection(&handle.impl->lock);
        }
    });
    EXPECT_EQ(original.impl->root.rows, static_cast<std::uint32_t>(kThreads * kRounds));
}

}  // namespace
}  // namespace zelm
