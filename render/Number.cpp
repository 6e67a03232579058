#include "render/Number.h"

#include <charconv>
#include <cmath>

namespace zmcrender {
namespace {

bool IsDigit(char c) { return c >= '0' && c <= '9'; }

bool AllDigits(std::string_view text) {
    for (const char c : text)
        if (!IsDigit(c)) return false;
    return !text.empty();
}

template <class T>
bool TakeAll(std::string_view text, T& value) {
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    return error == std::errc() && end == text.data() + text.size();
}

}  // namespace

Number::Number(double value) : real(value) {
    if (value != std::trunc(value) || std::fabs(value) >= 0x1p64) return;
    whole = true;
    negative = value < 0;
    magnitude = static_cast<std::uint64_t>(std::fabs(value));
}

std::optional<Number> Number::Parse(std::string_view text) {
    const bool minus = text.starts_with('-');
    if (minus || text.starts_with('+')) text.remove_prefix(1);
    // Words that stand for numbers, and a second sign.
    if (text.empty() || !(IsDigit(text.front()) || text.front() == '.')) return std::nullopt;
    if (std::uint64_t digits = 0; AllDigits(text) && TakeAll(text, digits)) {
        Number number(digits);
        number.negative = minus && digits != 0;
        if (number.negative) number.real = -number.real;
        return number;
    }
    double value = 0;
    if (!TakeAll(text, value) || !std::isfinite(value)) return std::nullopt;
    return Number(minus ? -value : value);
}

std::string Number::Text() const {
    char text[64];
    char* at = text;
    if (whole && negative) *at++ = '-';
    const auto end = whole ? std::to_chars(at, std::end(text), magnitude)
                           : std::to_chars(at, std::end(text), real);
    return {text, end.ptr};
}

}  // namespace zmcrender
