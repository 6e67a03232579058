// A process that builds metadata and reports on the parse log: its settings are read once, so each
// set of them needs a process.
//
//   parse_log_probe build N          builds N Metadata
//   parse_log_probe log LEVEL TEXT   logs a text
//   parse_log_probe odd              a text that a charset may not hold, then a plain one
//   parse_log_probe long N           a text of N characters, then a plain one
//   parse_log_probe threads N        two threads with N texts each
//   parse_log_probe race             four threads that build the first Metadata
// What the log looks like afterwards goes to the standard error stream.
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

#include "metadata/Metadata.h"
#include "metadata/MetadataParseLog.h"
#include "zmcg/zmcg.h"

namespace {

// Called where no other thread logs.
void Report() ZMC_NO_LOCK_NEEDED {
    MetadataParseLog* const log = gpMetadataParseLogInstance;
    if (!log) {
        std::fprintf(stderr, "no log\n");
        return;
    }
    std::string path;
    for (const wchar_t unit : log->logPath) path += static_cast<char>(unit);
    std::fprintf(stderr, "level=%u console=%u open=%d path=%s\n", log->level, log->toConsole,
                 log->stream.is_open() ? 1 : 0, path.c_str());
}

void Build(int count) {
    std::vector<zelm::Metadata> made;
    MetadataParseLog* first = nullptr;
    for (int i = 0; i < count; ++i) {
        made.emplace_back();
        if (i == 0) first = gpMetadataParseLogInstance;
        if (first != gpMetadataParseLogInstance) std::fprintf(stderr, "another log\n");
    }
}

void LogMany(int thread, int count) {
    for (int i = 0; i < count; ++i)
        MetadataParseLog::Log(1, L"thread %d line %d %s\n", thread, i, L"and no more");
}

void InThreads(int count, void (*work)(int, int), int argument) {
    std::vector<std::thread> threads;
    for (int i = 0; i < count; ++i) threads.emplace_back(work, i, argument);
    for (std::thread& thread : threads) thread.join();
}

}  // namespace

int main(int argc, char** argv) {
    const std::string command = argc > 1 ? argv[1] : "";
    const int number = argc > 2 ? std::atoi(argv[2]) : 0;
    if (command == "race") {
        InThreads(
            4, [](int, int count) { Build(count); }, 100);
    } else {
        Build(command == "build" ? number : 1);
    }
    if (command == "log") {
        const std::string text = argc > 3 ? argv[3] : "";
        MetadataParseLog::Log(static_cast<std::uint32_t>(number), L"%s\n",
                              std::wstring(text.begin(), text.end()).c_str());
    } else if (command == "odd") {
        MetadataParseLog::Log(1, L"odd \u00e4\U0001F30D\n");
        MetadataParseLog::Log(1, L"worse \xdc00\n");
        // What is no character at all, where units have the room to say so.
        if constexpr (sizeof(wchar_t) == 4) {
            const wchar_t beyond[] = {static_cast<wchar_t>(0x110000),
                                      static_cast<wchar_t>(0x7FFFFFFF),
                                      static_cast<wchar_t>(0xFFFFFFFF), 0};
            MetadataParseLog::Log(1, L"beyond %s\n", beyond);
        }
        MetadataParseLog::Log(1, L"plain\n");
    } else if (command == "long") {
        const std::wstring text(static_cast<std::size_t>(number), L'x');
        MetadataParseLog::Log(1, L"%s", text.c_str());
        MetadataParseLog::Log(1, L"\nplain\n");
    } else if (command == "threads") {
        InThreads(2, LogMany, number);
    }
    Report();
    return 0;
}
