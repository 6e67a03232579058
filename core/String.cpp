#include "core/String.h"

#include <algorithm>
#include <cstring>
#include <istream>
#include <new>

#include "platform/TextConversion.h"

namespace zelm {
namespace {

// An empty text with room for `units`; false, and null, where there is no memory.
template <class Unit>
bool AllocateText(Unit*& text, std::size_t units) {
    text = new (std::nothrow) Unit[units + 1];
    if (text) text[0] = Unit{0};
    return text != nullptr;
}

const char16_t* AsUtf16(const WideChar* text) { return reinterpret_cast<const char16_t*>(text); }
char16_t* AsUtf16(WideChar* text) { return reinterpret_cast<char16_t*>(text); }

std::size_t Units(const WideChar* text) { return std::char_traits<WideChar>::length(text); }

using NarrowConversion = std::size_t (*)(const char16_t*, std::size_t, char*, std::size_t);

// Makes a narrow copy of `text`; one byte is allocated where the size cannot be told, so that the
// caller still gets a text.
char* MakeNarrow(const WideChar* text, NarrowConversion convert) {
    const std::size_t units = Units(text);
    std::size_t bytes = convert(AsUtf16(text), units, nullptr, 0);
    if (bytes == platform::kConversionFailed) bytes = 0;
    char* narrow = nullptr;
    if (!AllocateText(narrow, bytes)) return nullptr;
    if (bytes != 0) {
        convert(AsUtf16(text), units, narrow, bytes);
        narrow[bytes] = '\0';
    }
    return narrow;
}

}  // namespace

String::String(const WideChar* text) {
    if (text) CopyUnits(text, Units(text));
}

String::String(const char* utf8Text) {
    if (utf8Text) ConvertFromUtf8(utf8Text, std::strlen(utf8Text));
}

String::String(const String& other) { CopyOf(other); }

String::~String() { Free(); }

// NOLINTNEXTLINE(cert-oop54-cpp): a string that is assigned to itself ends as null.
String& String::operator=(const String& other) {
    Free();
    CopyOf(other);
    return *this;
}

String& String::operator=(const WideChar* text) {
    String fresh(text);  // `text` may point into this string
    Swap(fresh);
    return *this;
}

String& String::operator=(const char* utf8Text) {
    String fresh(utf8Text);  // likewise
    Swap(fresh);
    return *this;
}

String& String::operator=(const std::string& utf8Text) {
    Free();
    if (!utf8Text.empty()) ConvertFromUtf8(utf8Text.c_str(), std::strlen(utf8Text.c_str()));
    return *this;
}

const char* String::GetUtf8() const {
    if (!utf8 && wide) utf8 = MakeNarrow(wide, platform::Utf16ToUtf8);
    return utf8;
}

const char* String::GetAnsi() const {
    if (!ansi && wide) ansi = MakeNarrow(wide, platform::Utf16ToLocale);
    return ansi;
}

String& String::Append(const String& other) {
    FreeCaches();
    if (!other.wide) return *this;
    const std::size_t ownUnits = wide ? Units(wide) : 0;
    const std::size_t otherUnits = Units(other.wide);
    const std::uint32_t otherLength = other.length;
    WideChar* joined = nullptr;
    if (AllocateText(joined, ownUnits + otherUnits)) {
        if (wide) std::copy_n(wide, ownUnits, joined);
        std::copy_n(other.wide, otherUnits, joined + ownUnits);
        joined[ownUnits + otherUnits] = 0;
    }
    delete[] wide;
    wide = joined;
    length = joined ? length + otherLength : 0;  // a failed append loses the text
    return *this;
}

void String::Substring(std::uint32_t start, std::uint32_t count, String& out) const {
    const std::uint32_t left = start < length ? length - start : 0;
    const std::uint32_t units = count == 0 || count > left ? left : count;
    // `length` can exceed the units of text that came from UTF-8; never read past the terminator.
    const std::size_t available = wide ? Units(wide) : 0;
    const std::size_t begin = std::min<std::size_t>(start, available);
    const std::size_t copied = std::min<std::size_t>(units, available - begin);
    String part;
    if (AllocateText(part.wide, copied)) {
        if (copied != 0) std::copy_n(wide + begin, copied, part.wide);
        part.wide[copied] = 0;
        part.length = units;
    }
    out.Swap(part);  // `out` may be this string
}

void String::ToLower() {
    FreeCaches();
    if (!wide) return;
    for (WideChar* unit = wide; *unit; ++unit)
        *unit = static_cast<WideChar>(platform::ToLowerUnit(static_cast<char16_t>(*unit)));
}

int String::Compare(const String& other) const {
    if (!wide) return other.wide ? -1 : 0;
    if (!other.wide) return 1;
    const WideChar* a = wide;
    const WideChar* b = other.wide;
    while (*a && *a == *b) {
        ++a;
        ++b;
    }
    return static_cast<int>(static_cast<char16_t>(*a)) -
           static_cast<int>(static_cast<char16_t>(*b));
}

std::uint32_t String::Find(const String& needle) const {
    if (!wide || !needle.wide) return kNotFound;
    const std::size_t at = View().find(needle.View());
    return at == std::basic_string_view<WideChar>::npos ? kNotFound
                                                        : static_cast<std::uint32_t>(at);
}

std::basic_string_view<WideChar> String::View() const {
    if (!wide) return {};
    return {wide, Units(wide)};
}

void String::Swap(String& other) noexcept {
    std::swap(wide, other.wide);
    std::swap(ansi, other.ansi);
    std::swap(utf8, other.utf8);
    std::swap(length, other.length);
}

// Into a string without a buffer.
void String::CopyOf(const String& other) {
    if (other.wide) CopyUnits(other.wide, Units(other.wide));
    if (wide || !other.wide) length = other.length;
}

void String::Free() {
    FreeCaches();
    delete[] wide;
    wide = nullptr;
    length = 0;
}

void String::FreeCaches() const {
    delete[] ansi;
    delete[] utf8;
    ansi = nullptr;
    utf8 = nullptr;
}

void String::CopyUnits(const WideChar* text, std::size_t units) {
    if (!AllocateText(wide, units)) return;
    std::copy_n(text, units + 1, wide);
    length = static_cast<std::uint32_t>(units);
}

// The length becomes the byte count even where memory ran out and where the text has fewer units:
// it is how the length of narrow text is defined throughout the object model.
void String::ConvertFromUtf8(const char* text, std::size_t bytes) {
    length = static_cast<std::uint32_t>(bytes);
    if (!AllocateText(wide, bytes)) return;
    const std::size_t units = platform::Utf8ToUtf16(text, bytes, AsUtf16(wide), bytes);
    wide[units == platform::kConversionFailed ? 0 : std::min(units, bytes)] = 0;
}

String operator+(const String& a, const String& b) {
    String joined(a);
    if (joined.wide || a.length == 0) joined.Append(b);  // b alone is not the sum
    return joined;
}

bool operator==(const String& a, const char* b) { return a.Compare(String(b)) == 0; }

void ReadTrimmedToken(std::istream& stream, std::string& out) {
    static constexpr const char* kBlanks = " \r\n\t";
    out.clear();
    stream >> out;
    out.erase(out.find_last_not_of(kBlanks) + 1);
    out.erase(0, out.find_first_not_of(kBlanks));
}

void ReadTrimmedToken(std::istream& stream, String& out) {
    std::string token;
    ReadTrimmedToken(stream, token);
    out = token;
}

}  // namespace zelm
