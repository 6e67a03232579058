// String: texts of any bytes and any 16-bit units through every operation, step by step beside a
// model that keeps a plain std::u16string.
//
// The first byte of an input chooses the locale; after it come steps, each a byte for what to do
// and whatever that needs. Three strings take part, so that texts are appended to themselves, found
// in each other and assigned across.
#include <algorithm>
#include <clocale>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <sstream>
#include <string>
#include <utility>

#include "core/String.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/InputBytes.h"
#include "fuzz/support/TextModel.h"
#include "platform/TextConversion.h"

namespace {

using zelm::String;
using zmcfuzz::InputBytes;

// What a String is to hold.
struct Model {
    bool null = true;
    std::u16string text;
    std::uint32_t length = 0;
};

Model OfWide(const std::u16string& text) {
    // cppcheck-suppress stlcstrConstructor ; it ends at the first zero
    const std::u16string cut(text.c_str());
    return {false, cut, static_cast<std::uint32_t>(cut.size())};
}

Model OfNarrow(const char* text) {
    return {false, zmcfuzz::Utf16Of(text), static_cast<std::uint32_t>(std::strlen(text))};
}

std::u16string Units(InputBytes& input) {
    std::u16string units(input.UpTo(63), u'\0');
    for (char16_t& unit : units) {
        const std::uint8_t low = input.Byte();
        // Mostly ASCII, so that texts meet; and surrogates, so that pairs come about and break.
        const std::uint8_t kind = input.Byte();
        unit = static_cast<char16_t>(kind < 128   ? low & 0x7F
                                     : kind < 192 ? 0xD800 + (low << 3 | (kind & 7))
                                                  : (kind & 0x3F) << 10 | low << 2 | (low & 3));
    }
    return units;
}

bool localeIsUtf8 = false;

void ChooseLocale(bool utf8) {
    if (utf8 == localeIsUtf8) return;
    // NOLINTNEXTLINE(concurrency-mt-unsafe): this program has one thread.
    localeIsUtf8 = std::setlocale(LC_CTYPE, utf8 ? "C.UTF-8" : "C") && utf8;
}

std::string InLocale(const std::u16string& text) {
    return localeIsUtf8 ? zmcfuzz::Utf8Of(text) : zmcfuzz::AsciiOf(text);
}

// A conversion into every room from none to what it needs: it tells its size, and stays inside.
template <class From, class To>
void ExpectFits(std::size_t (*convert)(const From*, std::size_t, To*, std::size_t),
                std::basic_string_view<From> text, const std::basic_string<To>& expected,
                std::size_t room) {
    ZMC_EXPECT(convert(text.data(), text.size(), nullptr, 0) == expected.size());
    const std::unique_ptr<To[]> out(new To[room]());
    ZMC_EXPECT(convert(text.data(), text.size(), out.get(), room) == expected.size());
    if (room >= expected.size())
        ZMC_EXPECT(std::equal(expected.begin(), expected.end(), out.get()));
}

class Session {
public:
    explicit Session(InputBytes& bytes) : input(bytes) {}

    void Run() {
        for (int steps = 0; steps < 64 && !input.AtEnd(); ++steps) {
            Step();
            for (int i = 0; i < kStrings; ++i) ExpectSame(strings[i], models[i]);
        }
        for (int i = 0; i < kStrings; ++i) ExpectNarrowForms(strings[i], models[i]);
    }

private:
    static constexpr int kStrings = 3;

    static void ExpectSame(const String& string, const Model& model) {
        ZMC_EXPECT((string.wide == nullptr) == model.null);
        ZMC_EXPECT(string.length == model.length);
        ZMC_EXPECT(string.View() == std::u16string_view(model.text));
        ZMC_EXPECT(string.IsEmpty() == (model.length == 0));
    }

    static void ExpectNarrowForms(const String& string, const Model& model) {
        const char* const utf8 = string.GetUtf8();
        const char* const ansi = string.GetAnsi();
        ZMC_EXPECT((utf8 == nullptr) == model.null && (ansi == nullptr) == model.null);
        if (model.null) return;
        ZMC_EXPECT(utf8 == zmcfuzz::Utf8Of(model.text));
        ZMC_EXPECT(ansi == InLocale(model.text));
        ZMC_EXPECT(string.GetUtf8() == utf8 && string.GetAnsi() == ansi);
        // What is well-formed comes back, and what is not comes back as its replacement.
        const String again(utf8);
        ZMC_EXPECT(again.View() == std::u16string_view(zmcfuzz::Utf16Of(utf8)));
        ZMC_EXPECT((string == utf8) == (model.text == zmcfuzz::Utf16Of(utf8)));
    }

