#include "tests/support/DiskRecorder.h"

#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <mutex>
#include <stdexcept>

namespace zmctest {
namespace {

constexpr const char* kRunOfSystem = "/proc/sys/kernel/random/boot_id";
constexpr const char* kRecordingName = "ZMC_DISK_RECORDING";

// Calls of the recorder's own are none of the process.
thread_local bool ownCall = false;

class OwnCalls {
public:
    OwnCalls() : kept(errno) { ownCall = true; }
    ~OwnCalls() {
        ownCall = false;
        errno = kept;
    }
    OwnCalls(const OwnCalls&) = delete;
    OwnCalls& operator=(const OwnCalls&) = delete;

private:
    int kept;
};

std::string Content(const std::string& path) {
    std::string bytes;
    const int file = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    struct stat status {};
    if (file >= 0 && fstat(file, &status) == 0) {
        bytes.resize(static_cast<std::size_t>(status.st_size));
        const ssize_t got = pread(file, bytes.data(), bytes.size(), 0);
        bytes.resize(got > 0 ? static_cast<std::size_t>(got) : 0);
    }
    if (file >= 0) close(file);
    return bytes;
}

class Recorder {
public:
    Recorder(std::string watched, const std::string& logName)
        : folder(std::move(watched)), run(logName + ".run"), log(std::fopen(logName.c_str(), "w")) {
        const OwnCalls own;
        if (!log) std::abort();
        struct stat status {};
        stat(folder.c_str(), &status);
        folderNumber = status.st_ino;
        if (std::FILE* const file = std::fopen(run.c_str(), "w")) {
            std::fprintf(file, "before the power failed, %ld\n", static_cast<long>(getpid()));
            std::fclose(file);
        }
        Look();
        for (const auto& [number, bytes] : files) Put(DiskStep::Kind::FlushFile, number);
        Put(DiskStep::Kind::FlushFolder, 0);
        std::fflush(log);
    }
    // Its log ends with a line that tells so.
    ~Recorder() {
        const OwnCalls own;
        std::fputs("E\n", log);
        std::fclose(log);
    }
    Recorder(const Recorder&) = delete;
    Recorder& operator=(const Recorder&) = delete;

    void Changed() {
        const OwnCalls own;
        const std::lock_guard<std::mutex> lock(mutex);
        Look();
        std::fflush(log);
    }

    void Flushed(int descriptor) {
        const OwnCalls own;
        const std::lock_guard<std::mutex> lock(mutex);
        struct stat status {};
        if (fstat(descriptor, &status) != 0) return;
        Look();
        if (S_ISDIR(status.st_mode) && status.st_ino == folderNumber)
            Put(DiskStep::Kind::FlushFolder, 0);
        else if (files.count(status.st_ino) != 0)
            Put(DiskStep::Kind::FlushFile, status.st_ino);
        std::fflush(log);
    }

    const char* Run() const { return run.c_str(); }

private:
    using Names = std::map<std::string, std::uint64_t>;

    void Put(DiskStep::Kind kind, std::uint64_t file, std::uint64_t offset = 0,
             std::size_t size = 0) {
        std::fprintf(log, "%c %llu %llu %zu\n", static_cast<char>(kind),
                     static_cast<unsigned long long>(file), static_cast<unsigned long long>(offset),
                     size);
    }

    void Look() {
        const Names found = List();
        std::map<std::uint64_t, std::string> now;
        for (const auto& [name, number] : found) {
            if (now.count(number) != 0) continue;
            std::string bytes = Content(folder + '/' + name);
            Compare(number, files[number], bytes);
            now[number] = std::move(bytes);
        }
        files = std::move(now);
        if (looked && found == names) return;
        looked = true;
        names = found;
        Put(DiskStep::Kind::Names, 0, 0, names.size());
        for (const auto& [name, number] : names)
            std::fprintf(log, "%llu %s\n", static_cast<unsigned long long>(number), name.c_str());
    }

