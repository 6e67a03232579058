// A source around another one that misbehaves as it is told.
#ifndef ZMC_TESTS_SUPPORT_FAULTYSOURCE_H
#define ZMC_TESTS_SUPPORT_FAULTYSOURCE_H

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstddef>
#include <functional>
#include <memory>
#include <new>
#include <optional>
#include <stdexcept>
#include <utility>

#include "files/ByteSource.h"

namespace zmctest {

// What becomes of a transfer.
enum class SourceFault {
    Fails,            // moves nothing and says so with `error`
    FailsPartway,     // moves half and says so with `error`
    AnswersShort,     // moves half, at least a byte, and gives no reason
    AnswersNothing,   // moves nothing and gives no reason
    AnswersTooMuch,   // moves nothing and claims all and a byte more
    RunsOutOfMemory,  // throws std::bad_alloc
    Throws,           // throws std::runtime_error
    ThrowsANumber,    // throws what is no exception
};

class FaultySource : public zelm::files::ByteSource {
public:
    using Transfer = zelm::files::Transfer;

    explicit FaultySource(std::shared_ptr<zelm::files::ByteSource> source)
        : inner(std::move(source)) {}

    // Which transfers go wrong: the n-th, from 1, or that and all later ones; none for 0.
    std::size_t n = 0;
    bool fromThenOn = false;
    SourceFault fault = SourceFault::Fails;
    int error = EIO;
    // What it says of its size, right or wrong; kUnknownSize and failures included.
    std::optional<std::uint64_t> claimedSize;
    int sizeError = 0;
    // Called ahead of each transfer with its number: may cut what lies below, withdraw, and so on.
    std::function<void(std::size_t)> beforeTransfer;
    // All that is no transfer throws.
    bool othersThrow = false;

    std::size_t Transfers() const { return transfers; }

protected:
    Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override {
        return Move(size, [&](std::size_t part) {
            Transfer done;
            done.bytes = inner->ReadAt(offset, buffer, part, &done.error);
            return done;
        });
    }
    Transfer DoWriteAt(std::uint64_t offset, const void* buffer, std::size_t size) override {
        return Move(size, [&](std::size_t part) {
            Transfer done;
            done.bytes = inner->WriteAt(offset, buffer, part, &done.error);
            return done;
        });
    }
    int DoTellSize(std::uint64_t& size) const override {
        ThrowIfTold();
        size = claimedSize.value_or(inner->Size());
        return sizeError;
    }
    int DoTruncate(std::uint64_t size) override {
        ThrowIfTold();
        int failure = 0;
        inner->Truncate(size, &failure);
        return failure;
    }
    int DoSync() override {
        ThrowIfTold();
        int failure = 0;
        inner->Sync(&failure);
        return failure;
    }
    int DoRemove() override {
        ThrowIfTold();
        int failure = 0;
        inner->Remove(&failure);
        return failure;
    }
    bool DoIsWritable() const override { return inner->IsWritable(); }
    zelm::files::Identity DoIdentify() const override {
        ThrowIfTold();
        return inner->Identify();
    }

private:
    void ThrowIfTold() const {
        if (othersThrow) throw std::runtime_error("as it was told");
    }

    template <class Call>
    Transfer Move(std::size_t size, Call&& call) {
        const std::size_t number = ++transfers;
        if (beforeTransfer) beforeTransfer(number);
        if (n == 0 || (fromThenOn ? number < n : number != n)) return call(size);
        switch (fault) {
            case SourceFault::Fails:
                return {0, error};
            case SourceFault::FailsPartway:
                return {call(size / 2).bytes, error};
            case SourceFault::AnswersShort:
                return call(std::max<std::size_t>(size / 2, 1));
            case SourceFault::AnswersNothing:
                return {};
            case SourceFault::AnswersTooMuch:
                return {size + 1};
            case SourceFault::RunsOutOfMemory:
                throw std::bad_alloc();
            case SourceFault::Throws:
                throw std::runtime_error("as it was told");
            case SourceFault::ThrowsANumber:
                throw 5;
        }
        return {};
    }

    const std::shared_ptr<zelm::files::ByteSource> inner;
    std::atomic<std::size_t> transfers{0};
};

}  // namespace zmctest

#endif
