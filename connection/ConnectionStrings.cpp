#include "connection/ConnectionStrings.h"

#include <algorithm>
#include <cstdio>
#include <string_view>

#include "core/PixelVocabulary.h"
#include "platform/ParseNumber.h"
#include "zmcg/zmcg.h"

namespace zelm {
namespace {

using Text = std::basic_string_view<WideChar>;

constexpr WideChar kKeyEnd = '=';
constexpr WideChar kPairEnd = ';';

// Calls read(text) with the narrow form of a value, and answers false where memory is too short for
// one: a number that nobody could look at is not 0. Units outside ASCII become bytes above 127, at
// which every conversion of a number stops.
template <class Read>
bool ReadNarrow(const String& value, Read&& read) {
    const char* const text = value.GetUtf8();
    if (text) read(text);
    return text != nullptr;
}

// Where the value of `key` starts; the first place counts at which "=" follows the key. No text is
// put together for it, since one that memory cuts short would be found elsewhere.
std::size_t FindValue(Text source, Text key) {
    if (key.empty()) return Text::npos;
    for (std::size_t at = 0; (at = source.find(key, at)) != Text::npos; ++at) {
        const std::size_t end = at + key.size();
        if (end < source.size() && source[end] == kKeyEnd) return end + 1;
    }
    return Text::npos;
}

// Calls visit(start, count) for the stretches of `source` that are not empty.
template <class Visit>
void ForEachStretch(Text source, Text delimiter, Visit&& visit) {
    for (std::size_t start = 0; start < source.size();) {
        const std::size_t stop = std::min(source.find(delimiter[0], start), source.size());
        if (stop != start) visit(start, stop - start);
        start = stop + delimiter.size();
    }
}

// Makes room for `count` elements at once: appending them one by one takes time that grows with
// the square of their number. A view takes none.
bool ReserveStrings(Array<String>& out, std::uint32_t count) {
    out.Clear();
    return out.owned && count != 0 && out.SetShape(ArrayShape(count));
}

bool IsSameText(const WideChar* a, const WideChar* b) {
    if (!a || !b) return a == b;
    return Text(a) == Text(b);
}

const FormatRecord* FindFormat(const String& word) {
    for (std::int32_t i = 0; i < gCdfFormatRecordCount; ++i)
        if (IsSameText(word.wide, gCdfFormatRecords[i].name)) return &gCdfFormatRecords[i];
    return nullptr;
}

}  // namespace

bool FindParameterValue(const String& source, const String& key, String& value) {
    value = "";
    if (source.IsEmpty()) return false;
    const Text text = source.View();
    const std::size_t start = FindValue(text, key.View());
    if (start == Text::npos) return false;
    const std::size_t end = std::min(text.find(kPairEnd, start), text.size());
    if (end == start) return false;
    source.Substring(static_cast<std::uint32_t>(start), static_cast<std::uint32_t>(end - start),
                     value);
    return !value.IsEmpty();
}

bool ReadUnsignedParameter(const String& source, const String& key, std::uint32_t& value) {
    String text;
    return FindParameterValue(source, key, text) &&
           ReadNarrow(text, [&](const char* narrow) { value = platform::ParseUnsigned32(narrow); });
}

bool ReadSignedParameter(const String& source, const String& key, std::int32_t& value) {
    String text;
    return FindParameterValue(source, key, text) &&
           ReadNarrow(text, [&](const char* narrow) { value = platform::ParseSigned32(narrow); });
}

bool ReadPixelTypeParameter(const String& source, const String& key, std::uint32_t& code) {
    std::int32_t number = 0;
    if (!ReadSignedParameter(source, key, number)) return false;
    const std::uint32_t checked = CheckedPixelType(static_cast<std::uint32_t>(number));
    if (checked == 0) return false;
    code = checked;
    return true;
}

bool ReadDoublePairParameter(const String& source, const String& key, double& first,
                             double& second) {
    String text;
    if (!FindParameterValue(source, key, text)) return false;
    Array<String> tokens;
    if (!SplitString(text, ",", tokens) || tokens.shape.elements != 2) return false;
    if (tokens.data[0].IsEmpty() || tokens.data[1].IsEmpty()) return false;
    double numbers[2];
    for (int i = 0; i < 2; ++i)
        if (!ReadNarrow(tokens.data[i],
                        [&](const char* narrow) { numbers[i] = platform::ParseReal(narrow); }))
            return false;
    first = numbers[0];
    second = numbers[1];
    return true;
}

bool ReadPointerParameter(const String& source, const String& key, void** pointer) {
    if (!pointer) return false;
    *pointer = nullptr;
    String text;
    return FindParameterValue(source, key, text) && ReadNarrow(text, [&](const char* narrow) {
               void* address = nullptr;
               if (std::sscanf(narrow, "%p", &address) == 1) *pointer = address;
           });
}

bool SplitString(const String& source, const String& delimiter, Array<String>& out) {
    out.Clear();
    if (source.IsEmpty() || delimiter.View().empty()) return false;
    std::uint32_t count = 0;
    ForEachStretch(source.View(), delimiter.View(), [&](std::size_t, std::size_t) { ++count; });
    if (!ReserveStrings(out, count)) return count == 0 || !out.owned;
    // The tokens are cut off a copy in place: Substring measures the whole source for each.
    String cut(source);
    if (!cut.wide) return false;
    std::uint32_t next = 0;
    ForEachStretch(source.View(), delimiter.View(), [&](std::size_t start, std::size_t units) {
        cut.wide[start + units] = 0;
        out.data[next++] = cut.wide + start;
    });
    return true;
}

String ExtractFormatName(const Array<String>& connection) {
    for (std::uint32_t i = 0; i < connection.shape.elements; ++i)
        if (const FormatRecord* record = FindFormat(connection.data[i])) return record->name;
    return "";
}

bool ExtractConnectionParameters(const Array<String>& connection, Array<String>& out) {
    std::uint32_t count = 0;
    for (std::uint32_t i = 0; i < connection.shape.elements; ++i)
        if (!FindFormat(connection.data[i])) ++count;
    if (!ReserveStrings(out, count)) return true;
    std::uint32_t next = 0;
    for (std::uint32_t i = 0; i < connection.shape.elements; ++i)
        // NOLINTNEXTLINE(clang-analyzer-core.CallAndMessage): there is room for as many.
        if (!FindFormat(connection.data[i])) out.data[next++] = connection.data[i];
    return true;
}

void SplitConnection(const Array<String>& connection, String& kind, Array<String>& parameters) {
    kind = ExtractFormatName(connection);
    ExtractConnectionParameters(connection, parameters);
}

}  // namespace zelm
