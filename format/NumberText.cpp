#include "format/NumberText.h"

#include <limits>

#include "platform/ParseNumber.h"

namespace zelm {
namespace {

std::string_view SkipSpace(std::string_view text) {
    const std::size_t start = text.find_first_not_of(" \t\n\v\f\r");
    return start == std::string_view::npos ? std::string_view() : text.substr(start);
}

// Takes the sign off the front.
bool TakeSign(std::string_view& text) {
    if (text.empty() || (text[0] != '-' && text[0] != '+')) return false;
    const bool negative = text[0] == '-';
    text.remove_prefix(1);
    return negative;
}

bool StartsHexadecimal(std::string_view text) {
    constexpr std::string_view digits = "0123456789abcdefABCDEF";
    if (text.size() < 3 || text[0] != '0' || (text[1] != 'x' && text[1] != 'X')) return false;
    const std::size_t first = text[2] == '.' ? 3 : 2;
    return first < text.size() && digits.find(text[first]) != std::string_view::npos;
}

// The whole number at the front, which ends at those of 64 bits.
std::int64_t ReadWhole(std::string_view text) {
    const bool negative = TakeSign(text);
    constexpr std::uint64_t most = std::numeric_limits<std::int64_t>::max();
    std::uint64_t magnitude = 0;
    const auto end = std::from_chars(text.data(), text.data() + text.size(), magnitude);
    if (end.ec == std::errc::result_out_of_range || magnitude > most)
        return negative ? std::numeric_limits<std::int64_t>::min()
                        : std::numeric_limits<std::int64_t>::max();
    return negative ? -static_cast<std::int64_t>(magnitude) : static_cast<std::int64_t>(magnitude);
}

// from_chars would take a second sign in a binary exponent: half of "0x2p+-1", which is 2.
double ReadHexadecimal(std::string_view text) {
    return platform::ParseReal(
        std::string(text.substr(0, text.find_first_not_of("0123456789abcdefABCDEFxXpP+-.")))
            .c_str());
}

// False if the text does not begin with a number.
bool ReadMagnitude(std::string_view text, double& value) {
    // The numbers that from_chars reads have a sign of their own.
    if (text.empty() || text[0] == '-') return false;
    if (StartsHexadecimal(text)) {
        value = ReadHexadecimal(text);
        return true;
    }
    const auto end = std::from_chars(text.data(), text.data() + text.size(), value);
    if (end.ec == std::errc::result_out_of_range)
        // Infinity, or the nearest to nothing, which from_chars does not tell.
        value = platform::ParseReal(std::string(text.data(), end.ptr).c_str());
    return end.ec != std::errc::invalid_argument;
}

// A whole number that 32 bits hold, as channels and counts are, without the cost of reading a real;
// false for any other. What makes it another number behind its digits is looked for.
bool ReadShortWhole(std::string_view text, double& value) {
    constexpr std::size_t most = std::numeric_limits<std::uint32_t>::digits10;
    std::uint32_t whole = 0;
    std::size_t digits = 0;
    for (; digits < text.size() && text[digits] >= '0' && text[digits] <= '9'; ++digits) {
        if (digits == most) return false;
        whole = whole * 10 + static_cast<std::uint32_t>(text[digits] - '0');
    }
    constexpr std::string_view further = ".eExX";
    if (digits == 0 || (digits < text.size() && further.find(text[digits]) != further.npos))
        return false;
    value = whole;
    return true;
}

}  // namespace

std::string FormatReal(double value, int digits) {
    char text[48];
    const auto end =
        std::to_chars(text, text + sizeof text, value, std::chars_format::general, digits);
    return std::string(text, end.ptr);
}

double ReadReal(std::string_view text) {
    text = SkipSpace(text);
    const bool negative = TakeSign(text);
    double magnitude = 0;
    // What is no number is no negative zero either.
    if (!ReadShortWhole(text, magnitude) && !ReadMagnitude(text, magnitude)) return 0;
    return negative ? -magnitude : magnitude;
}

std::uint32_t ReadInteger(std::string_view text) {
    return static_cast<std::uint32_t>(ReadWhole(SkipSpace(text)));
}

}  // namespace zelm
