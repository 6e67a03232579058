// What comes from outside through the environment: the three variables of the parse log, and the
// table of directory settings through the set-up of coordinate systems.
//
// The singletons are created anew for every input, as in a new process. Directories of any name are
// made in a folder of this program alone.
#include <unistd.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <map>
#include <memory>
#include <sstream>
#include <string>

#include "coordsys/CoordSysFactory.h"
#include "coordsys/CoordSysLog.h"
#include "coordsys/Environment.h"
#include "coordsys/EnvironmentKeys.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/InputBytes.h"
#include "fuzz/support/ScratchFolder.h"
#include "fuzz/support/TextModel.h"
#include "metadata/MetadataParseLog.h"
#include "zmcg/zmcg.h"

namespace {

using zelm::String;
using zmcfuzz::InputBytes;

__extension__ typedef unsigned __int128 Wide;

const zmcfuzz::ScratchFolder& Scratch() {
    static const zmcfuzz::ScratchFolder folder;
    return folder;
}

// A number as the variables have it: decimal, hexadecimal or octal, as far as it goes, in 32 bits.
std::uint32_t NumberOf(const std::string& text) {
    std::size_t at = 0;
    while (at < text.size() && (text[at] == ' ' || (text[at] >= '\t' && text[at] <= '\r'))) ++at;
    const bool negative = at < text.size() && text[at] == '-';
    if (at < text.size() && (text[at] == '-' || text[at] == '+')) ++at;
    const auto digit = [&](std::size_t i) {
        const std::string kDigits = "0123456789abcdef";
        const char c = i < text.size() ? text[i] : 'x';
        return kDigits.find(c >= 'A' && c <= 'F' ? static_cast<char>(c + 32) : c);
    };
    std::size_t base = 10;
    if (digit(at) == 0) {
        const bool hex = at + 1 < text.size() && (text[at + 1] | 32) == 'x' && digit(at + 2) < 16;
        base = hex ? 16 : 8;
        if (hex) at += 2;
    }
    Wide magnitude = 0;
    for (; digit(at) < base; ++at)
        if (magnitude < Wide{1} << 100) magnitude = magnitude * base + digit(at);
    if (magnitude > 0xFFFFFFFFu) return 0xFFFFFFFFu;
    const auto value = static_cast<std::uint32_t>(magnitude);
    return negative ? 0u - value : value;
}

// A variable that is set, or not.
struct Variable {
    bool set = false;
    std::string value;

    static Variable Take(InputBytes& input) {
        Variable variable;
        variable.set = input.Byte() % 8 != 0;
        variable.value = input.Bytes(input.UpTo(24)).c_str();
        return variable;
    }
    void Export(const char* name) const {
        // NOLINTNEXTLINE(concurrency-mt-unsafe): this program has one thread.
        ZMC_EXPECT((set ? setenv(name, value.c_str(), 1) : unsetenv(name)) == 0);
    }
    bool IsEmpty() const { return !set || value.empty(); }
};

constexpr char kLogName[] = "metadata_parse_log.log";

// Names of folders stay below this program's own, where one is such that it can hold no log.
Variable TakeDirectory(InputBytes& input) {
    static const bool made =
        std::filesystem::create_directories(Scratch() / "blocked/metadata_parse_log.log");
    static_cast<void>(made);
    Variable directory = Variable::Take(input);
    if (directory.IsEmpty()) return directory;
    std::string name = directory.value;
    for (char& c : name)
        if (c == '.') c = ',';
    directory.value = Scratch().Path() + "/" + name;
    return directory;
}

std::string ReadAll(const std::string& name) {
    std::string bytes;
    if (std::FILE* const file = std::fopen(name.c_str(), "rb")) {
        char block[4096];
        while (const std::size_t n = std::fread(block, 1, sizeof block, file))
            bytes.append(block, n);
        static_cast<void>(std::fclose(file));
    }
    return bytes;
}

// The console for the length of a call.
class ConsoleCapture {
public:
    ConsoleCapture() : before(std::wcout.rdbuf(&text)) {}
    ConsoleCapture(const ConsoleCapture&) = delete;
    ConsoleCapture& operator=(const ConsoleCapture&) = delete;
    ~ConsoleCapture() { std::wcout.rdbuf(before); }
    std::wstring Text() const { return text.str(); }

private:
    std::wstringbuf text;
    std::wstreambuf* const before;
};

// Characters of a message, surrogates and such as no charset has included.
std::wstring TakeText(InputBytes& input) {
    std::wstring text(input.UpTo(30), L'\0');
    for (wchar_t& unit : text) {
        const std::uint8_t kind = input.Byte();
        const std::uint32_t low = kind % 4 == 3   ? input.Word()
                                  : kind % 4 == 2 ? input.Byte() * 259u
                                                  : kind / 4u + 48u;
        unit = static_cast<wchar_t>(low == 0 ? 1 : low);
    }
    if (input.Byte() % 16 == 15 && !text.empty())
        while (text.size() < 5000) text += text;
    return text;
}

bool IsCharacter(wchar_t unit) {
    const auto code = static_cast<std::uint32_t>(unit);
    return code <= 0x10FFFF && !zmcfuzz::IsSurrogate(code);
}

// In the file, which is UTF-8; what is no character is replaced.
std::string InFile(const std::wstring& text) {
    std::string bytes;
    for (const wchar_t unit : text)
        zmcfuzz::PutUtf8(IsCharacter(unit) ? static_cast<char32_t>(unit) : U'?', bytes);
    return bytes;
}

// On the console of the classic locale.
std::wstring OnConsole(std::wstring text) {
    for (wchar_t& unit : text)
        if (unit < 0 || unit > 0x7F) unit = L'?';
    return text;
}

struct ParseLogModel {
    std::uint32_t level = 0;
    std::uint32_t console = 0;
    bool open = false;

