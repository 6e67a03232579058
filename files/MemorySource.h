// MemorySource: bytes in memory as a source, which grows as it is written, up to a limit.
//
// For hosts that have a file's bytes already or want them nowhere else, and for tests. Everything
// may be called from any number of threads at once: a read sees each write whole or not at all.
#ifndef ZMC_FILES_MEMORYSOURCE_H
#define ZMC_FILES_MEMORYSOURCE_H

#include <cstdint>
#include <shared_mutex>
#include <vector>

#include "files/ByteSource.h"
#include "files/FilesApi.h"

namespace zelm::files {

class ZMC_FILES_API MemorySource final : public ByteSource {
public:
    using Bytes = std::vector<unsigned char>;

    // Whether IsWritable answers true; a source that is not refuses writes with EBADF.
    enum class Access { ReadOnly, Writable };

    // What a source can grow to if nothing else is said: a write far behind its end takes all the
    // memory up to there.
    static constexpr std::uint64_t kDefaultLimit = std::uint64_t{1} << 30;

    // An empty source that can be written.
    MemorySource();
    // A source that begins with `content`, which may be longer than `limit` and then only shrinks.
    explicit MemorySource(Bytes content, Access access = Access::Writable,
                          std::uint64_t limit = kDefaultLimit);
    ~MemorySource() override;

    // A copy of what it holds now. Throws std::bad_alloc.
    Bytes Content() const;

protected:
    // What the operations of ByteSource.h come down to, with the answers that are told there.
    Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override;
    // Beyond the limit nothing is moved, and ENOSPC says so of what lies before it as well.
    Transfer DoWriteAt(std::uint64_t offset, const void* buffer, std::size_t size) override;
    int DoTellSize(std::uint64_t& size) const override;
    int DoTruncate(std::uint64_t size) override;
    bool DoIsWritable() const override;
    // Numbers of this process: the thing is the source, and each write a new state of it.
    Identity DoIdentify() const override;

private:
    const bool writable;
    const std::uint64_t sizeLimit;
    const std::uint64_t number;
    mutable std::shared_mutex mutex;  // guards what follows
    Bytes bytes;
    std::int64_t changes = 0;
};

}  // namespace zelm::files

#endif
