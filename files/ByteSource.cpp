#include "files/ByteSource.h"

#include <algorithm>
#include <cerrno>
#include <new>

namespace zelm::files {
namespace {

// Within a handler: the number that stands for what was thrown.
int CaughtError() noexcept {
    try {
        throw;
    } catch (const std::bad_alloc&) {
        return ENOMEM;
    } catch (...) {
        return EIO;
    }
}

// An answer is believed as far as it can be true.
Transfer Judged(Transfer answer, std::size_t size) {
    if (answer.bytes > size) return {0, EIO};
    if (answer.bytes == size) return {size};
    if (answer.error != 0) answer.end = false;
    return answer;
}

template <class Call>
Transfer GuardedTransfer(std::size_t size, Call&& call) noexcept {
    try {
        return Judged(call(), size);
    } catch (...) {
        return {0, CaughtError()};
    }
}

template <class Call>
int GuardedStep(Call&& call) noexcept {
    try {
        return call();
    } catch (...) {
        return CaughtError();
    }
}

bool IsOver(const Transfer& done, std::size_t size) {
    return done.bytes == size || done.error != 0 || done.end;
}

bool Overflows(std::uint64_t offset, std::size_t size) {
    return size > ByteSource::kUnknownSize - offset;
}

}  // namespace

// All calls of what derived classes fill in.
class ByteSource::Border {
public:
    static Transfer ReadOnce(ByteSource& source, std::uint64_t offset, void* buffer,
                             std::size_t size) noexcept {
        return GuardedTransfer(size, [&] { return source.DoReadAt(offset, buffer, size); });
    }

    static Transfer WriteOnce(ByteSource& source, std::uint64_t offset, const void* buffer,
                              std::size_t size) noexcept {
        return GuardedTransfer(size, [&] { return source.DoWriteAt(offset, buffer, size); });
    }

    // Goes on behind `done` until the range is whole, a read fails, or nothing comes any more. Then
    // the source has ended, unless it says that it is longer.
    static Transfer ReadRest(ByteSource& source, std::uint64_t offset, void* buffer,
                             std::size_t size, Transfer done) noexcept {
        unsigned char* const bytes = static_cast<unsigned char*>(buffer);
        while (!IsOver(done, size)) {
            const Transfer next =
                ReadOnce(source, offset + done.bytes, bytes + done.bytes, size - done.bytes);
            done.bytes += next.bytes;
            done.error = next.error;
            done.end = next.end;
            if (next.bytes != 0 || IsOver(done, size)) continue;
            done.end = EndsAt(source, offset + done.bytes);
            done.error = done.end ? 0 : EIO;
        }
        return done;
    }

    static Transfer WriteAll(ByteSource& source, std::uint64_t offset, const void* buffer,
                             std::size_t size) noexcept {
        const unsigned char* const bytes = static_cast<const unsigned char*>(buffer);
        Transfer done;
        while (done.bytes != size && done.error == 0) {
            const Transfer next =
                WriteOnce(source, offset + done.bytes, bytes + done.bytes, size - done.bytes);
            done.bytes += next.bytes;
            done.error = next.bytes == 0 && next.error == 0 ? EIO : next.error;
        }
        return done;
    }

    static int AskSize(const ByteSource& source, std::uint64_t& size) noexcept {
        const int failure = GuardedStep([&] { return source.DoTellSize(size); });
        return failure == 0 && size == kUnknownSize ? EOVERFLOW : failure;
    }

    // A step that is refused where nothing may be changed.
    template <class Step>
    static int Change(const ByteSource& source, Step&& step) noexcept {
        return source.IsWritable() ? GuardedStep(step) : EBADF;
    }

    static void Note(const ByteSource& source, const Failure& failure) noexcept {
        try {
            source.DoNote(failure);
        } catch (...) {
        }
    }

