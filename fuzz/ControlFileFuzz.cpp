// The control file of the projection log: any bytes as "pelog.txt", then messages of any text,
// beside a model of what the file switches on and of the lines that the log writes.
//
// The log is created anew for every input, as in a new process. An input tells the state of the
// files, the messages, and then the bytes of the control file.
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "coordsys/CoordSysLog.h"
#include "coordsys/CoordSysLogNotes.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/InputBytes.h"
#include "fuzz/support/ScratchFolder.h"
#include "fuzz/support/TextModel.h"
#include "platform/File.h"
#include "zmcg/zmcg.h"

namespace {

using zelm::CoordSysLog;
using zelm::String;
using zmcfuzz::InputBytes;

constexpr std::size_t kFullSize = 500000;
constexpr std::size_t kPiece = 1023;    // of a line that is read at a time
constexpr std::size_t kLongest = 4095;  // units of a message, and of a line

struct Settings {
    std::uint32_t levels = 0;
    bool debugger = false;
    bool file = false;
};

bool IsControlText(const std::string& line) {
    static const std::string kForm = "dddd,dddd,dddd,dddd";
    if (line.size() < kForm.size()) return false;
    for (std::size_t i = 0; i < kForm.size(); ++i) {
        const char c = line[i];
        if (kForm[i] == ',' ? c != ',' : c != '0' && c != '1' && c != ',') return false;
    }
    return true;
}

// What a control file of these bytes says. A line longer than a piece counts as several, and a
// zero hides the rest of its line.
Settings SettingsOf(const std::string& bytes) {
    for (std::size_t at = 0; at < bytes.size();) {
        const std::size_t newline = std::min(bytes.find('\n', at), bytes.size() - 1);
        const std::size_t end = std::min(newline + 1, at + kPiece);
        const std::string line = bytes.substr(at, end - at).c_str();
        at = end;
        if (line.empty() || (line[0] != '0' && line[0] != '1')) continue;
        Settings settings;
        if (!IsControlText(line)) return settings;
        settings.debugger = line[0] == '1';
        settings.file = line[1] == '1';
        std::uint32_t value = 1;  // from the right, the lowest level is the last digit
        for (std::size_t i = 19; i-- > 2;) {
            if (i == 4 || i == 9 || i == 14) continue;
            if (line[i] == '1') settings.levels += value;
            value *= 2;
        }
        if (!settings.debugger && !settings.file) settings.levels = 0;
        return settings;
    }
    return {};
}

// The program's error stream for the length of a call: the debugger's output goes there.
class ErrorCapture {
public:
    ErrorCapture() : before(stderr), stream(open_memstream(&text, &size)) { stderr = stream; }
    ErrorCapture(const ErrorCapture&) = delete;
    ErrorCapture& operator=(const ErrorCapture&) = delete;
    ~ErrorCapture() {
        stderr = before;
        static_cast<void>(std::fclose(stream));
        std::free(text);
    }
    std::string Text() {
        static_cast<void>(std::fflush(stream));
        return {text, size};
    }

private:
    std::FILE* const before;
    char* text = nullptr;
    std::size_t size = 0;
    std::FILE* const stream;
};

// Stays in the folder of one process: what an input leaves is put right by the next.
class Files {
public:
    std::string Control() const { return folder / "pelog.txt"; }
    std::string Logs() const { return folder / "logs"; }
    std::string Log(int which) const {
        return Logs() + (which == 1 ? "/zmcpe_pe_1.log" : "/zmcpe_pe_2.log");
    }
    const std::string& Folder() const { return folder.Path(); }

    void Clear() const {
        std::error_code ignored;
        std::filesystem::remove(Control(), ignored);
    }
    void Write(const std::string& bytes) const {
        std::FILE* const file = std::fopen(Control().c_str(), "wb");
        ZMC_EXPECT(file && std::fwrite(bytes.data(), 1, bytes.size(), file) == bytes.size());
        ZMC_EXPECT(std::fclose(file) == 0);
    }
    static std::string Read(const std::string& name) {
        std::string bytes;
        if (std::FILE* const file = std::fopen(name.c_str(), "rb")) {
            char block[4096];
            while (const std::size_t n = std::fread(block, 1, sizeof block, file))
                bytes.append(block, n);
            static_cast<void>(std::fclose(file));
        }
        return bytes;
    }
    static bool Exists(const std::string& name) { return access(name.c_str(), F_OK) == 0; }
    static std::size_t SizeOf(const std::string& name) {
        struct stat info {};
        return stat(name.c_str(), &info) == 0 && S_ISREG(info.st_mode)
                   ? static_cast<std::size_t>(info.st_size)
                   : 0;
    }