    ParseLogModel(const Variable& directory, const Variable& levelText, const Variable& toConsole) {
        if (directory.IsEmpty() || levelText.IsEmpty()) return;
        level = NumberOf(levelText.value);
        if (level == 0 || toConsole.IsEmpty()) return;
        console = NumberOf(toConsole.value);
        open = CanMake(directory.value);
        if (!open) level = 0;
    }

    // Only the last component is made; what is a file cannot hold one, and a folder is no log.
    static bool CanMake(const std::string& name) {
        std::error_code ignored;
        std::string bare = name;
        while (bare.size() > 1 && bare.back() == '/') bare.pop_back();
        const std::filesystem::path path(bare);
        if (std::filesystem::exists(path, ignored))
            return std::filesystem::is_directory(path, ignored) &&
                   !std::filesystem::is_directory(path / kLogName, ignored);
        return std::filesystem::is_directory(path.parent_path(), ignored) &&
               path.filename().string().size() <= 255;
    }
};

// There is no other thread.
bool IsOpen(const MetadataParseLog& log) ZMC_NO_LOCK_NEEDED { return log.stream.is_open(); }

void RunParseLog(InputBytes& input) {
    const Variable directory = TakeDirectory(input);
    const Variable level = Variable::Take(input);
    const Variable toConsole = Variable::Take(input);
    directory.Export("metadata_parse_log_dir");
    level.Export("metadata_parse_log_level");
    toConsole.Export("metadata_parse_log_console");
    const ParseLogModel model(directory, level, toConsole);
    std::string header;
    std::string logged;
    std::wstring shown;
    {
        const ConsoleCapture console;
        const std::unique_ptr<MetadataParseLog> log(MetadataParseLog::GetInstance());
        ZMC_EXPECT(log && MetadataParseLog::GetInstance() == log.get());
        ZMC_EXPECT(log->level == model.level && log->toConsole == model.console);
        ZMC_EXPECT(IsOpen(*log) == model.open);
        const std::size_t headerLength = console.Text().size();
        for (std::uint32_t count = input.UpTo(3); count > 0; --count) {
            const std::uint32_t messageLevel = input.Flag() ? input.UpTo(9) : input.Size();
            const std::wstring text = TakeText(input);
            MetadataParseLog::Log(messageLevel, L"%s", text.c_str());
            if (messageLevel > model.level) continue;
            logged += InFile(text.substr(0, 4095));
            if (model.console != 0) shown += OnConsole(text.substr(0, 4095));
        }
        ZMC_EXPECT(console.Text().substr(headerLength) == shown);
        gpMetadataParseLogInstance = nullptr;
    }
    MetadataParseLog::Log(0, L"nobody hears this");
    if (!model.open) return;
    const std::string file = directory.value + "/" + kLogName;
    const std::string bytes = ReadAll(file);
    const std::string mark =
        "  MetadataImpl Parse Log.   Log Level is set to: " + std::to_string(model.level) + "\n\n";
    ZMC_EXPECT(bytes.size() == 1 + 24 + mark.size() + logged.size() && bytes[0] == '\n');
    ZMC_EXPECT(bytes.compare(25, std::string::npos, mark + logged) == 0);
    unlink(file.c_str());
    rmdir(directory.value.c_str());
}

// --- directory settings ---

std::string toldPeDirectory;
std::string toldGdalDirectory;

int TakeInitialisation(String& peDirectory, String& gdalDirectory) {
    toldPeDirectory = peDirectory.GetUtf8();
    toldGdalDirectory = gdalDirectory.GetUtf8();
    return 0;
}

std::string Held(const std::string& text) { return zmcfuzz::Utf8Of(zmcfuzz::Utf16Of(text)); }

std::string OrNotSet(const std::string& text) { return text.empty() ? "Not Set" : Held(text); }

// What stands under the name of the engine.
enum class Engine { None, NoLibrary, OtherLibrary, Real };

// A folder with that in it. The engine is held for good: a fuzzer that loses a library that it
// counts in loses its way.
std::string FolderOf(Engine engine) {
    static const platform::LibraryHandle held =
        platform::LoadLibraryFile(String(ZMC_ENGINE_PATH).wide);
    ZMC_EXPECT(held);
    const std::string path = Scratch() / ("engine-" + std::to_string(static_cast<int>(engine)));
    if (std::filesystem::create_directory(path)) {
        const String name = (path + "/").c_str() + zelm::CoordSysFuncPtrs::EngineFileName();
        if (engine == Engine::NoLibrary)
            ZMC_EXPECT(std::ofstream(name.GetUtf8()) << "not a library" << std::flush);
        else
            std::filesystem::create_symlink(
                engine == Engine::Real ? ZMC_ENGINE_PATH : ZMC_SIBLING_PATH, name.GetUtf8());
    }
    return path;
}

Engine EngineOf(std::uint8_t kind) {
    if (kind % 16 != 8) return Engine::None;
    return kind < 128 ? Engine::NoLibrary : kind < 192 ? Engine::OtherLibrary : Engine::Real;
}

void RunTable(InputBytes& input) {
    const zelm::Environment environment;
    ZMC_EXPECT(environment.ToString().Find("{Object}@") == 0);
    auto& settings = GetGlobalEnvironmentImpl().settings;
    settings.clear();
    std::map<std::u16string, std::u16string> model;
    for (std::uint32_t count = input.UpTo(6); count > 0; --count) {
        const std::string key = input.Bytes(input.UpTo(6)).c_str();
        String& value = environment.GetSetting(key.c_str());
        const std::u16string known = model[zmcfuzz::Utf16Of(key)];
        ZMC_EXPECT(value.View() == std::u16string_view(known));
        if (!input.Flag()) continue;
        const std::string text = input.Bytes(input.UpTo(12)).c_str();
        value = text.c_str();
        model[zmcfuzz::Utf16Of(key)] = zmcfuzz::Utf16Of(text);
    }
    ZMC_EXPECT(settings.size() == model.size());
    auto next = model.begin();
    for (const auto& [key, value] : settings) {
        ZMC_EXPECT(key.View() == std::u16string_view(next->first));
        ZMC_EXPECT(value.View() == std::u16string_view(next->second));
        ++next;
    }
}

void RunFactory(InputBytes& input) {
    const zelm::Environment environment;
    GetGlobalEnvironmentImpl().settings.clear();
    const std::uint8_t kind = input.Byte();
    std::string bin = input.Bytes(input.UpTo(20)).c_str();
    const std::string pe = input.Bytes(input.UpTo(20)).c_str();
    const std::string gdal = input.Bytes(input.UpTo(20)).c_str();
    // Data directories that exist would get a control file; only this program's own does.
    const std::string peDirectory = kind % 4 == 0 ? Scratch().Path()
                                    : pe.empty()  ? pe
                                                  : Scratch().Path() + "/none/" + pe;
    const Engine engine = EngineOf(kind);
    if (engine != Engine::None)
        bin = FolderOf(engine);
    else if (bin.starts_with('/'))
        bin.erase(0, 1);
    environment.GetSetting(zelm::EnvironmentKeys::kBinDirectory) = bin.c_str();
    environment.GetSetting(zelm::EnvironmentKeys::kPeDirectory) = peDirectory.c_str();
    if (kind % 3 != 0) environment.GetSetting(zelm::EnvironmentKeys::kGdalDirectory) = gdal.c_str();
    // A library sets the entry points, or clears the first that it has not.
    const bool loaded = engine == Engine::OtherLibrary || engine == Engine::Real;
    fp_Esri_Pe_Initialize = &TakeInitialisation;
    toldPeDirectory = toldGdalDirectory = "nothing";
    {
        const std::unique_ptr<zelm::CoordSysFactory> factory(zelm::CoordSysFactory::GetInstance());
        ZMC_EXPECT(factory && factory.get() == zelm::CoordSysFactory::GetInstance());
        ZMC_EXPECT((factory->funcPtrs.module != nullptr) == loaded);
        ZMC_EXPECT((fp_Esri_Pe_Release != nullptr) == (engine == Engine::Real));
        gpCoordSysFactoryInstance = nullptr;
    }
    ZMC_EXPECT(toldPeDirectory == (loaded ? "nothing" : OrNotSet(peDirectory)));
    ZMC_EXPECT(toldGdalDirectory == (loaded          ? "nothing"
                                     : kind % 3 != 0 ? OrNotSet(gdal)
                                                     : "Not Set"));
    ZMC_EXPECT((gpCoordSysLogInstance != nullptr) == (kind % 4 == 0));
    delete gpCoordSysLogInstance;
    gpCoordSysLogInstance = nullptr;
    ZMC_EXPECT((fp_Esri_Pe_Release != nullptr) == (engine == Engine::Real));
    zelm::CoordSysFuncPtrs::ClearEntryPoints();
    ZMC_EXPECT(!fp_Esri_Pe_Initialize && !fp_Esri_Pe_Release);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    InputBytes input(data, size);
    switch (input.UpTo(3)) {
        case 0:
            RunTable(input);
            break;
        case 1:
            RunFactory(input);
            break;
        default:
            RunParseLog(input);
            break;
    }
    return 0;
}
