#include "coordsys/CoordSysLog.h"

#include <algorithm>
#include <atomic>
#include <cstdarg>
#include <cstring>
#include <memory>
#include <new>

#include "coordsys/CoordSysLogNotes.h"
#include "coordsys/EnvironmentKeys.h"
#include "platform/DebugOutput.h"
#include "platform/Directory.h"
#include "platform/LocalTime.h"
#include "platform/TextStream.h"
#include "platform/WideFormat.h"
#include "zmcg/zmcg.h"

namespace zelm {
namespace {

constexpr std::size_t kTextCapacity = 4096;
constexpr std::size_t kControlLineLength = 19;

std::atomic_ref<CoordSysLog*> Instance() { return std::atomic_ref(gpCoordSysLogInstance); }

struct StreamCloser {
    // What is written through a holder, the notes, are lost on a full disk without a word.
    void operator()(std::FILE* stream) const { static_cast<void>(std::fclose(stream)); }
};
using StreamHolder = std::unique_ptr<std::FILE, StreamCloser>;

StreamHolder OpenControlFile(const String& path, const char* mode) {
    return StreamHolder(platform::OpenTextStream(path.wide, mode));
}

bool IsComma(std::size_t position) { return position == 4 || position == 9 || position == 14; }

// Four groups of four digits with a single comma between groups. A comma passes for a digit, and
// counts as 0.
bool IsControlLine(const char* line) {
    if (std::strlen(line) < kControlLineLength) return false;
    for (std::size_t i = 0; i < kControlLineLength; ++i) {
        if (IsComma(i) ? line[i] != ',' : !std::strchr("01,", line[i])) return false;
    }
    return true;
}

void WriteNotes(const String& path) {
    if (const StreamHolder file = OpenControlFile(path, "w+"))
        static_cast<void>(
            std::fwrite(kCoordSysLogNotes, 1, sizeof kCoordSysLogNotes - 1, file.get()));
}

// A position counts by its low 32 bits, signed, so a file beyond 2 GiB is not full. Only a file
// that somebody else fills can get there.
bool IsPastLimit(std::uint64_t position) {
    return static_cast<std::int32_t>(static_cast<std::uint32_t>(position)) > CoordSysLog::kFullSize;
}

}  // namespace

CoordSysLog::~CoordSysLog() { CloseStream(); }

// Other threads may log at any time, so they see the log when it is ready and not before.
CoordSysLog* CoordSysLog::CreateInstance(const String& directory) {
    std::unique_ptr<CoordSysLog> fresh;
    try {
        fresh.reset(new (std::nothrow) CoordSysLog);
        if (fresh) fresh->peDirectory = directory;
        if (!fresh || !fresh->Start()) fresh.reset();
    } catch (...) {
        // No directory that can be used, then.
        fresh.reset();
    }
    Instance().store(fresh.get(), std::memory_order_release);
    return fresh.release();
}

bool CoordSysLog::Start() {
    if (peDirectory == EnvironmentKeys::kNotSet) return false;
    if (!platform::PathExists(peDirectory.GetAnsi())) return false;
    const platform::MutexHolder lock(writing);
    Init();
    return true;
}

void CoordSysLog::Init() {
    ReadControlFile();
    if (levelMask == 0 || toFile == 0) return;
    if (!MakeLogDirectory()) {
        toFile = 0;
        return;
    }
    const String directory = PathOf("logs") + platform::kPathSeparator;
    logPath1 = directory + "zmcpe_pe_1.log";
    logPath2 = directory + "zmcpe_pe_2.log";
    OpenFirstWithRoom();
}

// The first file comes before the second, whichever of them was written last.
void CoordSysLog::OpenFirstWithRoom() {
    bool full = false;
    if (!OpenToContinue(1, full)) {
        toFile = 0;
        return;
    }
    if (!full) return;
    // Where this fails, `toFile` stays 1, but without a stream nothing is written.
    if (!OpenToContinue(2, full) || !full) return;
    CloseStream();
    currentFile = 1;
    stream = platform::OpenTextStream(logPath1.wide, "w");
}

// Opens that file to append, and tells whether it is full; false if it did not open. A file that
// opens but cannot be measured ends the logging to files.
bool CoordSysLog::OpenToContinue(std::int32_t file, bool& full) {
    CloseStream();
    full = false;
    currentFile = file;
    stream = platform::OpenTextStream(file == 1 ? logPath1.wide : logPath2.wide, "a+");
    if (!stream) return false;
    std::uint64_t size = 0;
    if (platform::SeekToEnd(stream, size))
        full = size >= std::uint64_t{kFullSize};
    else
        CloseStream();
    return true;
}

bool CoordSysLog::MakeLogDirectory() const {
    const String directory = PathOf("logs");
    return platform::EnsureDirectory(directory.GetAnsi(), directory.GetUtf8());
}

String CoordSysLog::PathOf(const char* name) const {
    return peDirectory + platform::kPathSeparator + name;
}

void CoordSysLog::CloseStream() {
    // Every line was written out by itself.
    if (stream) static_cast<void>(std::fclose(stream));
    stream = nullptr;
}

void CoordSysLog::ReadControlFile() {
    levelMask = 0;
    toDebugger = 0;
    toFile = 0;
    const String path = PathOf("pelog.txt");
    if (!platform::PathExists(path.GetAnsi())) {
        WriteNotes(path);
        return;
    }
    char line[1024];
    if (FindControlLine(line) && IsControlLine(line)) ApplyControlLine(line);
}

// The first line that begins with a digit of the control line; nothing after it counts.
bool CoordSysLog::FindControlLine(char (&line)[1024]) const {
    const StreamHolder file = OpenControlFile(PathOf("pelog.txt"), "r");
    if (!file) return false;
    while (std::fgets(line, sizeof line, file.get()))
        if (line[0] == '0' || line[0] == '1') return true;
    return false;
}

void CoordSysLog::ApplyControlLine(const char* line) {
    std::uint32_t bits = 0;
    for (std::size_t i = 0; i < kControlLineLength; ++i)
        if (!IsComma(i)) bits = bits << 1 | (line[i] == '1' ? 1u : 0u);
    toDebugger = (bits & 0x8000) != 0 ? 1 : 0;
    toFile = (bits & 0x4000) != 0 ? 1 : 0;
    levelMask = toDebugger != 0 || toFile != 0 ? bits & 0x3FFF : 0;
}

// NOLINTNEXTLINE(cert-dcl50-cpp): its callers give printf arguments.
void CoordSysLog::LogMessage(std::uint32_t level, const WideChar* format, ...) {
    CoordSysLog* const log = Instance().load(std::memory_order_acquire);
    if (!log || (log->levelMask & level) == 0) return;
    std::va_list arguments;
    va_start(arguments, format);
    log->Format(format, arguments);
    va_end(arguments);
}

void CoordSysLog::Format(const WideChar* format, std::va_list arguments) {
    WideChar message[kTextCapacity];
    platform::FormatWideV(message, kTextCapacity, format, arguments);
    Write(message);
}

void CoordSysLog::Write(const WideChar* message) {
    try {
        const platform::MutexHolder lock(writing);
        if (toDebugger == 1) {
            platform::WriteDebugOutput(message);
            platform::WriteDebugOutput(u"\n");
        }
        if (toFile == 1 && stream) WriteLine(message);
    } catch (...) {
        // No failure of a log shows to its caller.
    }
}

// A message that fills the buffer pushes the end of its line, the newline included, out of it.
void CoordSysLog::WriteLine(const WideChar* message) {
    char now[platform::kLocalTimeLength + 1];
    platform::LocalTimeText(now);
    WideChar line[kTextCapacity];
    platform::FormatWide(line, kTextCapacity, u"%hs, %5d, %5d, %s \n", now, 0, ++sequence, message);
    const String text(line);
    const char* const utf8 = text.GetUtf8();
    // What is longer than the stream's buffer passes it by, and a flush has nothing to fail on.
    if (utf8 && std::fputs(utf8, stream) < 0)
        CloseStream();
    else
        RotateIfFull();
}

// Moving to the end also writes the line out, so that a crash loses nothing and a full disk shows.
// Without a stream the logging to files is over.
void CoordSysLog::RotateIfFull() {
    std::uint64_t position = 0;
    if (!platform::SeekToEnd(stream, position)) {
        CloseStream();
        return;
    }
    if (!IsPastLimit(position)) return;
    CloseStream();
    currentFile = currentFile == 1 ? 2 : 1;
    stream = platform::OpenTextStream(currentFile == 1 ? logPath1.wide : logPath2.wide, "w");
}

}  // namespace zelm
