// LentFile: an open source in the module's hands, with a memory of what went wrong there.
//
// The module opens files by name and answers true whatever the disk did. So a raster opens its file
// once, lends it to the module under a name that nobody can guess, and asks here what the source
// told of each operation. What the module opens, a second time as well, is this source: the file
// that was opened, whatever has become of its name.
//
// One thread at a time.
#ifndef ZMC_HOST_RASTER_LENTFILE_H
#define ZMC_HOST_RASTER_LENTFILE_H

#include <cstdint>
#include <memory>
#include <string>

#include "files/FileSource.h"
#include "files/Lending.h"
#include "files/RecordingSource.h"
#include "host/file/PyramidHeader.h"

namespace zmchost {

// Opens a plain file: for update where that is wanted and can be done, unless the file is
// read-only, else for reading. A name that looks lent is the name of a file here. Throws Error.
std::shared_ptr<zelm::files::FileSource> OpenPlainFile(const std::string& file, bool forUpdate);

class LentFile {
public:
    // Opens a file that is to be laid out anew, as it is. One that is missing is made, and goes
    // again unless it is accepted. Throws Error.
    static std::shared_ptr<LentFile> Create(const std::string& file);
    // Lends a source of the caller's; `name` is for messages. Throws Error.
    LentFile(std::shared_ptr<zelm::files::ByteSource> source, std::string name);
    ~LentFile();
    LentFile(const LentFile&) = delete;
    LentFile& operator=(const LentFile&) = delete;

    // What the module opens.
    std::string Name() const { return lent.Utf8(); }
    bool IsWritable() const { return recording->IsWritable(); }
    // Bytes; 0 if that cannot be told, which TakeFailure then tells.
    std::uint64_t Size() const;

    PyramidHeader ReadHeader() const { return PyramidHeader::Read(*recording, file); }
    // For reading it without the module; what fails there is told by TakeFailure as well.
    zelm::files::ByteSource& Source() const { return *recording; }
    // What was lent, for whoever lends it once more; what fails through that is not told here.
    const std::shared_ptr<zelm::files::ByteSource>& Lent() const { return recording->Source(); }
    // The name in the file system; empty for a source of another kind.
    std::string PlainName() const;

    // What went wrong since the last question, in words; empty if nothing did. To meet the end of a
    // file is no failure, but where the file goes on behind it, or was cut.
    std::string TakeFailure() const;

    // Takes the source as it is now for what it should be, after opening it.
    void Accept();
    // The same after an operation that changed it, whether it succeeded or failed partway, unless
    // the source is shorter than `least` bytes, which the operation cannot have made it. Failures
    // of asking are not told.
    void AcceptOwnChange(std::uint64_t least);
    std::uint64_t AcceptedSize() const { return acceptedSize; }
    const zelm::files::Identity& Accepted() const { return accepted; }
    // What others have done to it since, in words: that it was cut, replaced, removed or written
    // to. Empty if nothing is to be seen.
    std::string Change() const;
    // The part of it that concerns the bytes: that it was cut or written to.
    std::string ContentChange() const;
    // Whether its name leads to another file now, or to none, in words; empty if it does not.
    std::string LossOfName() const;

private:
    bool WasCutTo(std::uint64_t size) const;

    std::shared_ptr<zelm::files::FileSource> plain;  // null for a source of another kind
    std::shared_ptr<zelm::files::RecordingSource> recording;
    zelm::files::LentName lent;
    std::string file;
    std::uint64_t acceptedSize = 0;
    zelm::files::Identity accepted;
    bool goesAgain = false;
};

}  // namespace zmchost

#endif
