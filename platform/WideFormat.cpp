#include "platform/WideFormat.h"

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <type_traits>

namespace platform {
namespace {

constexpr int kLongestNumber = 4095;

enum class Length { None, Char, Short, Long, LongLong, Max, Size, Difference, LongDouble };

struct Conversion {
    char flags[8] = {};
    bool left = false;
    int width = 0;
    int precision = -1;  // -1: none given
    Length length = Length::None;
    char conversion = '\0';
};

// A va_list that can be passed on by reference, whatever the platform makes of the type.
struct Arguments {
    std::va_list list;
};

template <class Unit>
class Output {
public:
    Output(Unit* buffer, std::size_t capacity) : begin(buffer), next(buffer), room(capacity - 1) {}

    bool Full() const { return room == 0; }

    void Put(Unit unit) {
        if (room == 0) return;
        *next++ = unit;
        --room;
    }

    void Fill(std::size_t count) {
        for (count = std::min(count, room); count != 0; --count) Put(Unit{' '});
    }

    template <class Source>
    void PutText(const Source* text, const Conversion& item) {
        constexpr Source nullText[] = {'(', 'n', 'u', 'l', 'l', ')', 0};
        if (!text) text = nullText;
        std::size_t count = 0;
        while ((item.precision < 0 || count < static_cast<std::size_t>(item.precision)) &&
               text[count] != 0)
            ++count;
        const auto width = static_cast<std::size_t>(item.width);
        const std::size_t padding = width > count ? width - count : 0;
        if (!item.left) Fill(padding);
        for (std::size_t i = 0; i < count && room != 0; ++i) Put(Widen(text[i]));
        if (item.left) Fill(padding);
    }

    std::size_t Finish() {
        *next = 0;
        return static_cast<std::size_t>(next - begin);
    }

private:
    static Unit Widen(Unit unit) { return unit; }
    static Unit Widen(char byte) { return static_cast<Unit>(static_cast<unsigned char>(byte)); }

