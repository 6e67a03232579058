// MetadataParseLog: the process-wide diagnostic log of the code that builds metadata trees.
//
// Three environment variables switch it on, and all three must be set: "metadata_parse_log_dir"
// (made if only its last component is missing), "metadata_parse_log_level" (0 is off) and
// "metadata_parse_log_console" (not 0: to std::wcout as well). Numbers are decimal, 0x hexadecimal
// or 0 octal. They are read once, when the first Metadata of the process creates the log. The file
// "metadata_parse_log.log" in that directory begins afresh with each process.
//
// Shared between modules through gpMetadataParseLogInstance and never destroyed. Nothing here
// throws, and no failure shows to the caller: it leaves the log off. Any thread may call; the text
// of one call stays whole.
#ifndef ZMC_METADATA_METADATAPARSELOG_H
#define ZMC_METADATA_METADATAPARSELOG_H

#include <cstdarg>
#include <cstdint>
#include <fstream>
#include <string>

#include "metadata/MetadataUtils.h"
#include "platform/Mutex.h"

class MetadataParseLog : public MetadataUtils {
public:
    std::wstring logDirectory;  // bytes of the variable, widened one by one with their sign
    std::wstring logPath;       // directory, "/" and the file name
    std::wofstream stream ZMC_GUARDED_BY(writing);  // not open while the log is off
    std::uint32_t level = 0;                        // highest level that is written; 0 is off
    std::uint32_t toConsole = 0;                    // not 0: each message also goes to std::wcout

    MetadataParseLog() = default;
    MetadataParseLog(const MetadataParseLog&) = delete;
    MetadataParseLog& operator=(const MetadataParseLog&) = delete;
    virtual ~MetadataParseLog();

    // The log, created and set up by the first call; null if memory ran out.
    static MetadataParseLog* GetInstance();

    // Writes a wide printf text, in which "%s" takes a wide text, if `messageLevel` is not above
    // the level of the log. Nothing is added to it, neither time nor newline, and what does not
    // fit into 4095 characters is cut off. The file is UTF-8 where the system can do that; what a
    // stream cannot encode becomes '?'. Each message is flushed.
    static void Log(std::uint32_t messageLevel, const wchar_t* format, ...);

private:
    void SetUp();
    void ReadSettings();
    bool Open();
    void WriteHeader();
    // Apart from Log, whose frame stays small where nothing is logged.
    [[gnu::noinline]] void Format(const wchar_t* format, std::va_list arguments);
    void Write(wchar_t* text);

    // Keeps the texts of two threads apart, on the console too. The paths are the creator's alone.
    platform::Mutex writing;
};

#endif