    Names List() const {
        Names found;
        DIR* const stream = opendir(folder.c_str());
        if (!stream) return found;
        while (const dirent* entry = readdir(stream)) {
            struct stat status {};
            const std::string path = folder + '/' + entry->d_name;
            if (lstat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode))
                found[entry->d_name] = status.st_ino;
        }
        closedir(stream);
        return found;
    }

    // One range, from the first byte that differs to the last one.
    void Compare(std::uint64_t number, const std::string& before, const std::string& after) {
        if (before.size() != after.size()) Put(DiskStep::Kind::Size, number, after.size());
        std::string old = before;
        old.resize(after.size(), '\0');
        const auto first = std::mismatch(after.begin(), after.end(), old.begin()).first;
        if (first == after.end()) return;
        const auto last = std::mismatch(after.rbegin(), after.rend(), old.rbegin()).first;
        const auto from = static_cast<std::size_t>(first - after.begin());
        const auto to = static_cast<std::size_t>(last.base() - after.begin());
        Put(DiskStep::Kind::Bytes, number, from, to - from);
        std::fwrite(after.data() + from, 1, to - from, log);
        std::fputc('\n', log);
    }

    const std::string folder, run;
    std::FILE* const log;
    std::uint64_t folderNumber = 0;
    std::mutex mutex;
    bool looked = false;
    Names names;
    std::map<std::uint64_t, std::string> files;
};

std::atomic<Recorder*> current{nullptr};

Recorder* Now() { return ownCall ? nullptr : current.load(); }

void Begin(const std::string& folder, const std::string& log) {
    current = new Recorder(folder, log);
}

// Takes the order of the environment: the folder and, behind a line's end, the log.
[[gnu::constructor]] void TakeRecordingOrder() {
    const char* const order = std::getenv(kRecordingName);
    const char* const end = order ? std::strchr(order, '\n') : nullptr;
    if (end) Begin(std::string(order, end), end + 1);
}

[[gnu::destructor]] void EndRecording() { delete current.exchange(nullptr); }

}  // namespace

DiskRecording::DiskRecording(const std::string& folder, const std::string& log) {
    Begin(folder, log);
}
DiskRecording::~DiskRecording() { EndRecording(); }

std::vector<std::string> DiskRecording::ForChild(const std::string& folder,
                                                 const std::string& log) {
    Dl_info self{};
    dladdr(reinterpret_cast<const void*>(&Begin), &self);
    return {"LD_PRELOAD=" + std::string(self.dli_fname ? self.dli_fname : ""),
            std::string(kRecordingName) + '=' + folder + '\n' + log};
}

std::vector<DiskStep> DiskRecording::Read(const std::string& log) {
    std::ifstream stream(log, std::ios::binary);
    std::vector<DiskStep> steps;
    char kind = 0;
    while (stream >> kind && kind != 'E') {
        DiskStep step;
        step.kind = static_cast<DiskStep::Kind>(kind);
        std::size_t size = 0;
        stream >> step.file >> step.offset >> size;
        stream.get();
        if (step.kind == DiskStep::Kind::Bytes) {
            step.bytes.resize(size);
            stream.read(step.bytes.data(), static_cast<std::streamsize>(size));
        }
        for (std::size_t i = 0; step.kind == DiskStep::Kind::Names && i < size; ++i) {
            std::uint64_t number = 0;
            std::string name;
            stream >> number;
            stream.get();
            std::getline(stream, name);
            step.names[name] = number;
        }
        steps.push_back(std::move(step));
    }
    if (!stream || kind != 'E') throw std::runtime_error("the recording " + log + " is cut off");
    return steps;
}

void recorder::Changed() noexcept {
    if (Recorder* const recorder = Now()) recorder->Changed();
}
void recorder::Flushed(int descriptor) noexcept {
    if (Recorder* const recorder = Now()) recorder->Flushed(descriptor);
}
const char* recorder::Opened(const char* path) noexcept {
    const Recorder* const recorder = Now();
    return recorder && path && std::strcmp(path, kRunOfSystem) == 0 ? recorder->Run() : path;
}

}  // namespace zmctest
