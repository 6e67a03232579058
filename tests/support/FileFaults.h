// File operations that fail on purpose.
//
// A test program that links zmc_file_faults has the system's file functions (open, read, write,
// truncate, allocate, sync, close, rename, remove and their kin) replaced, in the program and in
// every library that it loads, by ones that count the calls on files below a folder and make the
// n-th of them fail. A program that does not link it can be started with the library preloaded and
// its order in the environment. The libraries themselves hold no trace of this, so a release build
// pays nothing for it.
//
// Counting is per process, over all threads: the calls of a builder's threads count as they come.
#ifndef ZMC_TESTS_SUPPORT_FILEFAULTS_H
#define ZMC_TESTS_SUPPORT_FILEFAULTS_H

#include <cstddef>
#include <string>
#include <vector>

namespace zmctest {

// Kinds of calls, to be put together by |.
enum FileCall : unsigned {
    kOpenCall = 1,    // open and what makes a descriptor or a stream
    kReadCall = 2,    // read, pread
    kWriteCall = 4,   // write, pwrite, writev
    kResizeCall = 8,  // truncate, allocate
    kSyncCall = 16,   // fsync, fdatasync
    kCloseCall = 32,  // close, fclose
    kRenameCall = 64,
    kRemoveCall = 128,
    kStatusCall = 256,  // fstat
    kAnyCall = 511,
    kLockCall = 512,  // flock: where there are no locks no disk has failed
    kChangingCall = kWriteCall | kResizeCall | kRenameCall | kRemoveCall,
};

enum class FileFaultAction {
    Error,        // the call does nothing and fails with `error`; a close closes first
    Short,        // a transfer moves half of what was asked for, at least a byte; others succeed
    Nothing,      // a transfer moves nothing and tells so; others succeed
    Kill,         // the process ends before the call
    KillPartway,  // the process ends after half of the transfer; before calls that move nothing
};

struct FileFault {
    std::string folder;         // absolute; calls on it and on what lies below count
    unsigned calls = kAnyCall;  // which of them
    std::size_t n = 0;          // from 1; 0 lets none fail and only counts
    bool fromThenOn = false;    // the n-th and all that follow
    FileFaultAction action = FileFaultAction::Error;
    int error = 0;
};

// One at a time in a process.
class FileFaults {
public:
    explicit FileFaults(const FileFault& fault);
    ~FileFaults();
    FileFaults(const FileFaults&) = delete;
    FileFaults& operator=(const FileFaults&) = delete;

    // Lets all further calls be; the counts stand.
    void Disarm();
    // Calls that counted since construction, failed ones included.
    std::size_t Count() const;
    // How many of them failed.
    std::size_t Failed() const;
    // The kinds of those that failed.
    unsigned FailedKinds() const;

    // What a child process needs in its environment to meet the fault: "NAME=value" each. With
    // `countFile` it leaves the count of its calls there when it ends in good order.
    static std::vector<std::string> ForChild(const FileFault& fault,
                                             const std::string& countFile = {});
};

}  // namespace zmctest

#endif
