#include "gdal/VsiSource.h"

#include <cpl_error.h>
#include <cpl_vsi_virtual.h>

#include <cerrno>
#include <climits>
#include <utility>
#include <vector>

#include "files/Lending.h"
#include "gdal/RemoteSource.h"
#include "gdal/SourceNumber.h"
#include "host/base/Error.h"
#include "host/raster/LentFile.h"

namespace zmcgdal {
namespace {

using zelm::files::ByteSource;
using zelm::files::OpenMode;
using zelm::files::Range;
using zelm::files::Transfer;

const char* AccessFor(OpenMode mode) {
    if (mode == OpenMode::Create) return "w+b";
    return mode == OpenMode::Update ? "r+b" : "rb";
}

VSIVirtualHandle& HandleOf(VSILFILE* file) { return *reinterpret_cast<VSIVirtualHandle*>(file); }

// Null where the file has to be read from its beginning on.
std::shared_ptr<ByteSource> OpenRemote(const std::string& name, std::uint64_t bytes) {
    try {
        return std::make_shared<RemoteSource>(MakeFetcher(name), bytes);
    } catch (const NoRanges&) {
        return nullptr;
    } catch (const FetchError& error) {
        throw zmchost::Error(name, "open the raster", error.what());
    }
}

}  // namespace

bool IsVirtualName(const std::string& name) { return name.starts_with("/vsi"); }

std::shared_ptr<ByteSource> OpenByName(const std::string& name, bool forUpdate,
                                       std::uint64_t remoteBytes) {
    if (zelm::files::LooksLent(name))
        throw zmchost::Error(name, "open the raster", "names of lent sources are not taken here");
    if (!IsVirtualName(name)) return zmchost::OpenPlainFile(name, forUpdate);
    if (!NetworkPart(name).empty())
        if (auto remote = OpenRemote(name, remoteBytes)) return remote;
    std::shared_ptr<ByteSource> source;
    if (forUpdate) source = VsiSource::Open(name, OpenMode::Update);
    if (!source) source = VsiSource::Open(name, OpenMode::Read);
    if (!source) throw zmchost::Error(name, "open the raster", "GDAL does not open it");
    return source;
}

std::shared_ptr<VsiSource> VsiSource::Open(const std::string& name, OpenMode mode) {
    // Many of them cannot be written, and say so aloud.
    const CPLErrorStateBackuper before;
    CPLPushErrorHandler(CPLQuietErrorHandler);
    VSILFILE* const opened = VSIFOpenL(name.c_str(), AccessFor(mode));
    CPLPopErrorHandler();
    if (!opened) return nullptr;
    return std::shared_ptr<VsiSource>(new VsiSource(name, opened, mode != OpenMode::Read));
}

VsiSource::VsiSource(std::string fileName, VSILFILE* opened, bool isWritable)
    : name(std::move(fileName)),
      writable(isWritable),
      readsAnywhere(!isWritable && HandleOf(opened).HasPRead()),
      number(NextSourceNumber()),
      handle(opened) {}

VsiSource::~VsiSource() { VSIFCloseL(handle); }

int VsiSource::SizeHere(std::uint64_t& size) const {
    if (VSIFSeekL(handle, 0, SEEK_END) != 0) return EIO;
    size = VSIFTellL(handle);
    return 0;
}

// What is short without an end has failed: GDAL does not tell why.
Transfer VsiSource::ReadHere(std::uint64_t offset, void* buffer, std::size_t size) const {
    Transfer done;
    if (VSIFSeekL(handle, offset, SEEK_SET) != 0) return {0, EIO};
    done.bytes = VSIFReadL(buffer, 1, size, handle);
    if (done.bytes >= size) return done;
    std::uint64_t end = 0;
    done.error = SizeHere(end);
    done.end = done.error == 0 && offset + done.bytes >= end;
    if (!done.end) done.error = EIO;
    return done;
}

Transfer VsiSource::DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) {
    if (ReadPast(offset, buffer, size)) return {size};
    const std::lock_guard lock(mutex);
    return ReadHere(offset, buffer, size);
}

// What is not whole is asked for again by the handle's position, which tells the end of a file.
bool VsiSource::ReadPast(std::uint64_t offset, void* buffer, std::size_t size) const {
    return readsAnywhere && HandleOf(handle).PRead(buffer, size, offset) == size;
}

// A request for several ranges answers for all or none; those that it did not fill are read singly.
void VsiSource::DoReadMany(std::span<Range> ranges) {
    const std::lock_guard lock(mutex);
    std::vector<void*> buffers;
    std::vector<vsi_l_offset> offsets;
    std::vector<std::size_t> sizes;
    for (const Range& range : ranges) {
        buffers.push_back(range.buffer);
        offsets.push_back(range.offset);
        sizes.push_back(range.size);
    }
    const bool fits = ranges.size() <= INT_MAX;
    const bool whole = fits && VSIFReadMultiRangeL(static_cast<int>(ranges.size()), buffers.data(),
                                                   offsets.data(), sizes.data(), handle) == 0;
    for (Range& range : ranges)
        range.done =
            whole ? Transfer{range.size} : ReadHere(range.offset, range.buffer, range.size);
}

Transfer VsiSource::DoWriteAt(std::uint64_t offset, const void* buffer, std::size_t size) {
    const std::lock_guard lock(mutex);
    ++changes;
    if (VSIFSeekL(handle, offset, SEEK_SET) != 0) return {0, EIO};
    const std::size_t moved = VSIFWriteL(buffer, 1, size, handle);
    return {moved, moved < size ? EIO : 0};
}

int VsiSource::DoTellSize(std::uint64_t& size) const {
    const std::lock_guard lock(mutex);
    return SizeHere(size);
}

int VsiSource::DoTruncate(std::uint64_t size) {
    const std::lock_guard lock(mutex);
    ++changes;
    return VSIFTruncateL(handle, size) == 0 ? 0 : EIO;
}

int VsiSource::DoSync() {
    const std::lock_guard lock(mutex);
    return VSIFFlushL(handle) == 0 ? 0 : EIO;
}

bool VsiSource::DoIsWritable() const { return writable; }

zelm::files::Identity VsiSource::DoIdentify() const {
    const std::lock_guard lock(mutex);
    std::uint64_t size = 0;
    if (SizeHere(size) != 0) return {};
    return {true, kNoVolume, number, size, changes, changes};
}

int VsiSource::DoRemove() { return VSIUnlink(name.c_str()) == 0 ? 0 : EIO; }

}  // namespace zmcgdal
