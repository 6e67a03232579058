// ChildProcesses: copies of a program that work for this one, side by side, fed by one queue.
//
// Standard input of all of them is one pipe, into which Feed puts pieces of one length; who reads
// pieces of that length gets whole ones, each piece one of the processes. Their standard output is
// another pipe and their errors a third, where what each wrote at once stays together. A process
// that is ended takes the piece that it was at with it; the others go on. When this process ends,
// in whatever way, the queue does, and so do they, after what they are at. Used by one thread.
// Nothing throws but std::bad_alloc.
#ifndef ZMC_PLATFORM_CHILDPROCESSES_H
#define ZMC_PLATFORM_CHILDPROCESSES_H

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace platform {

class ChildProcesses {
public:
    struct End {
        int status = 0;  // what it answered, if it ended by itself
        int signal = 0;  // what ended it, else 0
    };
    // What there is since the last question.
    struct News {
        std::string output;
        std::string errors;
        std::vector<End> ended;
    };

    ChildProcesses() = default;
    // Ends those that run.
    ~ChildProcesses();
    ChildProcesses(const ChildProcesses&) = delete;
    ChildProcesses& operator=(const ChildProcesses&) = delete;

    // Makes the pipes and starts processes, with the environment of this one. False, with
    // LastErrorText (FileSystem.h), if not even one could be started.
    bool Start(const std::string& program, const std::vector<std::string>& arguments,
               std::size_t count);
    std::size_t Running() const { return processes.size(); }

    // Adds a piece of some ten bytes to the queue. False, and nothing is added, while it is full.
    bool Feed(std::string_view piece);
    // Nothing more comes.
    void EndQueue();

    // Waits until there is news, or no longer than that.
    News Wait(int milliseconds);
    // Asks all to end, waits, and insists after some seconds.
    void EndAll() noexcept;

private:
    bool MakePipes();
    void Collect(std::vector<End>& ended);

    std::vector<std::int64_t> processes;
    int queue[2] = {-1, -1};  // read, write
    int output[2] = {-1, -1};
    int errors[2] = {-1, -1};
};

}  // namespace platform

#endif
