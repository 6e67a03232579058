// What a process does to the files of a folder, written down in its order, so that it can be played
// back to a disk that loses power (DiskModel.h).
//
// A program that links zmc_file_faults has the system's file functions replaced (FileFaults.h).
// While a DiskRecording lives, each of them that may have changed something is followed by a look
// at the folder, and what differs from the look before is a step: bytes of a file, its size, the
// names of the folder. So are the calls that wait for the disk. A program that does not link it can
// be started with the library preloaded.
//
// Files stand in the folder itself, not in folders below it. The process is told of another run of
// the operating system than the present one (platform::SystemRun): who looks at what it has left
// comes after the power has failed.
#ifndef ZMC_TESTS_SUPPORT_DISKRECORDER_H
#define ZMC_TESTS_SUPPORT_DISKRECORDER_H

#include <cstdint>
#include <map>
#include <string>
#include <vector>

namespace zmctest {

struct DiskStep {
    enum class Kind : char {
        Bytes = 'B',        // `bytes` at `offset` of `file`, within its size
        Size = 'S',         // `file` has `offset` bytes; new ones are 0
        Names = 'N',        // the folder has these `names` and no other
        FlushFile = 'F',    // all that `file` has is on the disk
        FlushFolder = 'D',  // the names are
    };
    Kind kind = Kind::Bytes;
    std::uint64_t file = 0;  // its number in the file system
    std::uint64_t offset = 0;
    std::string bytes;
    std::map<std::string, std::uint64_t> names;

    bool IsFlush() const { return kind == Kind::FlushFile || kind == Kind::FlushFolder; }
};

// One at a time in a process. The first steps are what the folder has at the beginning, flushed.
class DiskRecording {
public:
    // `log` is a file elsewhere.
    DiskRecording(const std::string& folder, const std::string& log);
    ~DiskRecording();
    DiskRecording(const DiskRecording&) = delete;
    DiskRecording& operator=(const DiskRecording&) = delete;

    // What a child process needs in its environment to be recorded: "NAME=value" each.
    static std::vector<std::string> ForChild(const std::string& folder, const std::string& log);
    // The steps in such a file. Throws std::runtime_error if they do not end well.
    static std::vector<DiskStep> Read(const std::string& log);
};

// For the replaced functions, behind a call that succeeded; they keep errno.
namespace recorder {
void Changed() noexcept;
void Flushed(int descriptor) noexcept;
// The file that is opened in place of that one.
const char* Opened(const char* path) noexcept;
}  // namespace recorder

}  // namespace zmctest

#endif
