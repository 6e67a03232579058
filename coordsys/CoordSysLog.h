// CoordSysLog: the diagnostic log of the coordinate system subsystem.
//
// A control file "pelog.txt" in the engine's data directory says what is logged and where; a log
// that finds none writes one with notes for its users and stays off. Messages go to the debugger's
// output and to two files in the folder "logs", which alternate as each fills: together they hold
// the most recent lines. The settings are read once.
//
// One per process, shared through gpCoordSysLogInstance, created by CoordSysFactory. Nothing here
// throws, and no failure shows to a caller: it ends the logging to files. Any thread may log; the
// lines of two threads stay whole.
#ifndef ZMC_COORDSYS_COORDSYSLOG_H
#define ZMC_COORDSYS_COORDSYSLOG_H

#include <cstdarg>
#include <cstdint>
#include <cstdio>

#include "core/String.h"
#include "platform/Mutex.h"

namespace zelm {

class CoordSysLog {
public:
    // Level 14 of the control file: errors, and all messages of the factory.
    static constexpr std::uint32_t kErrorLevel = 8192;
    // At start a file of this size is full; while writing only one above it is.
    static constexpr std::int32_t kFullSize = 500000;

    String peDirectory;  // where everything below lies
    String logPath1;     // full paths of the two log files
    String logPath2;     //
    // The log file now open; null: nothing goes to files.
    std::FILE* stream ZMC_GUARDED_BY(writing) = nullptr;
    std::int32_t currentFile ZMC_GUARDED_BY(writing) = 0;  // 1 or 2: which path is open
    // Lines written so far in this process.
    std::uint32_t sequence ZMC_GUARDED_BY(writing) = 0;
    std::uint32_t levelMask = 0;  // the levels that are on
    std::int32_t toDebugger = 0;  // 1: messages go to the debugger's output
    std::int32_t toFile = 0;      // 1: messages go to the files

    CoordSysLog() = default;
    CoordSysLog(const CoordSysLog&) = delete;
    CoordSysLog& operator=(const CoordSysLog&) = delete;
    virtual ~CoordSysLog();  // closes the file

    // Makes the log of the process and returns it; null, and no log, if the directory does not
    // exist or memory ran out. The directory's name must be one that the locale's charset can hold.
    static CoordSysLog* CreateInstance(const String& peDirectory);

    // Logs a wide printf text, in which "%s" takes a text of 16-bit units, if one of the bits of
    // `level` is on. What does not fit into 4095 units is cut off. Without a log it does nothing.
    static void LogMessage(std::uint32_t level, const WideChar* format, ...);

private:
    bool Start();
    void Init() ZMC_REQUIRES(writing);
    void ReadControlFile();
    bool FindControlLine(char (&line)[1024]) const;
    void ApplyControlLine(const char* line);
    void OpenFirstWithRoom() ZMC_REQUIRES(writing);
    bool OpenToContinue(std::int32_t file, bool& full) ZMC_REQUIRES(writing);
    bool MakeLogDirectory() const;
    String PathOf(const char* name) const;
    void CloseStream() ZMC_REQUIRES(writing);
    // Apart from LogMessage, whose frame stays small where nothing is logged.
    [[gnu::noinline]] void Format(const WideChar* format, std::va_list arguments);
    void Write(const WideChar* message);
    void WriteLine(const WideChar* message) ZMC_REQUIRES(writing);
    void RotateIfFull() ZMC_REQUIRES(writing);

    // What else the log knows is settled before others see it, and only read from then on.
    platform::Mutex writing;
};

}  // namespace zelm

#endif