    int Any() { return static_cast<int>(input.UpTo(kStrings - 1)); }

    void Set(int i, const Model& model) { models[i] = model; }

    void Step() {
        const int i = Any();
        switch (input.UpTo(19)) {
            case 0:
                return AssignUtf8(i);
            case 1:
                return AssignWide(i);
            case 2:
                return AssignStandard(i);
            case 3:
                return AssignString(i, Any());
            case 4:
                return Construct(i);
            case 5:
                return AssignNull(i);
            case 6:
                return AssignOwnText(i);
            case 7:
            case 8:
                return Append(i, Any());
            case 9:
                return Add(i, Any());
            case 10:
            case 11:
                return Substring(i, Any());
            case 12:
                return ToLower(i);
            case 13:
                return Compare(i, Any());
            case 14:
                return CompareUtf8(i);
            case 15:
            case 16:
                return Find(i, Any());
            case 17:
                return ReadTokens(i);
            case 18:
                return ExpectNarrowForms(strings[i], models[i]);
            default:
                return Convert();
        }
    }

    void AssignUtf8(int i) {
        const std::string bytes = input.Text();
        strings[i] = bytes.c_str();
        Set(i, OfNarrow(bytes.c_str()));
    }

    void AssignWide(int i) {
        const std::u16string units = Units(input);
        strings[i] = units.c_str();
        Set(i, OfWide(units));
    }

    void AssignStandard(int i) {
        const std::string bytes = input.Text();
        strings[i] = bytes;
        Set(i, bytes.empty() ? Model() : OfNarrow(bytes.c_str()));
    }

    // A string that is assigned to itself is null from then on.
    void AssignString(int i, int j) {
        String& target = strings[i];
        target = strings[j];
        Set(i, i == j ? Model() : models[j]);
    }

    void Construct(int i) {
        if (input.Flag()) {
            const std::string bytes = input.Text();
            Replace(i, String(bytes.c_str()));
            Set(i, OfNarrow(bytes.c_str()));
        } else {
            const std::u16string units = Units(input);
            Replace(i, String(units.c_str()));
            Set(i, OfWide(units));
        }
        const String copy(strings[i]);
        ExpectSame(copy, models[i]);
        ZMC_EXPECT(!copy.ansi && !copy.utf8);
    }

    void Replace(int i, const String& fresh) { strings[i] = fresh; }

    void AssignNull(int i) {
        switch (input.UpTo(4)) {
            case 0:
                strings[i] = static_cast<const char*>(nullptr);
                break;
            case 1:
                strings[i] = static_cast<const zelm::WideChar*>(nullptr);
                break;
            case 2:
                strings[i] = String(static_cast<const char*>(nullptr));
                break;
            case 3:
                strings[i] = String(static_cast<const zelm::WideChar*>(nullptr));
                break;
            default:
                strings[i] = std::string();
                break;
        }
        Set(i, Model());
    }

    // Text that points into the very string that it is assigned to.
    void AssignOwnText(int i) {
        if (models[i].null) return;
        if (input.Flag()) {
            const std::size_t start = input.UpTo(255) % (models[i].text.size() + 1);
            strings[i] = strings[i].wide + start;
            Set(i, OfWide(models[i].text.substr(start)));
        } else {
            const std::string utf8 = strings[i].GetUtf8();
            strings[i] = strings[i].GetUtf8();
            Set(i, OfNarrow(utf8.c_str()));
        }
    }

    static Model Sum(const Model& a, const Model& b) {
        if (b.null) return a;
        return {false, a.text + b.text, a.length + b.length};
    }

    bool Fits(int i, int j) const {
        return models[i].text.size() + models[j].text.size() < kLongestText;
    }

    void Append(int i, int j) {
        if (!Fits(i, j)) return;
        strings[i].GetUtf8();
        const String& result =
            input.Flag() ? strings[i].Append(strings[j]) : strings[i] += strings[j];
        ZMC_EXPECT(&result == &strings[i] && !result.utf8 && !result.ansi);
        Set(i, Sum(models[i], models[j]));
    }

    void Add(int i, int j) {
        if (!Fits(i, j)) return;
        ExpectSame(strings[i] + strings[j], Sum(models[i], models[j]));
    }

