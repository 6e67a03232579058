// Files and folders below a folder, by names that come from strangers.
//
// A relative name is a path of plain parts: nothing in it is empty, "." or "..", and callers see to
// that. With Links::Within symbolic links are followed as long as they stay below the folder;
// one that is absolute, or that leads out, is refused with ELOOP or EXDEV, whatever happens to the
// folder meanwhile. (Systems without such a service refuse all links below the folder.) The folder
// itself is looked up at each call, through links.
//
// Names are bytes as the system takes them. Operations set `error`, unless it is null, to 0 or the
// system's number of the failure. What answers with a list may throw std::bad_alloc.
#ifndef ZMC_PLATFORM_BENEATH_H
#define ZMC_PLATFORM_BENEATH_H

#include <cstddef>
#include <memory>
#include <string>
#include <vector>

#include "platform/File.h"

namespace platform {

enum class Links { Within, Followed };

// Opens a regular file for reading; null if that cannot be done.
std::unique_ptr<File> OpenBeneath(const std::string& folder, const std::string& name, Links links,
                                  int* error = nullptr);

// What the name leads to now, of any kind; false, with `identity` as it was, if to nothing.
bool TellIdentityBeneath(const std::string& folder, const std::string& name, Links links,
                         FileIdentity& identity, int* error = nullptr);

struct FolderEntry {
    std::string name;
    bool isFolder = false;
    bool isRegular = false;  // both of what a link leads to
};

// Entries of a folder below, or of the folder itself for an empty name, "." and ".." not among
// them, in no order; `most` of them at most, and `complete` is false where there were more. Those
// that cannot be looked at are left out.
std::vector<FolderEntry> ListBeneath(const std::string& folder, const std::string& name,
                                     Links links, std::size_t most, bool& complete,
                                     int* error = nullptr);

// Whether an error number says that a link was not followed.
bool IsRefusedLink(int error);
// Whether it says that there is nothing of that name, or that nothing can have it.
bool IsNothingThere(int error);

}  // namespace platform

#endif
