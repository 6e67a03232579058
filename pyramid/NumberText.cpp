#include "pyramid/NumberText.h"

#include <limits>
#include <locale>
#include <sstream>

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
    return text.size() > 2 && text[0] == '0' && (text[1] == 'x' || text[1] == 'X') &&
           digits.find(text[2]) != std::string_view::npos;
}

// A decimal whose value no double holds: infinity, or the nearest to nothing.
double ReadOutOfRange(std::string_view text) {
    std::istringstream stream{std::string(text)};
    stream.imbue(std::locale::classic());
    double value = 0;
    stream >> value;
    return value == std::numeric_limits<double>::max() ? std::numeric_limits<double>::infinity()
                                                       : value;
}

double ReadMagnitude(std::string_view text) {
    // The numbers that from_chars reads have a sign of their own.
    if (text.empty() || text[0] == '-') return 0;
    const bool hexadecimal = StartsHexadecimal(text);
    if (hexadecimal) text.remove_prefix(2);
    double value = 0;
    const auto end =
        std::from_chars(text.data(), text.data() + text.size(), value,
                        hexadecimal ? std::chars_format::hex : std::chars_format::general);
    if (end.ec != std::errc::result_out_of_range) return value;
    const auto length = static_cast<std::size_t>(end.ptr - text.data());
    return hexadecimal ? std::numeric_limits<double>::infinity()
                       : ReadOutOfRange(text.substr(0, length));
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
    const double magnitude = ReadMagnitude(text);
    return negative ? -magnitude : magnitude;
}

std::uint32_t ReadInteger(std::string_view text) {
    text = SkipSpace(text);
    const bool negative = TakeSign(text);
    std::uint64_t magnitude = 0;
    const auto end = std::from_chars(text.data(), text.data() + text.size(), magnitude);
    if (end.ec == std::errc::result_out_of_range) magnitude = 0x7fffffffffffffff;
    return static_cast<std::uint32_t>(negative ? 0 - magnitude : magnitude);
}

}  // namespace zelm
