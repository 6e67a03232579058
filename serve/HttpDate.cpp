#include "serve/HttpDate.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <iterator>

#include "serve/Request.h"

namespace zmcserve {
namespace {

using std::chrono::sys_days;
using std::chrono::year_month_day;

constexpr const char* kDays[] = {"Sun", "Mon", "Tue", "Wed", "Thu", "Fri", "Sat"};
constexpr const char* kMonths[] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                   "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};

struct Parts {
    std::string_view day, month, year, time;
};

std::optional<Parts> PartsOf(std::string_view text) {
    std::vector<std::string_view> words;
    for (const std::string_view word : Split(text, ' '))
        if (!word.empty()) words.push_back(word);
    if (words.size() == 6 && words[5] == "GMT")
        return Parts{words[1], words[2], words[3], words[4]};
    if (words.size() == 5) return Parts{words[2], words[1], words[4], words[3]};
    if (words.size() != 4 || words[3] != "GMT") return std::nullopt;
    const auto date = Split(words[1], '-');
    if (date.size() != 3) return std::nullopt;
    return Parts{date[0], date[1], date[2], words[2]};
}

std::optional<unsigned> MonthOf(std::string_view name) {
    const auto at = std::find(std::begin(kMonths), std::end(kMonths), name);
    if (at == std::end(kMonths)) return std::nullopt;
    return static_cast<unsigned>(at - std::begin(kMonths)) + 1;
}

// Of two digits, those that are nearest to the end of the century before and of this one.
std::optional<int> YearOf(std::string_view text) {
    const auto number = WholeNumber(text, 9999);
    if (!number || (text.size() != 4 && text.size() != 2)) return std::nullopt;
    const int year = static_cast<int>(*number);
    return text.size() == 4 ? year : year + (year < 70 ? 2000 : 1900);
}

std::optional<std::int64_t> SecondsOf(std::string_view time) {
    const auto parts = Split(time, ':');
    if (parts.size() != 3) return std::nullopt;
    const auto hours = WholeNumber(parts[0], 23), minutes = WholeNumber(parts[1], 59),
               seconds = WholeNumber(parts[2], 60);
    if (!hours || !minutes || !seconds) return std::nullopt;
    return static_cast<std::int64_t>((*hours * 60 + *minutes) * 60 + *seconds);
}

}  // namespace

std::string HttpDateText(std::int64_t seconds) {
    const std::chrono::sys_seconds at{std::chrono::seconds(seconds)};
    const sys_days day = std::chrono::floor<std::chrono::days>(at);
    const year_month_day date(day);
    const std::chrono::hh_mm_ss time(at - day);
    char text[64];
    static_cast<void>(std::snprintf(
        text, sizeof text, "%s, %02u %s %04d %02d:%02d:%02d GMT",
        kDays[std::chrono::weekday(day).c_encoding()], static_cast<unsigned>(date.day()),
        kMonths[static_cast<unsigned>(date.month()) - 1], static_cast<int>(date.year()),
        static_cast<int>(time.hours().count()), static_cast<int>(time.minutes().count()),
        static_cast<int>(time.seconds().count())));
    return text;
}

std::optional<std::int64_t> ParseHttpDate(std::string_view text) {
    const auto parts = PartsOf(text);
    if (!parts) return std::nullopt;
    const auto day = WholeNumber(parts->day, 31);
    const auto month = MonthOf(parts->month);
    const auto year = YearOf(parts->year);
    const auto seconds = SecondsOf(parts->time);
    if (!day || !month || !year || !seconds) return std::nullopt;
    const year_month_day date{std::chrono::year(*year), std::chrono::month(*month),
                              std::chrono::day(static_cast<unsigned>(*day))};
    if (!date.ok()) return std::nullopt;
    return sys_days(date).time_since_epoch().count() * std::int64_t{86400} + *seconds;
}

}  // namespace zmcserve
