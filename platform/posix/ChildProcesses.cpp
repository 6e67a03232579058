#include "platform/ChildProcesses.h"

#include <fcntl.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "platform/posix/Descriptor.h"
#include "platform/posix/Uninterrupted.h"

namespace platform {
namespace {

void Close(int& descriptor) {
    if (descriptor >= 0) ::close(descriptor);
    descriptor = -1;
}

bool MakePipe(int (&ends)[2]) {
    if (::pipe2(ends, O_CLOEXEC) != 0) return false;
    for (int& end : ends) end = AwayFromStreams(end);
    return ends[0] >= 0 && ends[1] >= 0;
}

void Unblock(int descriptor) {
    ::fcntl(descriptor, F_SETFL, ::fcntl(descriptor, F_GETFL) | O_NONBLOCK);
}

// All that is there; the descriptor does not wait.
void ReadAll(int descriptor, std::string& text) {
    char buffer[4096];
    for (;;) {
        const ssize_t got = ::read(descriptor, buffer, sizeof buffer);
        if (got < 0 && errno == EINTR) continue;
        if (got <= 0) return;
        text.append(buffer, static_cast<std::size_t>(got));
    }
}

// What a child has of this process: the three pipes, and no signal that is ignored or held back.
class Surroundings {
public:
    Surroundings(int input, int output, int errors) {
        ::posix_spawn_file_actions_init(&actions);
        ::posix_spawn_file_actions_adddup2(&actions, input, STDIN_FILENO);
        ::posix_spawn_file_actions_adddup2(&actions, output, STDOUT_FILENO);
        ::posix_spawn_file_actions_adddup2(&actions, errors, STDERR_FILENO);
    }
    ~Surroundings() { ::posix_spawn_file_actions_destroy(&actions); }
    Surroundings(const Surroundings&) = delete;
    Surroundings& operator=(const Surroundings&) = delete;

    posix_spawn_file_actions_t actions{};
};

}  // namespace

ChildProcesses::~ChildProcesses() {
    EndAll();
    for (int* const ends : {queue, output, errors}) {
        Close(ends[0]);
        Close(ends[1]);
    }
}

// The reading end of the queue is kept, so that writing to it never meets nobody.
bool ChildProcesses::MakePipes() {
    if (!MakePipe(queue) || !MakePipe(output) || !MakePipe(errors)) return false;
    Unblock(queue[1]);
    Unblock(output[0]);
    Unblock(errors[0]);
    return true;
}

bool ChildProcesses::Start(const std::string& program, const std::vector<std::string>& arguments,
                           std::size_t count) {
    if (!MakePipes()) return false;
    // The system's words are not constant, and it changes none.
    std::string name = program;
    std::vector<std::string> words = arguments;
    std::vector<char*> list = {name.data()};
    for (std::string& word : words) list.push_back(word.data());
    list.push_back(nullptr);
    const Surroundings around(queue[0], output[1], errors[1]);
    processes.reserve(count);
    for (std::size_t i = 0; i < count; ++i) {
        pid_t child = 0;
        const int error = ::posix_spawn(&child, program.c_str(), &around.actions, nullptr,
                                        list.data(), ::environ);
        if (error == 0) processes.push_back(child);
        errno = error;
    }
    // With the last process goes the last writer, which ends a wait.
    const int kept = errno;
    Close(output[1]);
    Close(errors[1]);
    errno = kept;
    return !processes.empty();
}

bool ChildProcesses::Feed(std::string_view piece) {
    const auto write = [&] {
        return static_cast<int>(::write(queue[1], piece.data(), piece.size()));
    };
    return Uninterrupted(write) == static_cast<int>(piece.size());
}

void ChildProcesses::EndQueue() { Close(queue[1]); }

ChildProcesses::News ChildProcesses::Wait(int milliseconds) {
    News news;
    pollfd watched[] = {{output[0], POLLIN, 0}, {errors[0], POLLIN, 0}};
    // An interruption is news.
    ::poll(watched, std::size(watched), milliseconds);
    Collect(news.ended);
    ReadAll(output[0], news.output);
    ReadAll(errors[0], news.errors);
    return news;
}

void ChildProcesses::Collect(std::vector<End>& ended) {
    for (std::int64_t& process : processes) {
        int state = 0;
        const auto wait = [&] { return ::waitpid(static_cast<pid_t>(process), &state, WNOHANG); };
        if (Uninterrupted(wait) == 0) continue;
        process = 0;
        ended.push_back(WIFSIGNALED(state) ? End{0, WTERMSIG(state)} : End{WEXITSTATUS(state), 0});
    }
    std::erase(processes, 0);
}

void ChildProcesses::EndAll() noexcept {
    constexpr int kTenths = 50;
    EndQueue();
    for (const std::int64_t process : processes) ::kill(static_cast<pid_t>(process), SIGTERM);
    for (int i = 0; i < 2 * kTenths && !processes.empty(); ++i) {
        if (i == kTenths)
            for (const std::int64_t process : processes)
                ::kill(static_cast<pid_t>(process), SIGKILL);
        for (std::int64_t& process : processes)
            if (::waitpid(static_cast<pid_t>(process), nullptr, WNOHANG) != 0) process = 0;
        std::erase(processes, 0);
        if (!processes.empty()) ::poll(nullptr, 0, 100);
    }
}

}  // namespace platform
