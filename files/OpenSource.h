// Opening whatever a name stands for: the one place where a name becomes a source.
#ifndef ZMC_FILES_OPENSOURCE_H
#define ZMC_FILES_OPENSOURCE_H

#include <memory>

#include "core/String.h"
#include "files/ByteSource.h"
#include "files/FilesApi.h"

namespace zelm::files {

// The source of that name, or null with the reason in `error` (else 0), if that is not null.
//
// A name that LooksLent is looked for among those lent in this process, and nowhere else: ENOENT if
// it is not there, even if there is a file of that name. Every opening gives the one source that
// was lent; Update and Create need one that is writable (EACCES), Create makes it empty, and Read
// takes it as it is. Any other name is that of a plain file, as FileSource::Open takes it.
//
// Nothing throws, and any thread may call.
ZMC_FILES_API std::shared_ptr<ByteSource> OpenSource(const String& name, OpenMode mode,
                                                     int* error = nullptr) noexcept;

// Removes what a name stands for: of a lent name what its source stands for (ByteSource::Remove),
// of any other the file of that name. False, with the reason in `error`, if that failed. The name
// of a lent source stays good.
ZMC_FILES_API bool RemoveSource(const String& name, int* error = nullptr) noexcept;

}  // namespace zelm::files

#endif
