// ServedFile: one open file in one state, and the ETag of that state.
//
// It stays the file that was opened, whatever becomes of its name. As a byte source it is read by
// the host's rasters and the driver; as a descriptor it is handed out without being read.
#ifndef ZMC_SERVE_SERVEDFILE_H
#define ZMC_SERVE_SERVEDFILE_H

#include <cstdint>
#include <memory>
#include <string>

#include "files/ByteSource.h"
#include "platform/File.h"

namespace zmcserve {

class ServedFile;
using ServedFilePtr = std::shared_ptr<const ServedFile>;

class ServedFile {
public:
    // Takes an open file; `name` is for messages. Throws Refusal (500) if nothing can be told of
    // it.
    ServedFile(std::unique_ptr<platform::File> opened, std::string name);
    ServedFile(const ServedFile&) = delete;
    ServedFile& operator=(const ServedFile&) = delete;

    const std::string& Name() const { return name; }
    const platform::FileIdentity& Identity() const { return identity; }
    std::uint64_t Size() const { return identity.size; }
    // Seconds since 1970.
    std::int64_t Modified() const { return identity.modified / 1'000'000'000; }
    // What tells this state of this file from every other, of letters and digits.
    const std::string& Version() const { return version; }
    // Whether two states with this version can differ: it was written within the tick of the file
    // system's clock in which it was opened. Then answers have no ETag and are kept by nobody.
    bool IsSettled() const { return settled; }
    // A strong entity tag, quotes included; `variant` tells forms of one resource apart. Empty
    // while the file is not settled.
    std::string ETag(std::string_view variant = {}) const;
    // Throws Refusal (503) if the file was written to since it was opened, so that what was read of
    // it may be of two states.
    void CheckUnchanged() const;

    // For readers; lives as long as anybody holds it.
    std::shared_ptr<zelm::files::ByteSource> Source() const { return source; }
    // A descriptor of the caller's own; -1 if there is none to be had.
    int Duplicate() const { return file->Duplicate(); }
    // Bytes that were read: fewer than asked for where the file ends or fails.
    std::size_t ReadAt(std::uint64_t offset, void* buffer, std::size_t size) const;

private:
    std::shared_ptr<platform::File> file;
    std::string name;
    platform::FileIdentity identity;
    std::string version;
    bool settled = false;
    std::shared_ptr<zelm::files::ByteSource> source;
};

}  // namespace zmcserve

#endif
