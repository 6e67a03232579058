#include "tools/Arguments.h"

#include <cctype>
#include <cerrno>
#include <charconv>
#include <cmath>
#include <cstdlib>
#include <sstream>
#include <string_view>

#include "host/base/ScaledNumber.h"
#include "host/base/Threads.h"
#include "tools/Message.h"

namespace zmctools {
namespace {

std::vector<std::string> SplitAtCommas(const std::string& text) {
    std::vector<std::string> parts;
    std::size_t start = 0;
    for (std::size_t comma = text.find(','); comma != text.npos; comma = text.find(',', start)) {
        parts.push_back(text.substr(start, comma - start));
        start = comma + 1;
    }
    parts.push_back(text.substr(start));
    return parts;
}

std::optional<std::uint64_t> WholeNumber(const std::string& text) {
    std::uint64_t value = 0;
    const char* const end = text.data() + text.size();
    const auto parsed = std::from_chars(text.data(), end, value);
    if (parsed.ec != std::errc() || parsed.ptr != end) return std::nullopt;
    return value;
}

}  // namespace

std::uint64_t ParseCount(const std::string& option, const std::string& text, std::uint64_t limit) {
    const auto value = WholeNumber(text);
    if (!value) throw UsageError(option, "\"" + text + "\" is no whole number");
    if (*value > limit) throw UsageError(option, text + " is more than " + std::to_string(limit));
    return *value;
}

double ParseNumber(const std::string& option, const std::string& text) {
    char* end = nullptr;
    errno = 0;
    const double value = std::strtod(text.c_str(), &end);
    const bool blank = text.empty() || std::isspace(static_cast<unsigned char>(text[0])) != 0;
    if (blank || *end != '\0') throw UsageError(option, "\"" + text + "\" is no number");
    // What has lost digits only is the nearest there is.
    if (errno == ERANGE && (std::isinf(value) || value == 0))
        throw UsageError(option, text + " is beyond the numbers of 64 bits");
    return value;
}

std::uint64_t ParseSize(const std::string& option, const std::string& text) {
    std::string digits = text;
    if (!digits.empty() && (digits.back() == 'B' || digits.back() == 'b')) digits.pop_back();
    const bool binary = digits.size() > 1 && digits.back() == 'i';
    if (binary) digits.pop_back();
    constexpr std::string_view kUnits = "KMGkmg";
    const auto value = zmchost::ParseScaled(digits, kUnits);
    if (!value || (binary && kUnits.find(digits.back()) == kUnits.npos))
        throw UsageError(option, "\"" + text + "\" is no size: give bytes, or 512K, 256M, 2G");
    return *value;
}

std::uint32_t ParseThreads(const std::string& text) {
    return static_cast<std::uint32_t>(ParseCount("--threads", text, zmchost::kMaxThreads));
}

std::vector<std::uint32_t> ParseBands(const std::string& text, std::uint32_t bands) {
    std::vector<std::uint32_t> list;
    if (text.empty()) {
        for (std::uint32_t band = 0; band < bands; ++band) list.push_back(band);
        return list;
    }
    for (const std::string& part : SplitAtCommas(text)) {
        const auto number = WholeNumber(part);
        if (!number) throw UsageError("--bands", "\"" + text + "\" is no list such as 3,2,1");
        if (*number < 1 || *number > bands)
            throw UsageError("--bands", "there is no band " + part + ": the raster has the bands " +
                                            "1 to " + std::to_string(bands));
        list.push_back(static_cast<std::uint32_t>(*number - 1));
    }
    return list;
}

zmchost::Window ParseWindow(const std::string& text, std::uint32_t width, std::uint32_t height,
                            const std::string& option) {
    if (text.empty()) return {0, 0, width, height};
    std::vector<std::uint64_t> numbers;
    for (const std::string& part : SplitAtCommas(text))
        if (const auto number = WholeNumber(part)) numbers.push_back(*number);
    if (numbers.size() != 4 || SplitAtCommas(text).size() != 4)
        throw UsageError(option, "\"" + text + "\" is not X,Y,WIDTH,HEIGHT");
    const bool fits = numbers[2] > 0 && numbers[3] > 0 && numbers[0] < width &&
                      numbers[1] < height && numbers[2] <= width - numbers[0] &&
                      numbers[3] <= height - numbers[1];
    if (!fits)
        throw UsageError(option, text + " is not inside the level, which has " +
                                     std::to_string(width) + " x " + std::to_string(height) +
                                     " pixels");
    return {static_cast<std::uint32_t>(numbers[0]), static_cast<std::uint32_t>(numbers[1]),
            static_cast<std::uint32_t>(numbers[2]), static_cast<std::uint32_t>(numbers[3])};
}

}  // namespace zmctools
