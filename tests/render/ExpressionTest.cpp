// Expressions against an evaluator that works on a tree, pixel by pixel.
#include <gtest/gtest.h>

#include <rapidcheck.h>
#include <cmath>
#include <functional>
#include <limits>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "render/Expression.h"
#include "render/Style.h"

namespace zmcrender {
namespace {

constexpr double kNone = std::numeric_limits<double>::quiet_NaN();

// One value of an expression for one value of each of the bands that it names.
double Value(const std::string& text, const std::vector<double>& samples) {
    const Expression expression = Expression::Parse(text);
    std::vector<const double*> places;
    for (const double& sample : samples) places.push_back(&sample);
    double value = 0;
    expression.Evaluate(places, 1, &value);
    return value;
}

std::string Refusal(const std::string& text) {
    try {
        static_cast<void>(Expression::Parse(text));
    } catch (const StyleError& error) {
        return error.Reason();
    }
    return "taken";
}

// A text and what it comes to.
struct Naive {
    std::string text;
    std::function<double(const std::vector<double>&)> value;
};

double Least(double a, double b) {
    return std::isnan(a) || std::isnan(b) ? kNone : std::fmin(a, b);
}
double Most(double a, double b) { return std::isnan(a) || std::isnan(b) ? kNone : std::fmax(a, b); }

Naive AnyNaive(std::mt19937_64& random, int depth) {
    if (depth == 0 || random() % 5 == 0) {
        if (random() % 3 == 0) {
            const double number = static_cast<double>(random() % 1000) / 8;
            return {std::to_string(number), [number](const auto&) { return number; }};
        }
        const std::size_t band = random() % 4;
        return {"b" + std::to_string(band + 1), [band](const auto& bands) { return bands[band]; }};
    }
    const Naive a = AnyNaive(random, depth - 1), b = AnyNaive(random, depth - 1);
    const auto both = [&](const std::string& text, auto combine) {
        return Naive{text,
                     [=](const auto& bands) { return combine(a.value(bands), b.value(bands)); }};
    };
    const std::string sides[] = {"(" + a.text + ") ", " (" + b.text + ")"};
    switch (random() % 10) {
        case 0:
            return both(sides[0] + "+" + sides[1], [](double x, double y) { return x + y; });
        case 1:
            return both(sides[0] + "-" + sides[1], [](double x, double y) { return x - y; });
        case 2:
            return both(sides[0] + "*" + sides[1], [](double x, double y) { return x * y; });
        case 3:
            return both(sides[0] + "/" + sides[1], [](double x, double y) { return x / y; });
        case 4:
            return both("min(" + a.text + "," + b.text + ")", Least);
        case 5:
            return both("max( " + a.text + " , " + b.text + " )", Most);
        case 6:
            return both("-" + sides[0], [](double x, double) { return -x; });
        case 7:
            return both("abs(" + a.text + ")", [](double x, double) { return std::fabs(x); });
        case 8:
            return both("sqrt(" + a.text + ")", [](double x, double) { return std::sqrt(x); });
        default:
            return both("log(" + a.text + ")", [](double x, double) { return std::log(x); });
    }
}

bool Same(double a, double b) { return a == b || (std::isnan(a) && std::isnan(b)); }

TEST(Expression, IsWhatANaiveEvaluatorMakesOfIt) {
    EXPECT_TRUE(rc::check([](std::uint64_t seed) {
        std::mt19937_64 random(seed);
        // All four bands are named, so that each has its place.
        const Naive naive = AnyNaive(random, 4);
        const std::string text = "min(b1+b2+b3+b4, 0)*0 + " + naive.text;
        const Expression expression = Expression::Parse(text);
        const std::size_t count = 1 + random() % Expression::kAtOnce;
        std::vector<std::vector<double>> samples(4, std::vector<double>(count));
        for (auto& band : samples)
            for (double& sample : band)
                sample =
                    random() % 20 == 0 ? kNone : static_cast<double>(random() % 2000) / 4 - 250;
        std::vector<const double*> places;
        for (const auto& band : samples) places.push_back(band.data());
        std::vector<double> values(count);
        expression.Evaluate(places, count, values.data());
        for (std::size_t i = 0; i < count; ++i) {
            const std::vector<double> pixel{samples[0][i], samples[1][i], samples[2][i],
                                            samples[3][i]};
            const double sum = Least(pixel[0] + pixel[1] + pixel[2] + pixel[3], 0) * 0;
            RC_ASSERT(Same(values[i], sum + naive.value(pixel)));
        }
    }));
}

TEST(Expression, ProductsComeBeforeSumsAndTheLeftBeforeTheRight) {
    EXPECT_EQ(Value("b1+2*3", {1}), 7);
    EXPECT_EQ(Value("b1-2-3", {10}), 5);
    EXPECT_EQ(Value("b1/2/5", {100}), 10);
    EXPECT_EQ(Value("b1/2*5", {100}), 250);
    EXPECT_EQ(Value("-b1*-2", {3}), 6);
    EXPECT_EQ(Value("--+-b1", {3}), -3);
    EXPECT_EQ(Value("(b1-b2)/(b1+b2)", {3, 1}), 0.5);
    EXPECT_EQ(Value("b1*1e-1+.5", {5}), 1.0);
}

TEST(Expression, BandsComeInTheirOrderAndEachOnce) {
    const Expression expression = Expression::Parse("b40/b3 + b40*b7");
    EXPECT_EQ(std::vector<std::uint32_t>(expression.Bands().begin(), expression.Bands().end()),
              (std::vector<std::uint32_t>{3, 7, 40}));
    EXPECT_EQ(Value("b40/b3 + b40*b7", {2, 5, 10}), 55);
}

TEST(Expression, MissingValuesComeThroughMinAndMax) {
    EXPECT_TRUE(std::isnan(Value("min(b1,b2)", {kNone, 1})));
    EXPECT_TRUE(std::isnan(Value("min(b1,b2)", {1, kNone})));
    EXPECT_TRUE(std::isnan(Value("max(b1,b2)", {kNone, 1})));
    EXPECT_TRUE(std::isnan(Value("max(b1,b2)", {1, kNone})));
    EXPECT_TRUE(std::isnan(Value("0*b1", {kNone})));
}

TEST(Expression, RefusesWhatItDoesNotUnderstand) {
    const std::string expected = "stands where a number, a band or a parenthesis is expected";
    EXPECT_EQ(Refusal("b1 b2"), "\"b2\" is not understood");
    EXPECT_EQ(Refusal("b1)"), "\")\" is not understood");
    EXPECT_EQ(Refusal("(b1"), "its end stands where a parenthesis is to be closed");
    EXPECT_EQ(Refusal("b1+*2"), "\"*2\" " + expected);
    EXPECT_EQ(Refusal("b1;b2"), "\";b2\" is not understood");
    EXPECT_EQ(Refusal("b0"), "\"0\" is no number of a band, which count from 1");
    EXPECT_EQ(Refusal("b"), "its end is no number of a band, which count from 1");
    EXPECT_EQ(Refusal("b99999999999"),
              "\"99999999999\" is no number of a band, which count from 1");
    EXPECT_EQ(Refusal("exp(b1)"), "\"exp(b1)\" is no band and no function");
    EXPECT_EQ(Refusal("min(b1)"), "\")\" stands where the second value of a function is expected");
    EXPECT_EQ(Refusal("abs(b1,b2)"),
              "\",b2)\" stands where the function's parenthesis is to be closed");
    EXPECT_EQ(Refusal("abs b1"), "\"b1\" stands where the function's parenthesis is to be opened");
    EXPECT_EQ(Refusal("1e999*b1"), "\"1e999*b1\" " + expected);
    EXPECT_EQ(Refusal("B1"), "\"B1\" " + expected);
    EXPECT_EQ(Refusal("2+3"), "names no band");
}

TEST(Expression, DepthAndBandsAreBounded) {
    const auto nested = [](std::size_t depth) {
        return std::string(depth, '(') + "b1" + std::string(depth, ')');
    };
    EXPECT_EQ(Refusal(nested(Expression::kDeepest - 1)), "taken");
    EXPECT_NE(Refusal(nested(Expression::kDeepest)).find("is nested too deeply"),
              std::string::npos);
    std::string text = "b1";
    for (int band = 2; band <= 64; ++band) text += "+b" + std::to_string(band);
    EXPECT_EQ(Refusal(text), "taken");
    EXPECT_EQ(Refusal(text + "+b65"), "its end is one band too many");
}

}  // namespace
}  // namespace zmcrender
