// Formats of log messages: one conversion of any flags, width, precision, length and letter, with
// an argument of its type, into a buffer of any size; numbers beside the C library's narrow printf.
//
// Formats stand in the code and never come from outside, so no format goes without its arguments.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <limits>
#include <memory>
#include <string>
#include <vector>

#include "fuzz/support/Expect.h"
#include "fuzz/support/InputBytes.h"
#include "platform/WideFormat.h"

namespace {

using zmcfuzz::InputBytes;

constexpr std::size_t kFlags = 6;  // that are kept

struct Conversion {
    std::string flags;
    bool widthStar = false, precisionStar = false;
    int width = 0, precision = 0;
    std::string widthText, precisionText, length;
    char letter = 'd';

    std::string Text() const { return "%" + flags + widthText + precisionText + length + letter; }
};

// A width or precision: none, a number, or a star with a number of any sign behind it.
void TakeNumber(InputBytes& input, bool& star, int& number, std::string& text) {
    static constexpr int kNumbers[] = {0, 1, 3, 7, 20, 100, 4094, 4095};
    switch (input.UpTo(3)) {
        case 1:
            number = input.OneOf(kNumbers);
            text += std::to_string(number);
            break;
        case 2:
            star = true;
            number = input.OneOf(kNumbers) * (input.Flag() ? -1 : 1);
            text += "*";
            break;
        default:
            break;
    }
}

Conversion TakeConversion(InputBytes& input) {
    Conversion conversion;
    for (std::uint32_t i = input.UpTo(kFlags); i > 0; --i)
        conversion.flags += "-+ #0"[input.UpTo(4)];
    TakeNumber(input, conversion.widthStar, conversion.width, conversion.widthText);
    if (input.Flag()) {
        conversion.precisionText = ".";
        TakeNumber(input, conversion.precisionStar, conversion.precision, conversion.precisionText);
    }
    return conversion;
}

std::u16string Widened(const std::string& text) { return {text.begin(), text.end()}; }

// Formats into a block of its very size, and with as much of the stars as the format has.
template <class Unit>
class Formatter {
public:
    Formatter(const Conversion& asked, const std::string& front, std::size_t size)
        : conversion(asked), capacity(size), buffer(new Unit[size]) {
        const std::string whole = front + asked.Text() + "|";
        format.assign(whole.begin(), whole.end());
    }

    template <class Argument>
    std::basic_string<Unit> Run(Argument argument) {
        std::size_t units = 0;
        if (conversion.widthStar && conversion.precisionStar)
            units = platform::FormatWide(buffer.get(), capacity, format.c_str(), conversion.width,
                                         conversion.precision, argument);
        else if (conversion.widthStar)
            units = platform::FormatWide(buffer.get(), capacity, format.c_str(), conversion.width,
                                         argument);
        else if (conversion.precisionStar)
            units = platform::FormatWide(buffer.get(), capacity, format.c_str(),
                                         conversion.precision, argument);
        else
            units = platform::FormatWide(buffer.get(), capacity, format.c_str(), argument);
        ZMC_EXPECT(units < capacity && buffer[units] == 0);
        return {buffer.get(), units};
    }

private:
    const Conversion& conversion;
    const std::size_t capacity;
    const std::unique_ptr<Unit[]> buffer;
    std::basic_string<Unit> format;
};

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
template <class Argument>
std::string Narrow(const Conversion& c, const std::string& format, Argument argument) {
    std::vector<char> text(10000);
    int length = 0;
    if (c.widthStar && c.precisionStar)
        length =
            std::snprintf(text.data(), text.size(), format.c_str(), c.width, c.precision, argument);
    else if (c.widthStar)
        length = std::snprintf(text.data(), text.size(), format.c_str(), c.width, argument);
    else if (c.precisionStar)
        length = std::snprintf(text.data(), text.size(), format.c_str(), c.precision, argument);
    else
        length = std::snprintf(text.data(), text.size(), format.c_str(), argument);
    ZMC_EXPECT(length >= 0 && static_cast<std::size_t>(length) < text.size());
    return {text.data(), static_cast<std::size_t>(length)};
}
#pragma GCC diagnostic pop

// `expected` as far as the buffer has room for it; one number takes at most 4095 units.
template <class Unit>
void ExpectCut(const std::basic_string<Unit>& found, const std::u16string& expected,
               std::size_t capacity) {
    const std::u16string cut = expected.substr(0, capacity - 1);
    ZMC_EXPECT(found.size() == cut.size());
    ZMC_EXPECT(std::equal(found.begin(), found.end(), cut.begin(),
                          [](Unit a, char16_t b) { return static_cast<std::uint32_t>(a) == b; }));
}

class Session {
public:
    explicit Session(InputBytes& bytes)
        : input(bytes),
          conversion(TakeConversion(input)),
          front(input.UpTo(5), '.'),
          capacity(input.Flag() ? 9000 : 1 + input.UpTo(60)) {}

