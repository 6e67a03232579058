#include "files/MemorySource.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstring>
#include <mutex>
#include <utility>

namespace zelm::files {
namespace {

std::uint64_t NextNumber() {
    static std::atomic<std::uint64_t> last{0};
    return ++last;
}

constexpr std::uint64_t kNoVolume = ~std::uint64_t{0};

}  // namespace

MemorySource::MemorySource() : MemorySource(Bytes()) {}

MemorySource::MemorySource(Bytes content, Access access, std::uint64_t limit)
    : writable(access == Access::Writable),
      sizeLimit(std::min<std::uint64_t>(limit, content.max_size())),
      number(NextNumber()),
      bytes(std::move(content)) {}

MemorySource::~MemorySource() = default;

MemorySource::Bytes MemorySource::Content() const {
    const std::shared_lock lock(mutex);
    return bytes;
}

Transfer MemorySource::DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
    const std::shared_lock lock(mutex);
    if (offset >= bytes.size()) return {0, 0, true};
    const std::size_t there = bytes.size() - static_cast<std::size_t>(offset);
    const std::size_t moved = std::min(size, there);
    std::memcpy(buffer, bytes.data() + offset, moved);
    return {moved, 0, true};
}

Transfer MemorySource::DoWriteAt(std::uint64_t offset, const void* buffer, std::size_t size) {
    const std::unique_lock lock(mutex);
    const std::uint64_t end = offset + size;
    if (end > bytes.size()) {
        if (end > sizeLimit) return {0, ENOSPC};
        bytes.resize(static_cast<std::size_t>(end));
    }
    std::memcpy(bytes.data() + offset, buffer, size);
    ++changes;
    return {size};
}

int MemorySource::DoTellSize(std::uint64_t& size) const {
    const std::shared_lock lock(mutex);
    size = bytes.size();
    return 0;
}

int MemorySource::DoTruncate(std::uint64_t size) {
    const std::unique_lock lock(mutex);
    if (size > bytes.size() && size > sizeLimit) return ENOSPC;
    bytes.resize(static_cast<std::size_t>(size));
    ++changes;
    return 0;
}

bool MemorySource::DoIsWritable() const { return writable; }

Identity MemorySource::DoIdentify() const {
    const std::shared_lock lock(mutex);
    return {true, kNoVolume, number, bytes.size(), changes, changes};
}

}  // namespace zelm::files