    // A log file of some size, or a folder of its name.
    void MakeLog(int which, std::uint8_t kind) const {
        static constexpr std::size_t kSizes[] = {
            0, 0, 10, kFullSize - 50, kFullSize - 1, kFullSize, kFullSize + 1};
        const std::string name = Log(which);
        std::error_code ignored;
        if (kind % 8 == 7) {
            std::filesystem::remove(name, ignored);
            std::filesystem::create_directory(name, ignored);
            return;
        }
        if (std::filesystem::is_directory(name, ignored)) std::filesystem::remove(name, ignored);
        if (std::FILE* const file = std::fopen(name.c_str(), "wb")) {
            ZMC_EXPECT(ftruncate(fileno(file), static_cast<off_t>(kSizes[kind % 8])) == 0);
            static_cast<void>(std::fclose(file));
        }
    }

    // The folder of the logs: there, missing, a file in its place, or a link to nothing, beside
    // which no folder can be made.
    void MakeLogs(const std::string& state) const {
        InputBytes input(reinterpret_cast<const std::uint8_t*>(state.data()), state.size());
        const std::uint8_t kind = input.Byte();
        const std::uint8_t first = input.Byte();
        const std::uint8_t second = input.Byte();
        std::error_code ignored;
        if (kind % 8 >= 5) {
            std::filesystem::remove_all(Logs(), ignored);
            if (kind % 8 == 7) ZMC_EXPECT(std::fclose(std::fopen(Logs().c_str(), "wb")) == 0);
            if (kind % 8 == 5) std::filesystem::create_symlink("nothing", Logs(), ignored);
            return;
        }
        if (!std::filesystem::is_directory(Logs(), ignored)) {
            std::filesystem::remove_all(Logs(), ignored);
            std::filesystem::create_directory(Logs(), ignored);
        }
        MakeLog(1, first);
        MakeLog(2, second);
    }

private:
    zmcfuzz::ScratchFolder folder;
};

const Files& TheFiles() {
    static const Files files;
    return files;
}

struct Message {
    std::uint32_t level;
    std::u16string text;
};

std::vector<Message> TakeMessages(InputBytes& input) {
    std::vector<Message> messages(input.UpTo(3));
    for (Message& message : messages) {
        message.level = input.Flag() ? CoordSysLog::kErrorLevel : 1u << input.UpTo(15);
        const std::size_t times = input.Flag() ? input.UpTo(200) : 1;
        const std::u16string text = zmcfuzz::Utf16Of(input.Bytes(input.UpTo(40)).c_str());
        for (std::size_t i = 0; i < times; ++i) message.text += text;
    }
    return messages;
}

// Which log file is open, and what of it is to be seen afterwards.
struct LogModel {
    int current = 0;
    bool open = false;
    bool toFile = false;
    std::size_t sizes[3] = {};
    std::uint32_t sequence = 0;

    explicit LogModel(const Settings& settings, const Files& files) : toFile(settings.file) {
        if (settings.levels == 0 || !settings.file) return;
        std::error_code ignored;
        if (!Files::Exists(files.Logs()) && !std::filesystem::is_symlink(files.Logs(), ignored))
            std::filesystem::create_directory(files.Logs(), ignored);
        toFile = Files::Exists(files.Logs());
        if (!toFile) return;
        for (int which = 1; which <= 2; ++which) {
            can[which] = std::filesystem::is_directory(files.Logs(), ignored) &&
                         !std::filesystem::is_directory(files.Log(which), ignored);
            sizes[which] = Files::SizeOf(files.Log(which));
        }
        Begin();
    }

    void Begin() {
        current = 1;
        open = can[1];
        toFile = can[1];
        if (!open || sizes[1] < kFullSize) return;
        current = 2;
        open = can[2];
        if (!open || sizes[2] < kFullSize) return;
        current = 1;
        open = true;
        sizes[1] = 0;
    }

