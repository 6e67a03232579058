#include "render/Expression.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <utility>

#include "render/StyleText.h"

namespace zmcrender {

// Recursive descent; what it finds becomes a step when its operands have become theirs.
class ExpressionParser {
public:
    explicit ExpressionParser(std::string_view source) : text(source) {}

    Expression Run() {
        ReadSum();
        SkipBlanks();
        if (at != text.size()) Fail("is not understood");
        return OrderBands();
    }

private:
    using Code = Expression::Code;
    struct Nesting {
        explicit Nesting(ExpressionParser& owner) : parser(owner) {
            if (++parser.depth > Expression::kDeepest) parser.Fail("is nested too deeply");
        }
        ~Nesting() { --parser.depth; }
        Nesting(const Nesting&) = delete;
        Nesting& operator=(const Nesting&) = delete;
        ExpressionParser& parser;
    };

    std::string_view text;
    std::size_t at = 0;
    std::size_t depth = 0;
    std::size_t held = 0;  // values on the stack
    Expression made;

    [[noreturn]] void Fail(const char* reason) const {
        const std::string place = at < text.size() ? Quoted(text.substr(at)) : "its end";
        throw StyleError("expression", place + " " + reason);
    }

    void SkipBlanks() {
        while (at < text.size() && text[at] == ' ') ++at;
    }
    // Takes one of these characters, if it comes next; 0 if none does.
    char Take(std::string_view wanted) {
        SkipBlanks();
        if (at == text.size() || wanted.find(text[at]) == wanted.npos) return 0;
        return text[at++];
    }
    void Expect(char wanted, const char* reason) {
        if (Take({&wanted, 1}) == 0) Fail(reason);
    }

    void Push(Expression::Step step) {
        made.steps.push_back(step);
        made.deepest = std::max(made.deepest, ++held);
    }
    void Reduce(Code code) {
        made.steps.push_back({code});
        --held;
    }

    void ReadSum() {
        const Nesting nesting(*this);
        ReadProduct();
        while (const char sign = Take("+-")) {
            ReadProduct();
            Reduce(sign == '+' ? Code::Add : Code::Subtract);
        }
    }
    void ReadProduct() {
        ReadFactor();
        while (const char sign = Take("*/")) {
            ReadFactor();
            Reduce(sign == '*' ? Code::Multiply : Code::Divide);
        }
    }
    void ReadFactor() {
        bool negative = false;
        while (const char sign = Take("+-")) negative ^= sign == '-';
        ReadOperand();
        if (negative) made.steps.push_back({Code::Negate});
    }
    void ReadOperand() {
        if (Take("(") != 0) {
            ReadSum();
            Expect(')', "stands where a parenthesis is to be closed");
            return;
        }
        SkipBlanks();
        const char next = at < text.size() ? text[at] : '\0';
        if (next >= 'a' && next <= 'z') return ReadWord();
        ReadConstant(next);
    }
    void ReadConstant(char next) {
        double number = 0;
        const char* const start = text.data() + at;
        const auto [end, error] = std::from_chars(start, text.data() + text.size(), number);
        if (!((next >= '0' && next <= '9') || next == '.') || error != std::errc())
            Fail("stands where a number, a band or a parenthesis is expected");
        at += static_cast<std::size_t>(end - start);
        Push({Code::Number, number});
    }

