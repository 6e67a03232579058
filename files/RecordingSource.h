// RecordingSource: a source around another one that remembers what went wrong.
//
// Code between a host and its disk may have no way to tell of a failure: readers and writers of the
// module answer true whatever the disk did. So the host puts a recording source around its own,
// lends that, and looks at the record when the work is done:
//
//     auto disk = std::make_shared<RecordingSource>(file);
//     const LentName name = Lend(disk);
//     ...                                    // let the module work on name.Text()
//     if (const auto record = disk->Take(); record.Failures() != 0)
//         Report(record.first->operation, record.first->error);
//
// Kept are all operations of this source that failed, those that were refused before the source
// around which it lies saw them included, and reads that were short because the source ends there;
// the latter are counted apart, since they are no failures. Operations on the other source directly
// are not seen. Success costs nothing beyond the call handed on.
//
// The record may be looked at and reset from any thread at any time. As for the rest, threads may
// do what the other source bears.
#ifndef ZMC_FILES_RECORDINGSOURCE_H
#define ZMC_FILES_RECORDINGSOURCE_H

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>

#include "files/ByteSource.h"
#include "files/FilesApi.h"

namespace zelm::files {

struct FailureRecord {
    std::uint64_t reads = 0;          // that failed
    std::uint64_t writes = 0;         // that failed
    std::uint64_t others = 0;         // Size, Truncate, Sync and Remove that failed
    std::uint64_t endsMet = 0;        // reads that were short because the source ends there
    std::optional<Failure> first;     // of the failures
    std::optional<Failure> firstEnd;  // of the reads that met the end

    std::uint64_t Failures() const { return reads + writes + others; }
};

class ZMC_FILES_API RecordingSource final : public ByteSource {
public:
    // `source` must not be null.
    explicit RecordingSource(std::shared_ptr<ByteSource> source);
    ~RecordingSource() override;

    const std::shared_ptr<ByteSource>& Source() const noexcept { return inner; }

    // What went wrong since construction or the last Reset or Take.
    FailureRecord Record() const noexcept;
    // Forgets it.
    void Reset() noexcept;
    // Both in one step, so that no failure falls between.
    FailureRecord Take() noexcept;

protected:
    Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override;
    void DoReadMany(std::span<Range> ranges) override;
    Transfer DoWriteAt(std::uint64_t offset, const void* buffer, std::size_t size) override;
    int DoTellSize(std::uint64_t& size) const override;
    int DoTruncate(std::uint64_t size) override;
    int DoSync() override;
    bool DoIsWritable() const override;
    Identity DoIdentify() const override;
    int DoRemove() override;
    void DoNote(const Failure& failure) const override;

private:
    const std::shared_ptr<ByteSource> inner;
    mutable std::mutex mutex;  // guards what follows
    mutable FailureRecord record;
};

}  // namespace zelm::files

#endif