    void Add(std::size_t bytes) {
        if (!toFile || !open) return;
        ++sequence;
        sizes[current] += bytes;
        if (sizes[current] <= kFullSize) return;
        current = 3 - current;
        open = can[current];
        if (open) sizes[current] = 0;
    }

    bool can[3] = {};
};

constexpr std::size_t kTimeLength = 24;

// A line without its time.
std::u16string LineOf(std::uint32_t sequence, const std::u16string& message) {
    char numbers[32];
    static_cast<void>(std::snprintf(numbers, sizeof numbers, ", %5d, %5u, ", 0, sequence));
    std::u16string line = zmcfuzz::Utf16Of(numbers) + message + u" \n";
    line.resize(std::min(line.size(), kLongest - kTimeLength));
    return line;
}

std::string WithNewline(const std::u16string& text) { return zmcfuzz::Utf8Of(text) + "\n"; }

// There is no other thread.
void ExpectLog(const CoordSysLog& log, const LogModel& model,
               const Settings& settings) ZMC_NO_LOCK_NEEDED {
    ZMC_EXPECT(log.levelMask == settings.levels);
    ZMC_EXPECT((log.toDebugger == 1) == settings.debugger);
    ZMC_EXPECT((log.toFile == 1) == model.toFile);
    ZMC_EXPECT(log.currentFile == model.current && (log.stream != nullptr) == model.open);
    ZMC_EXPECT(log.sequence == model.sequence);
}

void RunLog(const Settings& settings, const std::vector<Message>& messages) {
    const Files& files = TheFiles();
    LogModel model(settings, files);
    ErrorCapture capture;
    CoordSysLog* const log = CoordSysLog::CreateInstance(files.Folder().c_str());
    ZMC_EXPECT(log && log == gpCoordSysLogInstance);
    ExpectLog(*log, model, settings);
    std::string debugger;
    std::string lastLine;
    for (const Message& message : messages) {
        CoordSysLog::LogMessage(message.level, u"%s", message.text.c_str());
        if ((message.level & settings.levels) == 0) continue;
        const std::u16string text = message.text.substr(0, kLongest);
        if (settings.debugger) debugger += WithNewline(text);
        const int before = model.current;
        const std::string line = zmcfuzz::Utf8Of(LineOf(model.sequence + 1, text));
        const bool written = model.toFile && model.open;
        model.Add(kTimeLength + line.size());
        if (written) lastLine = model.current == before ? line : "";
    }
    ExpectLog(*log, model, settings);
    ZMC_EXPECT(capture.Text() == debugger);
    if (!lastLine.empty() && model.open) {
        const std::string bytes = Files::Read(files.Log(model.current));
        ZMC_EXPECT(bytes.size() == model.sizes[model.current]);
        ZMC_EXPECT(bytes.ends_with(lastLine));
    }
    delete log;
    gpCoordSysLogInstance = nullptr;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    InputBytes input(data, size);
    const Files& files = TheFiles();
    const std::uint8_t kind = input.Byte() % 16;
    const std::string state = input.Bytes(3);
    const std::vector<Message> messages = TakeMessages(input);
    const std::string control = input.Rest();
    const Settings settings = kind < 14 ? SettingsOf(control) : Settings();
    // A log that is off leaves its files alone, and so do we.
    if (settings.levels != 0) files.MakeLogs(state);
    if (kind == 15) {  // without a control file one is written, which leaves the log off
        files.Clear();
        RunLog(settings, messages);
        ZMC_EXPECT(Files::Read(files.Control()) == zelm::kCoordSysLogNotes);
        RunLog(settings, messages);
    } else if (kind == 14) {  // a folder cannot be read
        files.Clear();
        std::filesystem::create_directory(files.Control());
        RunLog(settings, messages);
        files.Clear();
    } else {
        files.Write(control);
        RunLog(settings, messages);
    }
    if (kind == 13) {
        ZMC_EXPECT(Files::Read(files.Control()) == control);
        // Without the data directory there is no log at all.
        ZMC_EXPECT(!CoordSysLog::CreateInstance((files.Folder() + "/none").c_str()));
        ZMC_EXPECT(!gpCoordSysLogInstance);
        CoordSysLog::LogMessage(~0u, u"nobody hears this");
    }
    return 0;
}
