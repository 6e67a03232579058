// What the file system offers beyond the transfers of platform/File.h: names, folders, replacing a
// file in one step, space, and whose a file is.
//
// Paths are narrow UTF-8. An operation that fails says so by its result, and LastErrorText gives
// the system's reason to the thread that called it, until its next call. Operations do not throw.
// What answers with a text or a list throws std::bad_alloc where there is no memory for it, and
// nothing else: a path that came back empty instead, or cut, would be that of another file.
#ifndef ZMC_PLATFORM_FILESYSTEM_H
#define ZMC_PLATFORM_FILESYSTEM_H

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace platform {

struct FileStatus {
    bool exists = false;
    bool isFolder = false;
    bool isRegular = false;
    // This process may not write it, or nobody may: the second counts for the superuser too.
    bool readOnly = false;
    std::uint64_t size = 0;  // bytes, of a regular file
    // What tells the file from all others of its file system while it exists, whatever its name.
    std::uint64_t number = 0;
    std::uint64_t owner = 0;  // the number of the user to whom it belongs; 0 is the superuser

    // A pipe, a device or the like: to open it may wait for somebody, or do anything.
    bool IsSpecial() const { return exists && !isRegular && !isFolder; }
};

std::string LastErrorText();
// The text of an error number of the system, as operations on open files tell it.
std::string ErrorText(int error);

FileStatus StatusOf(const std::string& path) noexcept;

// Whether what one file says of another counts. Anyone who may write a folder can put a note beside
// somebody's file: it counts if it belongs to the owner of the file, to the superuser or to the
// user of this process.
bool MaySpeakFor(const FileStatus& note, const FileStatus& file) noexcept;

// The folder of a path ("." for a bare name), its last part, and the two put together.
std::string FolderOf(const std::string& path);
std::string NameOf(const std::string& path);
std::string JoinPath(const std::string& folder, const std::string& name);

// The file that a path leads to through links; it need not exist itself. The path as it is where
// nothing can be told.
std::string ResolveLinks(const std::string& path);

// Names of the entries of a folder, in no order; none if it cannot be read.
std::vector<std::string> ListFolder(const std::string& folder);

// Makes an empty file; fails if anything of that name exists.
bool CreateNewFile(const std::string& path) noexcept;
// Gives a file another name, replacing what bears it, in one step that others see whole.
bool RenameFile(const std::string& from, const std::string& to) noexcept;
// The same, and fails if anything bears that name.
bool RenameToNewName(const std::string& from, const std::string& to) noexcept;
// Gives a file one more name; fails if anything bears it, or the file system has no such thing.
bool LinkFile(const std::string& file, const std::string& name) noexcept;
bool RemoveEntry(const std::string& path) noexcept;
// Removes a folder that has no entries.
bool RemoveFolder(const std::string& path) noexcept;

// Waits until a file's bytes, or a folder's names, have reached the disk.
bool SyncFile(const std::string& path) noexcept;
bool SyncFolder(const std::string& folder) noexcept;
// Sets the system on to writing a file's bytes to the disk and does not wait for it, so that
// SyncFile has less to wait for. Nothing is told, and systems without the service do nothing.
void BeginSync(const std::string& path) noexcept;

// Bytes that this process can still write in a folder.
std::optional<std::uint64_t> FreeSpace(const std::string& folder) noexcept;
// Gives the disk back what a range of a file takes there, which then reads as zeros; where the file
// system does not do that, it stays.
void DropRange(const std::string& path, std::uint64_t offset, std::uint64_t size) noexcept;
// Takes `size` bytes of the disk for a file without changing its size. False only if the space is
// not there: file systems without the service give true.
bool ReserveSpace(const std::string& path, std::uint64_t size) noexcept;
// Gives back what was reserved and not used.
bool ReleaseReserve(const std::string& path) noexcept;

// What tells this run of the operating system from those before and after: as long as it is the
// same, the power did not fail, and files have all that was written to them. Empty if not known.
std::string SystemRun();

std::uint64_t CurrentProcess() noexcept;
// A number that another call, in this process or another, does not give.
std::uint64_t RandomNumber() noexcept;

}  // namespace platform

#endif
