// VsiSource: a file of one of GDAL's virtual file systems as a byte source: in memory, inside an
// archive, behind a URL.
//
// A handle of GDAL has a position and serves one thread at a time, so transfers go on one after the
// other, behind a lock, except reads of files that are open for reading in file systems which can
// read at any place (PRead); any thread may call. Several ranges at once are one request where the
// file system has such (VSIFReadMultiRangeL). It stays the file that was opened as far as the file
// system sees to that: those that look a name up at each request have no such thing.
#ifndef ZMC_GDAL_VSISOURCE_H
#define ZMC_GDAL_VSISOURCE_H

#include <cpl_vsi.h>

#include <cstdint>
#include <memory>
#include <mutex>
#include <string>

#include "files/ByteSource.h"

namespace zmcgdal {

// Bytes of a file behind a network that are kept if nobody says otherwise.
inline constexpr std::uint64_t kRemoteBytes = std::uint64_t{64} << 20;

// Whether a name is one of those file systems'.
bool IsVirtualName(const std::string& name);

// What a name of GDAL's user stands for, a plain file included: for update where that is wanted and
// can be done, else for reading. Throws zmchost::Error where it cannot be opened, and for a name
// that looks lent, since none comes from outside. What lies behind a network is a RemoteSource of
// so many bytes, for reading alone, unless its server only gives whole files.
std::shared_ptr<zelm::files::ByteSource> OpenByName(const std::string& name, bool forUpdate,
                                                    std::uint64_t remoteBytes = kRemoteBytes);

class VsiSource final : public zelm::files::ByteSource {
public:
    // Null if GDAL does not open it. Create makes it, or makes it empty.
    static std::shared_ptr<VsiSource> Open(const std::string& name, zelm::files::OpenMode mode);
    ~VsiSource() override;

protected:
    zelm::files::Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override;
    void DoReadMany(std::span<zelm::files::Range> ranges) override;
    zelm::files::Transfer DoWriteAt(std::uint64_t offset, const void* buffer,
                                    std::size_t size) override;
    int DoTellSize(std::uint64_t& size) const override;
    int DoTruncate(std::uint64_t size) override;
    int DoSync() override;
    bool DoIsWritable() const override;
    // Numbers of this process: the thing is this object, in the state that its size and its own
    // writes tell.
    zelm::files::Identity DoIdentify() const override;
    int DoRemove() override;

private:
    VsiSource(std::string fileName, VSILFILE* opened, bool isWritable);
    // Without the lock. False where it is to be read with it.
    bool ReadPast(std::uint64_t offset, void* buffer, std::size_t size) const;
    // With the lock held.
    zelm::files::Transfer ReadHere(std::uint64_t offset, void* buffer, std::size_t size) const;
    int SizeHere(std::uint64_t& size) const;

    const std::string name;
    const bool writable;
    const bool readsAnywhere;
    const std::uint64_t number;
    VSILFILE* const handle;
    mutable std::mutex mutex;  // guards what follows, and the position of the handle
    std::int64_t changes = 0;
};

}  // namespace zmcgdal

#endif