    void Run() {
        switch (input.UpTo(5)) {
            case 0:
                return Integers("di", true);
            case 1:
                return Integers("uoxX", false);
            case 2:
                return Reals();
            case 3:
                return Texts();
            case 4:
                return Units();
            default:
                return Pointers();
        }
    }

private:
    void Choose(const char* letters) {
        const auto last = static_cast<std::uint32_t>(std::strlen(letters) - 1);
        conversion.letter = letters[input.UpTo(last)];
    }

    // Both kinds of wide text, beside the narrow one.
    template <class Argument>
    void ExpectLikeNarrow(Argument argument, const std::string& narrowLength) {
        Conversion narrow = conversion;
        narrow.length = narrowLength;
        std::string text = Narrow(conversion, narrow.Text(), argument);
        text.resize(std::min<std::size_t>(text.size(), 4095));
        const std::u16string expected = Widened(front + text + "|");
        ExpectCut(Formatter<wchar_t>(conversion, front, capacity).Run(argument), expected,
                  capacity);
        ExpectCut(Formatter<char16_t>(conversion, front, capacity).Run(argument), expected,
                  capacity);
    }

    void Integers(const char* letters, bool isSigned) {
        static constexpr const char* kLengths[] = {"", "hh", "h", "l", "w", "ll", "j", "z", "t"};
        Choose(letters);
        const std::uint32_t which = input.UpTo(8);
        conversion.length = kLengths[which];
        const std::uint64_t raw =
            std::uint64_t{input.Size()} << (input.Flag() ? 32 : 0) | input.Size();
        const std::string narrow = which == 4 ? "l" : conversion.length;
        if (which < 3)
            isSigned ? ExpectLikeNarrow(static_cast<int>(static_cast<std::uint32_t>(raw)), narrow)
                     : ExpectLikeNarrow(static_cast<unsigned>(raw), narrow);
        else
            isSigned ? ExpectLikeNarrow(static_cast<long>(raw), narrow)
                     : ExpectLikeNarrow(static_cast<unsigned long>(raw), narrow);
    }

    void Reals() {
        static constexpr double kNumbers[] = {0,
                                              -0.0,
                                              1,
                                              -1.5,
                                              1e300,
                                              5e-324,
                                              123456789.125,
                                              std::numeric_limits<double>::infinity(),
                                              -std::numeric_limits<double>::infinity()};
        Choose("aAeEfFgG");
        double number = input.OneOf(kNumbers);
        if (input.Flag()) number *= input.Size();
        if (input.Flag()) {
            conversion.length = "L";
            ExpectLikeNarrow(static_cast<long double>(number), "L");
        } else {
            conversion.length = input.Flag() ? "l" : "";
            ExpectLikeNarrow(number, conversion.length);
        }
    }

    void Pointers() {
        conversion.letter = 'p';
        const auto address = static_cast<std::uintptr_t>(input.Size());
        void* const pointer = reinterpret_cast<void*>(address);
        char text[32];
        static_cast<void>(std::snprintf(text, sizeof text, "%p", pointer));
        ExpectPadded(Widened(text), pointer, pointer);
    }

    bool IsLeft() const {
        return conversion.flags.find('-') != std::string::npos ||
               (conversion.widthStar && conversion.width < 0);
    }