    // Ends an operation that is no transfer.
    static bool Settle(const ByteSource& source, Operation operation, std::uint64_t offset,
                       int failure, int* error) noexcept {
        if (failure != 0) Note(source, {operation, offset, 0, 0, failure});
        if (error) *error = failure;
        return failure == 0;
    }

private:
    // A source that cannot tell its size is believed when it gives no more.
    static bool EndsAt(const ByteSource& source, std::uint64_t offset) noexcept {
        std::uint64_t size = 0;
        return AskSize(source, size) != 0 || size <= offset;
    }
};

ByteSource::~ByteSource() = default;

std::size_t ByteSource::ReadAt(std::uint64_t offset, void* buffer, std::size_t size,
                               int* error) noexcept {
    Transfer done;
    if (Overflows(offset, size))
        done.error = EOVERFLOW;
    else if (size != 0)
        done = Border::ReadRest(*this, offset, buffer, size,
                                Border::ReadOnce(*this, offset, buffer, size));
    if (done.bytes != size)
        Border::Note(*this, {Operation::Read, offset, size, done.bytes, done.error});
    if (error) *error = done.error;
    return done.bytes;
}

bool ByteSource::ReadMany(std::span<Range> ranges) noexcept {
    bool inOrder = true;
    for (Range& range : ranges) {
        range.done = {};
        inOrder &= range.size != 0 && !Overflows(range.offset, range.size);
    }
    // A source meets ranges in order only; the others leave all to be read singly below.
    const int failure = inOrder ? GuardedStep([&] { return DoReadMany(ranges), 0; }) : 0;
    bool whole = true;
    for (Range& range : ranges) {
        range.done = Judged(range.done, range.size);
        if (!IsOver(range.done, range.size)) range.done.error = failure;
        if (Overflows(range.offset, range.size)) range.done.error = EOVERFLOW;
        range.done = Border::ReadRest(*this, range.offset, range.buffer, range.size, range.done);
        if (range.done.bytes == range.size) continue;
        whole = false;
        Border::Note(
            *this, {Operation::Read, range.offset, range.size, range.done.bytes, range.done.error});
    }
    return whole;
}

std::size_t ByteSource::WriteAt(std::uint64_t offset, const void* buffer, std::size_t size,
                                int* error) noexcept {
    Transfer done;
    if (!IsWritable())
        done.error = EBADF;
    else if (Overflows(offset, size))
        done.error = EOVERFLOW;
    else
        done = Border::WriteAll(*this, offset, buffer, size);
    if (done.error != 0)
        Border::Note(*this, {Operation::Write, offset, size, done.bytes, done.error});
    if (error) *error = done.error;
    return done.bytes;
}

std::uint64_t ByteSource::Size() const noexcept {
    std::uint64_t size = 0;
    return TellSize(size) ? size : kUnknownSize;
}

bool ByteSource::TellSize(std::uint64_t& size, int* error) const noexcept {
    std::uint64_t told = 0;
    if (!Border::Settle(*this, Operation::Size, 0, Border::AskSize(*this, told), error))
        return false;
    size = told;
    return true;
}

bool ByteSource::Truncate(std::uint64_t size, int* error) noexcept {
    const int failure = Border::Change(*this, [&] { return DoTruncate(size); });
    return Border::Settle(*this, Operation::Truncate, size, failure, error);
}

bool ByteSource::Sync(int* error) noexcept {
    return Border::Settle(*this, Operation::Sync, 0, GuardedStep([&] { return DoSync(); }), error);
}

bool ByteSource::IsWritable() const noexcept {
    try {
        return DoIsWritable();
    } catch (...) {
        return false;
    }
}

Identity ByteSource::Identify() const noexcept {
    try {
        return DoIdentify();
    } catch (...) {
        return {};
    }
}

bool ByteSource::Remove(int* error) noexcept {
    const int failure = Border::Change(*this, [&] { return DoRemove(); });
    return Border::Settle(*this, Operation::Remove, 0, failure, error);
}

void ByteSource::DoReadMany(std::span<Range> ranges) {
    for (Range& range : ranges)
        range.done = Border::ReadOnce(*this, range.offset, range.buffer, range.size);
}

bool ByteSource::DoIsWritable() const { return false; }
Transfer ByteSource::DoWriteAt(std::uint64_t, const void*, std::size_t) { return {0, ENOTSUP}; }
int ByteSource::DoTruncate(std::uint64_t) { return ENOTSUP; }
int ByteSource::DoRemove() { return ENOTSUP; }
int ByteSource::DoSync() { return 0; }
Identity ByteSource::DoIdentify() const { return {}; }
void ByteSource::DoNote(const Failure&) const {}

}  // namespace zelm::files
