#include "serve/Conditions.h"

#include <algorithm>
#include <limits>

#include "serve/HttpDate.h"

namespace zmcserve {
namespace {

constexpr std::uint64_t kBeyond = std::numeric_limits<std::uint64_t>::max();

enum class Comparison { Strong, Weak };

// Whether a list of entity tags has this one.
bool Lists(std::string_view list, const std::string& etag, Comparison comparison) {
    for (;;) {
        while (!list.empty() && (list[0] == ' ' || list[0] == '\t' || list[0] == ','))
            list.remove_prefix(1);
        if (list.empty()) return false;
        if (list[0] == '*') return true;
        const bool weak = list.substr(0, 2) == "W/";
        if (weak) list.remove_prefix(2);
        const std::size_t end = list.empty() || list[0] != '"' ? list.npos : list.find('"', 1);
        if (end == list.npos) return false;
        const bool same = !etag.empty() && list.substr(0, end + 1) == etag;
        if (same && (!weak || comparison == Comparison::Weak)) return true;
        list.remove_prefix(end + 1);
    }
}

std::optional<std::int64_t> DateOf(const Request& request, std::string_view header) {
    const auto text = request.Header(header);
    return text ? ParseHttpDate(*text) : std::nullopt;
}

bool FailsPrecondition(const Request& request, const Validators& validators) {
    if (const auto match = request.Header("If-Match"))
        return !Lists(*match, validators.etag, Comparison::Strong);
    const auto since = DateOf(request, "If-Unmodified-Since");
    return since && validators.modified && *validators.modified > *since;
}

bool IsKnown(const Request& request, const Validators& validators) {
    if (const auto match = request.Header("If-None-Match"))
        return Lists(*match, validators.etag, Comparison::Weak);
    const auto since = DateOf(request, "If-Modified-Since");
    return since && validators.modified && !validators.etag.empty() &&
           *validators.modified <= *since;
}

// A number of any length; what is beyond all files counts as that.
std::optional<std::uint64_t> Position(std::string_view digits) {
    if (digits.empty() ||
        !std::all_of(digits.begin(), digits.end(), [](char c) { return c >= '0' && c <= '9'; }))
        return std::nullopt;
    const auto number = WholeNumber(digits, kBeyond);
    return number ? *number : kBeyond;
}

enum class Part { Malformed, Outside, Inside };

Part ParsePart(std::string_view text, std::uint64_t size, ByteRange& range) {
    const std::size_t dash = text.find('-');
    if (dash == text.npos) return Part::Malformed;
    const std::string_view first = text.substr(0, dash), last = text.substr(dash + 1);
    const auto begin = Position(first), end = Position(last);
    if (first.empty()) {
        if (!end) return Part::Malformed;
        range.size = std::min(*end, size);
        range.offset = size - range.size;
        return range.size == 0 ? Part::Outside : Part::Inside;
    }
    if (!begin || (!end && !last.empty()) || (end && *end < *begin)) return Part::Malformed;
    if (*begin >= size) return Part::Outside;
    range.offset = *begin;
    range.size = (end ? std::min(*end, size - 1) : size - 1) - *begin + 1;
    return Part::Inside;
}

// If-Range names a strong tag, or the very date, which tells states apart only if the file has not
// changed since in the same second.
bool MayBeContinued(const Request& request, const Validators& validators) {
    const auto condition = request.Header("If-Range");
    if (!condition) return true;
    const std::string_view value = Trimmed(*condition);
    if (value.find('"') != value.npos) return !validators.etag.empty() && value == validators.etag;
    const auto date = ParseHttpDate(value);
    return date && validators.modified && *date == *validators.modified && !validators.etag.empty();
}

}  // namespace

void SetValidators(Answer& answer, const Validators& validators) {
    if (validators.etag.empty()) {
        answer.Set("Cache-Control", "no-store");
        return;
    }
    answer.Set("ETag", validators.etag);
    if (validators.modified) answer.Set("Last-Modified", HttpDateText(*validators.modified));
    answer.Set("Cache-Control", kRevalidate);
}

std::optional<Answer> AnswerOfConditions(const Request& request, const Validators& validators) {
    if (FailsPrecondition(request, validators))
        return TextAnswer(412, "it is not in the state that was asked for");
    if (!IsKnown(request, validators)) return std::nullopt;
    Answer answer;
    answer.status = 304;
    SetValidators(answer, validators);
    return answer;
}

RangeKind ParseRange(std::string_view value, std::uint64_t size, ByteRange& range) {
    value = Trimmed(value);
    const std::size_t equals = value.find('=');
    if (equals == value.npos || !SameWord(value.substr(0, equals), "bytes"))
        return RangeKind::Whole;
    std::size_t parts = 0, inside = 0;
    for (const std::string_view text : Split(value.substr(equals + 1), ',')) {
        if (Trimmed(text).empty()) continue;
        const Part part = ParsePart(Trimmed(text), size, range);
        if (part == Part::Malformed) return RangeKind::Whole;
        ++parts;
        if (part == Part::Inside) ++inside;
    }
    if (parts == 0) return RangeKind::Whole;
    if (inside == 0) return RangeKind::Unsatisfiable;
    return parts == 1 ? RangeKind::Part : RangeKind::Whole;
}

RangeKind RangeOf(const Request& request, const Validators& validators, std::uint64_t size,
                  ByteRange& range) {
    const auto value = request.Header("Range");
    if (!value || request.method != Method::Get || !MayBeContinued(request, validators))
        return RangeKind::Whole;
    return ParseRange(*value, size, range);
}

}  // namespace zmcserve