    void ReadWord() {
        const std::size_t start = at;
        while (at < text.size() && text[at] >= 'a' && text[at] <= 'z') ++at;
        const std::string_view word = text.substr(start, at - start);
        if (word == "b") return ReadBand();
        static constexpr std::pair<const char*, Code> kCalls[] = {{"abs", Code::Abs},
                                                                  {"sqrt", Code::Sqrt},
                                                                  {"log", Code::Log},
                                                                  {"min", Code::Min},
                                                                  {"max", Code::Max}};
        for (const auto& [name, code] : kCalls)
            if (word == name) return ReadCall(code);
        at = start;
        Fail("is no band and no function");
    }
    void ReadCall(Code code) {
        const bool two = code == Code::Min || code == Code::Max;
        Expect('(', "stands where the function's parenthesis is to be opened");
        ReadSum();
        if (two) {
            Expect(',', "stands where the second value of a function is expected");
            ReadSum();
        }
        Expect(')', "stands where the function's parenthesis is to be closed");
        if (two)
            Reduce(code);
        else
            made.steps.push_back({code});
    }
    void ReadBand() {
        std::uint32_t band = 0;
        const char* const start = text.data() + at;
        const auto [end, error] = std::from_chars(start, text.data() + text.size(), band);
        if (error != std::errc() || band == 0) Fail("is no number of a band, which count from 1");
        at += static_cast<std::size_t>(end - start);
        Push({Code::Band, 0, Place(band)});
    }
    std::size_t Place(std::uint32_t band) {
        const auto found = std::find(made.bands.begin(), made.bands.end(), band);
        const auto place = static_cast<std::size_t>(found - made.bands.begin());
        if (found == made.bands.end()) made.bands.push_back(band);
        if (made.bands.size() > Expression::kMostBands) Fail("is one band too many");
        return place;
    }

    // Bands in the order of their numbers, in place of the order in which they were met.
    Expression OrderBands() {
        const std::vector<std::uint32_t> met = made.bands;
        std::sort(made.bands.begin(), made.bands.end());
        for (Expression::Step& step : made.steps) {
            if (step.code != Code::Band) continue;
            const auto found =
                std::lower_bound(made.bands.begin(), made.bands.end(), met[step.place]);
            step.place = static_cast<std::size_t>(found - made.bands.begin());
        }
        if (made.bands.empty()) throw StyleError("expression", "names no band");
        return std::move(made);
    }
};

Expression Expression::Parse(std::string_view text) { return ExpressionParser(text).Run(); }

void Expression::Apply(Code code, double* left, const double* right, std::size_t count) {
    const auto each = [&](auto&& result) {
        for (std::size_t i = 0; i < count; ++i) left[i] = result(left[i], right[i]);
    };
    switch (code) {
        case Code::Add:
            return each([](double a, double b) { return a + b; });
        case Code::Subtract:
            return each([](double a, double b) { return a - b; });
        case Code::Multiply:
            return each([](double a, double b) { return a * b; });
        case Code::Divide:
            return each([](double a, double b) { return a / b; });
        case Code::Min:
            return each([](double a, double b) { return a < b || std::isnan(a) ? a : b; });
        case Code::Max:
            return each([](double a, double b) { return a > b || std::isnan(a) ? a : b; });
        case Code::Negate:
            return each([](double a, double) { return -a; });
        case Code::Abs:
            return each([](double a, double) { return std::fabs(a); });
        case Code::Sqrt:
            return each([](double a, double) { return std::sqrt(a); });
        case Code::Log:
            return each([](double a, double) { return std::log(a); });
        case Code::Number:
        case Code::Band:
            break;
    }
}

void Expression::Evaluate(std::span<const double* const> samples, std::size_t count,
                          double* values) const {
    std::vector<double> stack(deepest * kAtOnce);
    double* top = stack.data();  // behind the last value
    for (const Step& step : steps) {
        const bool pushes = step.code == Code::Number || step.code == Code::Band;
        if (step.code == Code::Number) std::fill_n(top, count, step.number);
        if (step.code == Code::Band) std::copy_n(samples[step.place], count, top);
        if (pushes) {
            top += kAtOnce;
            continue;
        }
        const bool two = step.code < Code::Negate || step.code >= Code::Min;
        if (two) top -= kAtOnce;
        double* const last = top - kAtOnce;
        Apply(step.code, last, two ? top : last, count);
    }
    std::copy_n(stack.data(), count, values);
}

}  // namespace zmcrender
