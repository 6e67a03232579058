#include "metadata/MetadataParseLog.h"

#include <atomic>
#include <climits>
#include <cstdarg>
#include <cstdlib>
#include <cwchar>
#include <iostream>
#include <locale>
#include <memory>
#include <new>

#include "platform/Directory.h"
#include "platform/LocalTime.h"
#include "platform/ParseNumber.h"
#include "platform/WideFormat.h"
#include "zmcg/zmcg.h"

namespace {

constexpr std::size_t kTextCapacity = 4096;
constexpr wchar_t kFileName[] = L"metadata_parse_log.log";

// The value of a variable, empty if it is not set. Its bytes are signed on purpose: narrowing
// gives them back, whatever the charset.
std::wstring ReadVariable(const char* name) {
    std::wstring wide;
    // NOLINTNEXTLINE(concurrency-mt-unsafe): nothing of ours changes the environment.
    if (const char* value = std::getenv(name))
        for (; *value; ++value) wide += static_cast<wchar_t>(static_cast<signed char>(*value));
    return wide;
}

std::string NarrowToBytes(const std::wstring& wide) {
    std::string bytes;
    for (const wchar_t unit : wide) bytes += static_cast<char>(unit);
    return bytes;
}

std::uint32_t ParseNumber(const std::wstring& text) {
    return platform::ParseUnsigned32(NarrowToBytes(text).c_str());
}

// The two settings are plain words of a shared record that any thread may read while the first
// Metadata still sets them.
std::uint32_t Load(std::uint32_t& word) {
    return std::atomic_ref<std::uint32_t>(word).load(std::memory_order_relaxed);
}
void Store(std::uint32_t& word, std::uint32_t value) {
    std::atomic_ref<std::uint32_t>(word).store(value, std::memory_order_relaxed);
}

std::atomic_ref<MetadataParseLog*> Instance() {
    return std::atomic_ref<MetadataParseLog*>(gpMetadataParseLogInstance);
}

// Files are UTF-8 where the system can do that. The facets must be the run-time library's own: the
// log outlives the module that created it.
void UseUtf8(std::wofstream& stream) {
    try {
        stream.imbue(std::locale("C.UTF-8"));
    } catch (...) {
        // The classic locale stays: ASCII, which is all that the header needs.
    }
}

using Facet = std::codecvt<wchar_t, char, std::mbstate_t>;

bool CanEncode(const Facet& facet, wchar_t unit) {
    std::mbstate_t state{};
    const wchar_t* unitEnd = nullptr;
    char bytes[16];
    char* bytesEnd = nullptr;
    return facet.out(state, &unit, &unit + 1, unitEnd, bytes, bytes + sizeof bytes, bytesEnd) ==
           std::codecvt_base::ok;
}

bool CLocaleCanEncode(wchar_t unit) {
    std::mbstate_t state{};
    char bytes[MB_LEN_MAX];
    // NOLINTNEXTLINE(concurrency-mt-unsafe): the state is this call's own.
    return std::wcrtomb(bytes, unit, &state) != static_cast<std::size_t>(-1);
}

// Encoders of the C library go beyond the last character, to what no UTF-8 holds.
bool IsCharacter(wchar_t unit) { return static_cast<std::uint32_t>(unit) <= 0x10FFFF; }

// A character that a stream cannot encode stays in its buffer and fails every later write, ours
// and the host's; so none gets there.
template <class Test>
void ReplaceUnless(Test canEncode, wchar_t* text) {
    for (; *text; ++text)
        if ((*text < 0 || *text > 0x7F) && !(IsCharacter(*text) && canEncode(*text))) *text = L'?';
}

void WriteTo(std::wostream& stream, const wchar_t* text) {
    const std::ios_base::iostate before = stream.rdstate();
    stream << text;
    stream.flush();
    if (stream.rdstate() != before) stream.clear(before);
}

// The console encodes by the C locale, or by the stream's own if the host has parted it from the C
// streams; a character goes through where both can take it.
void WriteToConsole(wchar_t* text) {
    const std::locale locale = std::wcout.getloc();
    const auto& facet = std::use_facet<Facet>(locale);
    ReplaceUnless([&](wchar_t unit) { return CLocaleCanEncode(unit) && CanEncode(facet, unit); },
                  text);
    WriteTo(std::wcout, text);
}

}  // namespace