    void Substring(int i, int j) {
        const Model whole = models[i];
        const auto units = static_cast<std::uint32_t>(whole.text.size());
        const std::uint32_t start = input.UpTo(255) % (units + 3);
        const std::uint32_t count = input.Flag() ? input.Size() : input.UpTo(80);
        strings[i].Substring(start, count, strings[j]);
        const std::uint32_t left = start < whole.length ? whole.length - start : 0;
        const std::uint32_t length = count == 0 ? left : std::min(count, left);
        Set(j, {false, whole.text.substr(std::min(start, units), length), length});
    }

    void ToLower(int i) {
        Model& model = models[i];
        const std::u16string before = model.text;
        strings[i].GetAnsi();
        strings[i].ToLower();
        ZMC_EXPECT(!strings[i].ansi && !strings[i].utf8);
        model.text = std::u16string(strings[i].View());
        ZMC_EXPECT(model.text.size() == before.size());
        for (std::size_t at = 0; at < before.size(); ++at) {
            const char16_t unit = before[at];
            const char16_t lower = model.text[at];
            if (unit < 0x80) ZMC_EXPECT(lower == (unit >= u'A' && unit <= u'Z' ? unit + 32 : unit));
            if (zmcfuzz::IsSurrogate(unit)) ZMC_EXPECT(lower == unit);
            ZMC_EXPECT(lower != 0 && platform::ToLowerUnit(lower) == lower);
        }
    }

    static int Difference(const Model& a, const Model& b) {
        if (a.null || b.null) return (a.null ? 0 : 1) - (b.null ? 0 : 1);
        for (std::size_t at = 0;; ++at) {
            const int left = at < a.text.size() ? a.text[at] : 0;
            const int right = at < b.text.size() ? b.text[at] : 0;
            if (left != right || left == 0) return left - right;
        }
    }

    void Compare(int i, int j) {
        const int difference = Difference(models[i], models[j]);
        ZMC_EXPECT(strings[i].Compare(strings[j]) == difference);
        ZMC_EXPECT((strings[i] == strings[j]) == (difference == 0));
        ZMC_EXPECT((strings[i] < strings[j]) == (difference < 0));
    }

    void CompareUtf8(int i) {
        const std::string bytes = input.Text();
        const Model model = OfNarrow(bytes.c_str());
        ZMC_EXPECT((strings[i] == bytes.c_str()) == (Difference(models[i], model) == 0));
        ZMC_EXPECT((strings[i] == static_cast<const char*>(nullptr)) == models[i].null);
    }

    void Find(int i, int j) {
        const std::size_t at = models[i].text.find(models[j].text);
        const bool found = !models[i].null && !models[j].null && at != std::u16string::npos;
        ZMC_EXPECT(strings[i].Find(strings[j]) ==
                   (found ? static_cast<std::uint32_t>(at) : String::kNotFound));
    }

    static bool IsSpace(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

    void ReadTokens(int i) {
        const std::string bytes = input.Text();
        std::istringstream stream(bytes);
        std::size_t at = 0;
        for (int tokens = 0; tokens < 4; ++tokens) {
            zelm::ReadTrimmedToken(stream, strings[i]);
            while (at < bytes.size() && IsSpace(bytes[at])) ++at;
            const std::size_t start = at;
            while (at < bytes.size() && !IsSpace(bytes[at])) ++at;
            const std::string token = bytes.substr(start, at - start);
            Set(i, token.empty() ? Model() : OfNarrow(token.c_str()));
            ExpectSame(strings[i], models[i]);
        }
    }

    // The conversions themselves, into rooms of any size; here a text may hold zeros.
    void Convert() {
        const std::size_t room = input.UpTo(255);
        const std::string bytes = input.Text();
        const std::u16string units = Units(input);
        ExpectFits<char, char16_t>(platform::Utf8ToUtf16, bytes, zmcfuzz::Utf16Of(bytes), room);
        ExpectFits<char16_t, char>(platform::Utf16ToUtf8, units, zmcfuzz::Utf8Of(units), room);
        ExpectFits<char16_t, char>(platform::Utf16ToLocale, units, InLocale(units), room);
    }

    static constexpr std::size_t kLongestText = 1 << 12;

    InputBytes& input;
    String strings[kStrings];
    Model models[kStrings];
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    InputBytes input(data, size);
    ChooseLocale(input.Flag());
    Session(input).Run();
    return 0;
}
