#include "files/RecordingSource.h"

#include <utility>

namespace zelm::files {

RecordingSource::RecordingSource(std::shared_ptr<ByteSource> source) : inner(std::move(source)) {}

RecordingSource::~RecordingSource() = default;

FailureRecord RecordingSource::Record() const noexcept {
    const std::lock_guard lock(mutex);
    return record;
}

void RecordingSource::Reset() noexcept { Take(); }

FailureRecord RecordingSource::Take() noexcept {
    const std::lock_guard lock(mutex);
    return std::exchange(record, {});
}

// What the other source's public face answers is final: short without an error means its end.
Transfer RecordingSource::DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
    Transfer done;
    done.bytes = inner->ReadAt(offset, buffer, size, &done.error);
    done.end = done.error == 0;
    return done;
}

void RecordingSource::DoReadMany(std::span<Range> ranges) { inner->ReadMany(ranges); }

Transfer RecordingSource::DoWriteAt(std::uint64_t offset, const void* buffer, std::size_t size) {
    Transfer done;
    done.bytes = inner->WriteAt(offset, buffer, size, &done.error);
    return done;
}

int RecordingSource::DoTellSize(std::uint64_t& size) const {
    int error = 0;
    inner->TellSize(size, &error);
    return error;
}

int RecordingSource::DoTruncate(std::uint64_t size) {
    int error = 0;
    inner->Truncate(size, &error);
    return error;
}

int RecordingSource::DoSync() {
    int error = 0;
    inner->Sync(&error);
    return error;
}

bool RecordingSource::DoIsWritable() const { return inner->IsWritable(); }

Identity RecordingSource::DoIdentify() const { return inner->Identify(); }

int RecordingSource::DoRemove() {
    int error = 0;
    inner->Remove(&error);
    return error;
}

void RecordingSource::DoNote(const Failure& failure) const {
    const std::lock_guard lock(mutex);
    if (failure.error == 0) {
        ++record.endsMet;
        if (!record.firstEnd) record.firstEnd = failure;
        return;
    }
    switch (failure.operation) {
        case Operation::Read:
            ++record.reads;
            break;
        case Operation::Write:
            ++record.writes;
            break;
        default:
            ++record.others;
    }
    if (!record.first) record.first = failure;
}

}  // namespace zelm::files
