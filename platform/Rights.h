// Who may do what with a file: mode, owner, group, access list and extended attributes.
//
// Paths are narrow UTF-8; no link is followed to the file that is changed. Nothing throws, and any
// thread may call. LastErrorText tells why an operation failed.
#ifndef ZMC_PLATFORM_RIGHTS_H
#define ZMC_PLATFORM_RIGHTS_H

#include <string>

namespace platform {

// Takes from all but the owner what they may do with a file.
bool MakePrivate(const std::string& path) noexcept;

// Gives the file `to`, which this process has made, the rights of `from`: its owner and group as
// far as that is allowed, its mode, its access list, and its extended attributes but those by which
// the system vouches for the content. Where the group cannot be given, the other one gets no more
// than everybody has. False if the mode could not be given.
bool CopyRights(const std::string& from, const std::string& to) noexcept;

}  // namespace platform

#endif
