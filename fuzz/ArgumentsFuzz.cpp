// The values of options, and a command line of all kinds of options: understood, or refused as what
// somebody wrote, and never anything else.
//
// The first byte tells what to read; texts end with a zero.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <cmath>
#include <cstdint>
#include <string>
#include <vector>

#include "fuzz/support/Expect.h"
#include "fuzz/support/InputBytes.h"
#include "tools/Arguments.h"
#include "tools/Message.h"
#include "tools/OptionTable.h"

namespace {

using zmcfuzz::InputBytes;

std::string TakeText(InputBytes& input) {
    std::string text;
    while (!input.AtEnd())
        if (const char c = static_cast<char>(input.Byte()); c != '\0')
            text += c;
        else
            break;
    return text;
}

// Calls read(); whether it understood. What it does not understand it names.
template <class Reader>
bool Understood(Reader&& read) {
    try {
        read();
        return true;
    } catch (const zmctools::UsageError& error) {
        ZMC_EXPECT(*error.what() != '\0');
        return false;
    }
}

bool HasDigitsAlone(const std::string& text) {
    return !text.empty() &&
           std::all_of(text.begin(), text.end(), [](char c) { return c >= '0' && c <= '9'; });
}

void Count(InputBytes& input) {
    const std::uint64_t limit = input.Flag() ? input.Size() : UINT64_MAX;
    const std::string text = TakeText(input);
    std::uint64_t value = 0;
    const bool good = Understood([&] { value = zmctools::ParseCount("--n", text, limit); });
    ZMC_EXPECT(!good || (value <= limit && HasDigitsAlone(text)));
    const std::string digits = text.substr(std::min(text.find_first_not_of('0'), text.size()));
    ZMC_EXPECT(!good || digits == (value == 0 ? "" : std::to_string(value)));
}

void Number(InputBytes& input) {
    const std::string text = TakeText(input);
    double value = 0;
    if (!Understood([&] { value = zmctools::ParseNumber("--n", text); })) return;
    // Infinite only where it says so.
    ZMC_EXPECT(!std::isinf(value) || text.find_first_of("iI") != std::string::npos);
}

void Size(InputBytes& input) {
    const std::string text = TakeText(input);
    std::uint64_t value = 0;
    const bool good = Understood([&] { value = zmctools::ParseSize("--n", text); });
    if (HasDigitsAlone(text) && good) ZMC_EXPECT(value == std::stoull(text));
}

void Bands(InputBytes& input) {
    const std::uint32_t count = input.Size();
    const std::string text = TakeText(input);
    if (text.empty()) return;
    std::vector<std::uint32_t> bands;
    if (!Understood([&] { bands = zmctools::ParseBands(text, count); })) return;
    ZMC_EXPECT(static_cast<std::ptrdiff_t>(bands.size()) ==
               1 + std::count(text.begin(), text.end(), ','));
    for (const std::uint32_t band : bands) ZMC_EXPECT(band < count);
}

void Window(InputBytes& input) {
    const std::uint32_t width = input.Size(), height = input.Size();
    const std::string text = TakeText(input);
    zmchost::Window window{};
    if (!Understood([&] { window = zmctools::ParseWindow(text, width, height); })) return;
    if (text.empty()) return;
    ZMC_EXPECT(window.width != 0 && window.height != 0);
    ZMC_EXPECT(std::uint64_t{window.x} + window.width <= width);
    ZMC_EXPECT(std::uint64_t{window.y} + window.height <= height);
}

void CommandLine(InputBytes& input) {
    CLI::App app("a program", "program");
    zmctools::OptionTable table(app);
    std::string file, method, text = "kept";
    std::vector<std::string> texts;
    bool flag = false;
    table.Text("FILE", file, "what to look at").Required();
    table.Text("--method,-m", method, "how").Named("METHOD").OneOf({"nearest", "average"});
    table.Text("--text,-t", text, "any");
    table.Texts("--co", texts, "given again and again");
    table.Flag("--flag,-q", flag, "or not");
    table.Footer("the end");
    std::vector<std::string> words;
    while (!input.AtEnd() && words.size() < 20) words.push_back(TakeText(input));
    try {
        app.parse(std::move(words));
        ZMC_EXPECT(app.count("FILE") == 1);
        ZMC_EXPECT(method.empty() || method == "nearest" || method == "average");
        ZMC_EXPECT(texts.size() == app.count("--co"));
    } catch (const CLI::ParseError& error) {
        ZMC_EXPECT(error.get_exit_code() != 0 || dynamic_cast<const CLI::Success*>(&error));
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    InputBytes input(data, size);
    switch (input.UpTo(5)) {
        case 0:
            Count(input);
            break;
        case 1:
            Number(input);
            break;
        case 2:
            Size(input);
            break;
        case 3:
            Bands(input);
            break;
        case 4:
            Window(input);
            break;
        default:
            CommandLine(input);
    }
    return 0;
}