    std::u16string Padded(const std::u16string& text) const {
        const auto width = static_cast<std::size_t>(std::abs(conversion.width));
        const std::u16string padding(width > text.size() ? width - text.size() : 0, u' ');
        const std::u16string item = IsLeft() ? text + padding : padding + text;
        return Widened(front) + item + u"|";
    }

    template <class ForWide, class ForShort>
    void ExpectPadded(const std::u16string& text, ForWide wide, ForShort shorter) {
        ExpectCut(Formatter<wchar_t>(conversion, front, capacity).Run(wide), Padded(text),
                  capacity);
        ExpectCut(Formatter<char16_t>(conversion, front, capacity).Run(shorter), Padded(text),
                  capacity);
    }

    bool IsNarrow() const {
        return conversion.length == "h" || (conversion.length.empty() &&
                                            (conversion.letter == 'S' || conversion.letter == 'C'));
    }

    // A precision cuts a text, which then need not end.
    std::size_t MostUnits() const {
        const bool given = !conversion.precisionText.empty() && conversion.precision >= 0;
        return given ? static_cast<std::size_t>(conversion.precision)
                     : std::numeric_limits<std::size_t>::max();
    }

    void Texts() {
        static constexpr const char* kLengths[] = {"", "h", "l"};
        Choose("sS");
        conversion.length = input.OneOf(kLengths);
        const bool null = input.Byte() % 16 == 15;
        std::string text = null ? "(null)" : input.Bytes(input.UpTo(40)).c_str();
        // Where the precision ends the text, nothing behind it belongs to it.
        const std::size_t most = MostUnits();
        const bool cut = most <= text.size();
        text.resize(std::min(most, text.size()));
        std::vector<char> bytes;
        std::vector<wchar_t> wide;
        std::vector<char16_t> shorter;
        for (std::size_t i = 0; i < text.size() + (cut ? 0 : 1); ++i) {
            bytes.push_back(text.c_str()[i]);
            wide.push_back(static_cast<unsigned char>(bytes.back()));
            shorter.push_back(static_cast<unsigned char>(bytes.back()));
        }
        std::u16string expected(shorter.begin(), shorter.end());
        if (!cut) expected.pop_back();
        const char* const narrow = null ? nullptr : bytes.data();
        if (IsNarrow())
            ExpectPadded(expected, narrow, narrow);
        else
            ExpectPadded(expected, null ? nullptr : wide.data(), null ? nullptr : shorter.data());
    }

    void Units() {
        static constexpr const char* kLengths[] = {"", "h", "l"};
        Choose("cC%n");
        conversion.length = input.OneOf(kLengths);
        const int unit = 1 + static_cast<int>(input.UpTo(254));
        const std::u16string text(1, static_cast<char16_t>(unit));
        if (conversion.letter == '%') {
            ExpectCut(Formatter<char16_t>(conversion, front, capacity).Run(unit),
                      Widened(front + "%|"), capacity);
        } else if (conversion.letter == 'n') {  // takes its argument and does nothing with it
            ExpectCut(Formatter<char16_t>(conversion, front, capacity).Run(&conversion),
                      Widened(front + "|"), capacity);
        } else {
            ExpectPadded(text, unit, unit);
        }
    }

    InputBytes& input;
    Conversion conversion;
    const std::string front;
    const std::size_t capacity;
};

// What is no conversion is text, and takes no argument.
void ExpectText(InputBytes& input) {
    static constexpr const char* kBroken[] = {
        "%",   "%y",   "%-",     "%5",   "%.",
        "%l",  "%5.3", "%llq",   "%+k",  "%\x01",
        "%h!", "%L~",  "%z\x7F", "a%y%", "%0000000000000000b"};
    const std::string text = input.OneOf(kBroken);
    const std::size_t capacity = 1 + input.UpTo(20);
    const std::u16string format = Widened(text);
    const std::unique_ptr<char16_t[]> buffer(new char16_t[capacity]);
    const std::size_t units = platform::FormatWide(buffer.get(), capacity, format.c_str());
    ExpectCut(std::u16string(buffer.get(), units), format, capacity);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    InputBytes input(data, size);
    if (input.UpTo(15) == 15)
        ExpectText(input);
    else
        Session(input).Run();
    return 0;
}