    Unit* begin;
    Unit* next;
    std::size_t room;
};

template <class Unit>
int ParseNumber(const Unit*& at) {
    int number = 0;
    for (; *at >= Unit{'0'} && *at <= Unit{'9'}; ++at)
        number = std::min(kLongestNumber, number * 10 + static_cast<int>(*at - Unit{'0'}));
    return number;
}

// A number of the format, or the next argument where the format has a star.
template <class Unit>
int ParseNumberOrStar(const Unit*& at, Arguments& arguments) {
    if (*at != Unit{'*'}) return ParseNumber(at);
    ++at;
    return std::clamp(va_arg(arguments.list, int), -kLongestNumber, kLongestNumber);
}

template <class Unit>
void ParseFlags(const Unit*& at, Conversion& item) {
    std::size_t count = 0;
    for (; *at == Unit{'-'} || *at == Unit{'+'} || *at == Unit{' '} || *at == Unit{'#'} ||
           *at == Unit{'0'};
         ++at) {
        if (*at == Unit{'-'}) item.left = true;
        if (count < sizeof item.flags - 2) item.flags[count++] = static_cast<char>(*at);
    }
}

// Takes the letter if it stands there.
template <class Unit>
bool Take(const Unit*& at, char letter) {
    if (*at != static_cast<Unit>(letter)) return false;
    ++at;
    return true;
}

template <class Unit>
Length ParseLength(const Unit*& at) {
    if (Take(at, 'h')) return Take(at, 'h') ? Length::Char : Length::Short;
    if (Take(at, 'l')) return Take(at, 'l') ? Length::LongLong : Length::Long;
    if (Take(at, 'w')) return Length::Long;
    if (Take(at, 'j')) return Length::Max;
    if (Take(at, 'z')) return Length::Size;
    if (Take(at, 't')) return Length::Difference;
    if (Take(at, 'L')) return Length::LongDouble;
    return Length::None;
}

template <class Unit>
Conversion ParseConversion(const Unit*& at, Arguments& arguments) {
    Conversion item;
    ParseFlags(at, item);
    item.width = ParseNumberOrStar(at, arguments);
    if (item.width < 0) {  // a negative star stands for the flag '-' and the width without sign
        item.width = -item.width;
        item.left = true;
    }
    if (Take(at, '.')) item.precision = ParseNumberOrStar(at, arguments);
    item.length = ParseLength(at);
    if (*at > 0 && *at < 0x80) item.conversion = static_cast<char>(*at++);
    return item;
}

std::intmax_t NextSigned(Length length, Arguments& arguments) {
    switch (length) {
        case Length::Char:
            return static_cast<signed char>(va_arg(arguments.list, int));
        case Length::Short:
            return static_cast<short>(va_arg(arguments.list, int));
        case Length::Long:
            return va_arg(arguments.list, long);
        case Length::LongLong:
            return va_arg(arguments.list, long long);
        // NOLINTNEXTLINE(bugprone-branch-clone): the types differ.
        case Length::Max:
            return va_arg(arguments.list, std::intmax_t);
        case Length::Size:
        case Length::Difference:
            return va_arg(arguments.list, std::ptrdiff_t);
        default:
            return va_arg(arguments.list, int);
    }
}

std::uintmax_t NextUnsigned(Length length, Arguments& arguments) {
    switch (length) {
        case Length::Char:
            return static_cast<unsigned char>(va_arg(arguments.list, unsigned));
        case Length::Short:
            return static_cast<unsigned short>(va_arg(arguments.list, unsigned));
        case Length::Long:
            return va_arg(arguments.list, unsigned long);
        case Length::LongLong:
            return va_arg(arguments.list, unsigned long long);
        // NOLINTNEXTLINE(bugprone-branch-clone): the types differ.
        case Length::Max:
            return va_arg(arguments.list, std::uintmax_t);
        case Length::Size:
        case Length::Difference:
            return va_arg(arguments.list, std::size_t);
        default:
            return va_arg(arguments.list, unsigned);
    }
}

// The format of one number is put together here, so the compiler cannot check it against its
// argument; the callers below pair them.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
template <class Unit, class Number>
void PutNumber(Output<Unit>& out, const Conversion& item, const char* length, Number number) {
    char format[32];
    static_cast<void>(std::snprintf(format, sizeof format, "%%%s%s*.*%s%c", item.flags,
                                    item.left ? "-" : "", length, item.conversion));
    char digits[kLongestNumber + 1];
    // unreachable: widths and precisions are bounded, and digits need no encoding
    if (std::snprintf(digits, sizeof digits, format, item.width, item.precision, number) < 0)
        return;  // unreachable: as above
    out.PutText(static_cast<const char*>(digits), Conversion{});
}

template <class Unit>
void PutPointer(Output<Unit>& out, const Conversion& item, const void* pointer) {
    char digits[32];
    static_cast<void>(std::snprintf(digits, sizeof digits, "%p", pointer));
    Conversion text = item;
    text.precision = -1;
    out.PutText(static_cast<const char*>(digits), text);
}
#pragma GCC diagnostic pop

template <class Unit>
void PutString(Output<Unit>& out, const Conversion& item, bool narrow, Arguments& arguments) {
    // NOLINTNEXTLINE(bugprone-branch-clone): the types differ.
    if (narrow)
        out.PutText(va_arg(arguments.list, const char*), item);
    else
        out.PutText(va_arg(arguments.list, const Unit*), item);
}

template <class Unit>
void PutUnit(Output<Unit>& out, Conversion item, bool narrow, Arguments& arguments) {
    const unsigned value = va_arg(arguments.list, unsigned);
    if (item.width > 1 && !item.left) out.Fill(static_cast<std::size_t>(item.width - 1));
    out.Put(narrow ? static_cast<Unit>(static_cast<unsigned char>(value))
                   : static_cast<Unit>(value));
    if (item.width > 1 && item.left) out.Fill(static_cast<std::size_t>(item.width - 1));
}

template <class Unit>
void PutReal(Output<Unit>& out, const Conversion& item, Arguments& arguments) {
    if (item.length == Length::LongDouble)
        PutNumber(out, item, "L", va_arg(arguments.list, long double));
    else
        PutNumber(out, item, "", va_arg(arguments.list, double));
}

// False for a conversion that does not exist.
template <class Unit>
bool PutConversion(Output<Unit>& out, const Conversion& item, Arguments& arguments) {
    const bool narrow = item.length == Length::Short;
    switch (item.conversion) {
        case 's':
            PutString(out, item, narrow, arguments);
            return true;
        case 'S':
            PutString(out, item, item.length != Length::Long, arguments);
            return true;
        case 'c':
            PutUnit(out, item, narrow, arguments);
            return true;
        case 'C':
            PutUnit(out, item, item.length != Length::Long, arguments);
            return true;
        case 'd':
        case 'i':
            PutNumber(out, item, "j", NextSigned(item.length, arguments));
            return true;
        case 'u':
        case 'o':
        case 'x':
        case 'X':
            PutNumber(out, item, "j", NextUnsigned(item.length, arguments));
            return true;
        case 'a':
        case 'A':
        case 'e':
        case 'E':
        case 'f':
        case 'F':
        case 'g':
        case 'G':
            PutReal(out, item, arguments);
            return true;
        case 'p':
            PutPointer(out, item, va_arg(arguments.list, const void*));
            return true;
        case 'n':
            static_cast<void>(va_arg(arguments.list, void*));
            return true;
        case '%':
            out.Put(Unit{'%'});
            return true;
        default:
            return false;
    }
}

template <class Unit>
std::size_t Format(Unit* buffer, std::size_t capacity, const Unit* format, Arguments& arguments) {
    Output<Unit> out(buffer, capacity);
    while (*format != 0 && !out.Full()) {
        const Unit* const start = format;
        if (*format++ != Unit{'%'}) {
            out.Put(*start);
            continue;
        }
        const Conversion item = ParseConversion(format, arguments);
        if (PutConversion(out, item, arguments)) continue;
        for (const Unit* at = start; at != format; ++at) out.Put(*at);
    }
    return out.Finish();
}

template <class Unit>
std::size_t FormatCopied(Unit* buffer, std::size_t capacity, const Unit* format,
                         std::va_list arguments) {
    Arguments copy;
    va_copy(copy.list, arguments);
    const std::size_t units = Format(buffer, capacity, format, copy);
    va_end(copy.list);
    return units;
}

}  // namespace

std::size_t FormatWideV(wchar_t* buffer, std::size_t capacity, const wchar_t* format,
                        std::va_list arguments) {
    return FormatCopied(buffer, capacity, format, arguments);
}

std::size_t FormatWideV(char16_t* buffer, std::size_t capacity, const char16_t* format,
                        std::va_list arguments) {
    return FormatCopied(buffer, capacity, format, arguments);
}

// NOLINTNEXTLINE(cert-dcl50-cpp): printf by another name.
std::size_t FormatWide(wchar_t* buffer, std::size_t capacity, const wchar_t* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    const std::size_t units = FormatWideV(buffer, capacity, format, arguments);
    va_end(arguments);
    return units;
}

// NOLINTNEXTLINE(cert-dcl50-cpp): likewise.
std::size_t FormatWide(char16_t* buffer, std::size_t capacity, const char16_t* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    const std::size_t units = FormatWideV(buffer, capacity, format, arguments);
    va_end(arguments);
    return units;
}

}  // namespace platform