MetadataParseLog::~MetadataParseLog() {
    if (!stream.is_open()) return;
    try {
        stream.close();
    } catch (...) {
        // A host that asked this stream for exceptions learns nothing more here.
    }
}

MetadataParseLog* MetadataParseLog::GetInstance() {
    if (MetadataParseLog* present = Instance().load(std::memory_order_acquire)) return present;
    try {
        std::unique_ptr<MetadataParseLog> fresh(new (std::nothrow) MetadataParseLog);
        if (!fresh) return nullptr;
        MetadataParseLog* expected = nullptr;
        if (!Instance().compare_exchange_strong(expected, fresh.get())) return expected;
        MetadataParseLog* const log = fresh.release();
        log->SetUp();
        return log;
    } catch (...) {
        return Instance().load();
    }
}

void MetadataParseLog::SetUp() {
    try {
        ReadSettings();
    } catch (...) {
        // The fields stay as far as they got.
    }
}

// Each missing variable ends the reading. The console variable is needed even for a log that only
// goes to a file; without it the level stands and no file is opened.
void MetadataParseLog::ReadSettings() {
    Store(level, 0);
    logDirectory = ReadVariable("metadata_parse_log_dir");
    if (logDirectory.empty()) return;
    const std::wstring levelText = ReadVariable("metadata_parse_log_level");
    if (levelText.empty()) return;
    Store(level, ParseNumber(levelText));
    if (level == 0) return;
    const std::wstring consoleText = ReadVariable("metadata_parse_log_console");
    if (consoleText.empty()) return;
    Store(toConsole, ParseNumber(consoleText));
    if (!Open()) Store(level, 0);
}

bool MetadataParseLog::Open() {
    const std::string directory = NarrowToBytes(logDirectory);
    if (!platform::EnsureDirectory(directory.c_str(), directory.c_str())) return false;
    logPath = logDirectory + L"/" + kFileName;
    {
        const platform::MutexHolder lock(writing);
        UseUtf8(stream);
        stream.open(NarrowToBytes(logPath), std::ios_base::out);
        if (!stream.is_open()) {
            stream.setstate(std::ios_base::failbit);
            return false;
        }
        stream.clear();
    }
    WriteHeader();
    return true;
}

void MetadataParseLog::WriteHeader() {
    char now[platform::kLocalTimeLength + 1];
    platform::LocalTimeText(now);
    Log(1, L"\n");
    std::wstring header(now, now + std::char_traits<char>::length(now));
    header += L"  MetadataImpl Parse Log.   Log Level is set to: ";
    header += std::to_wstring(level) + L"\n\n";
    Log(1, header.c_str());  // serves as its own format: neither time nor number has a percent sign
}

// NOLINTNEXTLINE(cert-dcl50-cpp): its callers give printf arguments.
void MetadataParseLog::Log(std::uint32_t messageLevel, const wchar_t* format, ...) {
    MetadataParseLog* const log = Instance().load(std::memory_order_acquire);
    if (!log || messageLevel > Load(log->level)) return;
    std::va_list arguments;
    va_start(arguments, format);
    log->Format(format, arguments);
    va_end(arguments);
}

void MetadataParseLog::Format(const wchar_t* format, std::va_list arguments) {
    wchar_t text[kTextCapacity];
    platform::FormatWideV(text, kTextCapacity, format, arguments);
    Write(text);
}

void MetadataParseLog::Write(wchar_t* text) {
    try {
        const platform::MutexHolder lock(writing);
        if (stream.is_open()) {
            const std::locale locale = stream.getloc();
            const auto& facet = std::use_facet<Facet>(locale);
            ReplaceUnless([&](wchar_t unit) { return CanEncode(facet, unit); }, text);
            WriteTo(stream, text);
        }
        if (Load(toConsole) != 0) WriteToConsole(text);
    } catch (...) {
        // No failure of a log shows to its caller.
    }
}
