// The text form of styles: what each key takes, its one form, and every refusal in one line.
#include <gtest/gtest.h>

#include <string>

#include "render/Style.h"

namespace zmcrender {
namespace {

std::string Refusal(const std::string& key, const std::string& value) {
    Style style;
    try {
        style.Set(key, value);
    } catch (const StyleError& error) {
        EXPECT_EQ(style, Style()) << "a style that refuses changes nothing";
        EXPECT_EQ(std::string(error.what()), error.Key() + ": " + error.Reason());
        return error.what();
    }
    return "taken";
}

struct Form {
    const char* key;
    const char* value;
    const char* text;  // its one form; empty where it is as if not given
};

TEST(Style, TakesEveryFormOfItsKeys) {
    const Form forms[] = {
        {"bands", "2", "2"},
        {"bands", "2,4", "2,4"},
        {"bands", "3,2,1", "3,2,1"},
        {"bands", "1,1,1,4294967295", "1,1,1,4294967295"},
        {"stretch", "auto", ""},
        {"stretch", "none", "none"},
        {"stretch", "0,255", "0,255"},
        {"stretch", "-1e3,2.50", "-1000,2.5"},
        {"stretch", "5,5", "5,5"},
        {"stretch", "9,1", "9,1"},
        {"stretch", "0,1;2,3;4,5;6,7", "0,1;2,3;4,5;6,7"},
        {"stretch", "9007199254740993,18446744073709551615",
         "9007199254740993,18446744073709551615"},
        {"stretch", "p2,98", "p2,98"},
        {"stretch", "p0,100", "p0,100"},
        {"stretch", "p0.5,99.5", "p0.5,99.5"},
        {"stretch", "s2", "s2"},
        {"stretch", "s0.5", "s0.5"},
        {"gamma", "1", ""},
        {"gamma", "2.2", "2.2"},
        {"gamma", "0.01", "0.01"},
        {"gamma", "100", "100"},
        {"colormap", "viridis", "viridis"},
        {"colormap", "-turbo", "-turbo"},
        {"colormap", "palette", "palette"},
        {"nodata", "auto", ""},
        {"nodata", "none", "none"},
        {"nodata", "-9999", "-9999"},
        {"expression", "(b4-b3)/(b4+b3)", "(b4-b3)/(b4+b3)"},
        {"complex", "magnitude", ""},
        {"complex", "real", "real"},
        {"complex", "imaginary", "imaginary"},
        {"complex", "phase", "phase"},
        {"hillshade", "1", "1"},
        {"hillshade", "true", "1"},
        {"hillshade", "0", ""},
        {"hillshade", "false", ""},
        {"azimuth", "90", "90"},
        {"azimuth", "-45", "-45"},
        {"azimuth", "315", ""},
        {"altitude", "90", "90"},
        {"altitude", "0", "0"},
        {"zfactor", "auto", ""},
        {"zfactor", "0.001", "0.001"},
        {"depth", "8", ""},
        {"depth", "16", "16"},
    };
    for (const Form& form : forms) {
        Style style, again;
        style.Set(form.key, form.value);
        EXPECT_EQ(style.Value(form.key), form.text) << form.key << '=' << form.value;
        if (*form.text == '\0') {
            EXPECT_EQ(style, Style()) << form.key;
            continue;
        }
        again.Set(form.key, form.text);
        EXPECT_EQ(again, style) << form.key << '=' << form.value;
        EXPECT_EQ(style.Text(), std::string(form.key) + "=" + form.text);
    }
}

TEST(Style, RefusesWhatItDoesNotUnderstandInOneLine) {
    const Form refused[] = {
        {"bands", "0", "bands: \"0\" is no band, which count from 1"},
        {"bands", "1,", "bands: \"\" is no band, which count from 1"},
        {"bands", "-1", "bands: \"-1\" is no band, which count from 1"},
        {"bands", "4294967296", "bands: \"4294967296\" is no band, which count from 1"},
        {"bands", "1,2,3,4,5", "bands: \"1,2,3,4,5\" names more than four bands"},
        {"stretch", "5", "stretch: \"5\" is no pair MIN,MAX"},
        {"stretch", "1,2,3", "stretch: \"1,2,3\" is no pair MIN,MAX"},
        {"stretch", "a,b", "stretch: \"a\" is no number"},
        {"stretch", "0,nan", "stretch: \"nan\" is no number"},
        {"stretch", "0,1;", "stretch: \"\" is no pair MIN,MAX"},
        {"stretch", "0,1;0,1;0,1;0,1;0,1",
         "stretch: \"0,1;0,1;0,1;0,1;0,1\" has more than four pairs"},
        {"stretch", "p98,2", "stretch: \"p98,2\" are no per cents from 0 to 100 in their order"},
        {"stretch", "p-1,50", "stretch: \"p-1,50\" are no per cents from 0 to 100 in their order"},
        {"stretch", "p2", "stretch: \"2\" is no pair MIN,MAX"},
        {"stretch", "s", "stretch: \"\" is no number"},
        {"stretch", "s0", "stretch: \"0\" is not from 0.01 to 100"},
        {"stretch", "AUTO", "stretch: \"AUTO\" is no pair MIN,MAX"},
        {"gamma", "0", "gamma: \"0\" is not from 0.01 to 100"},
        {"gamma", "-1", "gamma: \"-1\" is not from 0.01 to 100"},
        {"gamma", "1e9", "gamma: \"1e9\" is not from 0.01 to 100"},
        {"colormap", "jet",
         "colormap: \"jet\" is none of palette, grey, viridis, magma, inferno, plasma, cividis, "
         "turbo, coolwarm"},
        {"nodata", "x", "nodata: \"x\" is no number"},
        {"expression", "b1+",
         "expression: its end stands where a number, a band or a parenthesis "
         "is expected"},
        {"complex", "abs", "complex: \"abs\" is none of magnitude, real, imaginary, phase"},
        {"hillshade", "yes", "hillshade: \"yes\" is neither 0 nor 1"},
        {"azimuth", "361", "azimuth: \"361\" is not from -360 to 360"},
        {"altitude", "-1", "altitude: \"-1\" is not from 0 to 90"},
        {"zfactor", "0", "zfactor: \"0\" is not from 1e-12 to 1000000000000"},
        {"depth", "12", "depth: \"12\" is neither 8 nor 16"},
        {"gamma", "", "gamma: has no value"},
        {"nothing", "1", "\"nothing\": there is no such key"},
        {"bands\n", "1", "\"bands?\": there is no such key"},
        {"gamma", "1\n2\x1b[31m\"<b>", "gamma: \"1?2?[31m?<b>\" is no number"},
    };
    for (const Form& form : refused) EXPECT_EQ(Refusal(form.key, form.value), form.text);
}

TEST(Style, RefusesLongValuesWithoutShowingThem) {
    EXPECT_EQ(Refusal("expression", std::string(1025, 'b')),
              "expression: has more than 1024 bytes");
    EXPECT_EQ(Refusal("gamma", std::string(1000, '7') + "x"),
              "gamma: \"" + std::string(40, '7') + "...\" is no number");
}

TEST(Style, TellsAllThatIsGivenInTheOrderOfItsKeys) {
    Style style;
    style.Set("depth", "16");
    style.Set("stretch", "p1,99");
    style.Set("bands", "4,3,2");
    EXPECT_EQ(style.Text(), "bands=4,3,2&stretch=p1,99&depth=16");
    EXPECT_EQ(Style().Text(), "");
}

TEST(Style, KnowsItsKeys) {
    for (const char* key : Style::Keys()) EXPECT_TRUE(Style::IsKey(key)) << key;
    EXPECT_EQ(Style::Keys().size(), 12u);
    EXPECT_FALSE(Style::IsKey("size"));
    EXPECT_EQ(Style().Value("size"), "");
}

}  // namespace
}  // namespace zmcrender
