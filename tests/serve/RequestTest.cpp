// Requests taken apart, dates, ranges and codings: what needs no file.
#include "serve/Request.h"

#include <gtest/gtest.h>

#include <limits>

#include "serve/AccessLog.h"
#include "serve/Answer.h"
#include "serve/Compression.h"
#include "serve/Conditions.h"
#include "serve/HttpDate.h"
#include "serve/SampleAnswer.h"

namespace zmcserve {
namespace {

using Segments = std::vector<std::string>;

int StatusOfParsing(const std::string& target) {
    try {
        Request::Parse(Method::Get, target);
        return 200;
    } catch (const Refusal& refusal) {
        return refusal.Status();
    }
}

TEST(Request, SegmentsAreSplitBeforeTheyAreDecoded) {
    const Request request = Request::Parse(Method::Get, "/a/b%2Fc/%00%ff/?x=1&y=a+b%26c&z");
    EXPECT_EQ(request.segments, (Segments{"a", "b/c", std::string("\0\xff", 2), ""}));
    EXPECT_EQ(request.Value("x"), "1");
    EXPECT_EQ(request.Value("y"), "a b&c");
    EXPECT_EQ(request.Value("z"), "");
    EXPECT_EQ(request.Value("w"), std::nullopt);
}

TEST(Request, AServerInFrontOfThePathIsLeftOut) {
    for (const char* const front : {"http://a", "HTTPS://a.example:80", "http://[::1]:1"}) {
        const std::string server = front;
        EXPECT_EQ(Request::Parse(Method::Get, server + "/b/c?d=e").path, "/b/c");
        EXPECT_EQ(Request::Parse(Method::Get, server + "/b/c?d=e").query.size(), 1u);
        for (const char* const rest : {"", "/", "?d=e", "#f"})
            EXPECT_EQ(Request::Parse(Method::Get, server + rest).path, "/") << rest;
        EXPECT_EQ(Request::Parse(Method::Get, server + "/b").target, server + "/b");
    }
    for (const char* const target : {"http://", "http:///a", "http://?a", "ftp://a/b", "http:/a"})
        EXPECT_THROW(Request::Parse(Method::Get, target), Refusal) << target;
}

TEST(Request, WhatIsNoAddressIsRefused) {
    for (const char* const target : {"", "a", "*", "http:/here/", "/%", "/%4", "/%zz", "/?a=%g0"})
        EXPECT_EQ(StatusOfParsing(target), 400) << target;
    EXPECT_EQ(StatusOfParsing("/" + std::string(Request::kLongestTarget, 'a')), 414);
    EXPECT_EQ(StatusOfParsing("/" + std::string(Request::kMostSegments + 1, '/')), 400);
    std::string pairs = "/?";
    for (std::size_t i = 0; i <= Request::kMostPairs; ++i) pairs += "a=b&";
    EXPECT_EQ(StatusOfParsing(pairs), 400);
}

TEST(Request, AKeyThatIsGivenTwiceIsRefused) {
    const Request request = Request::Parse(Method::Get, "/?a=1&a=2&B=3&b=4");
    EXPECT_THROW(request.Value("a"), Refusal);
    EXPECT_EQ(request.Value("b"), "4");
    EXPECT_THROW(request.ValueOfAnyCase("b"), Refusal);
}

TEST(Request, NumbersAreWholeAndBounded) {
    const auto count = [](const std::string& text) {
        return Request::Parse(Method::Get, "/?n=" + text).Count("n", 100);
    };
    EXPECT_EQ(count("100"), 100u);
    for (const char* const text : {"101", "-1", "+1", "1.0", "", "x", "99999999999999999999999"})
        EXPECT_THROW(count(text), Refusal) << text;
}

TEST(Request, HeadersOfOneNameAreJoined) {
    Request request;
    request.headers = {{"Accept", "a"}, {"accept", "b"}};
    EXPECT_EQ(request.Header("ACCEPT"), "a, b");
    EXPECT_EQ(request.Header("Range"), std::nullopt);
}

TEST(Request, EncodingIsUndoneByDecoding) {
    std::string all;
    for (int byte = 0; byte < 256; ++byte) all += static_cast<char>(byte);
    EXPECT_EQ(PercentDecoded(PercentEncoded(all)), all);
    EXPECT_EQ(PercentEncoded("a/b c", true), "a/b%20c");
    EXPECT_EQ(PercentEncoded("a/b"), "a%2Fb");
}

TEST(HttpDate, AllThreeFormsAreOneMoment) {
    for (const char* const text : {"Sun, 06 Nov 1994 08:49:37 GMT",
                                   "Sunday, 06-Nov-94 08:49:37 GMT", "Sun Nov  6 08:49:37 1994"})
        EXPECT_EQ(ParseHttpDate(text), 784111777) << text;
    EXPECT_EQ(HttpDateText(784111777), "Sun, 06 Nov 1994 08:49:37 GMT");
}

TEST(HttpDate, OtherTextsAreNone) {
    for (const char* const text :
         {"", "x", "Sun, 31 Feb 1994 08:49:37 GMT", "Sun, 06 Nov 1994 24:49:37 GMT",
          "Sun, 06 Nov 1994 08:49:37", "Sun, 06 Nox 1994 08:49:37 GMT", "1 2 3 4 5 GMT"})
        EXPECT_EQ(ParseHttpDate(text), std::nullopt) << text;
}

struct RangeCase {
    const char* value;
    RangeKind kind;
    ByteRange range;
};

TEST(Ranges, AreTakenAsTheStandardTells) {
    const RangeCase cases[] = {
        {"bytes=0-9", RangeKind::Part, {0, 10}},
        {"bytes=90-", RangeKind::Part, {90, 10}},
        {"bytes=90-1000", RangeKind::Part, {90, 10}},
        {"bytes=-5", RangeKind::Part, {95, 5}},
        {"bytes=-500", RangeKind::Part, {0, 100}},
        {"BYTES=1-1", RangeKind::Part, {1, 1}},
        {"bytes= 1-2 ", RangeKind::Part, {1, 2}},
        {"bytes=0-99999999999999999999999", RangeKind::Part, {0, 100}},
        {"bytes=100-", RangeKind::Unsatisfiable, {}},
        {"bytes=-0", RangeKind::Unsatisfiable, {}},
        {"bytes=99999999999999999999999-", RangeKind::Unsatisfiable, {}},
        {"bytes=200-300,400-", RangeKind::Unsatisfiable, {}},
        {"bytes=0-1,5-6", RangeKind::Whole, {}},
        {"bytes=5-2", RangeKind::Whole, {}},
        {"bytes=", RangeKind::Whole, {}},
        {"bytes=-", RangeKind::Whole, {}},
        {"bytes=a-b", RangeKind::Whole, {}},
        {"bytes=1-2-3", RangeKind::Whole, {}},
        {"bytes=--5", RangeKind::Whole, {}},
        {"bytes=0x1-2", RangeKind::Whole, {}},
        {"bytes 0-9", RangeKind::Whole, {}},
        {"lines=0-9", RangeKind::Whole, {}},
        {"", RangeKind::Whole, {}},
    };
    for (const RangeCase& each : cases) {
        ByteRange range;
        EXPECT_EQ(ParseRange(each.value, 100, range), each.kind) << each.value;
        if (each.kind == RangeKind::Part) {
            EXPECT_EQ(range, each.range) << each.value;
        }
    }
}

TEST(Codings, AreTheOnesThatAreLikedMost) {
    EXPECT_EQ(CodingFor("gzip, deflate, br"), Coding::Gzip);
    EXPECT_EQ(CodingFor("gzip, deflate, br, zstd"), Coding::Zstd);
    EXPECT_EQ(CodingFor("gzip;q=1, zstd;q=0.5"), Coding::Gzip);
    EXPECT_EQ(CodingFor("*"), Coding::Zstd);
    EXPECT_EQ(CodingFor("gzip;q=0"), Coding::None);
    EXPECT_EQ(CodingFor("identity"), Coding::None);
    EXPECT_EQ(CodingFor(""), Coding::None);
    EXPECT_EQ(CodingFor("gzip;q=x"), Coding::Gzip);
}

TEST(Codings, HaveTagsOfTheirOwn) {
    EXPECT_EQ(WithoutCodings("\"a-gzip\", W/\"b-zstd\", \"c\""), "\"a\", W/\"b\", \"c\"");
    Request request;
    request.headers = {{"Accept-Encoding", "gzip"}};
    Answer answer = TextAnswer(200, std::string(5000, 'x'));
    answer.compressible = true;
    answer.Set("ETag", "\"a\"");
    Compress(request, 1 << 20, answer);
    EXPECT_EQ(answer.Header("ETag"), "\"a-gzip\"");
    EXPECT_EQ(answer.Header("Content-Encoding"), "gzip");
    EXPECT_EQ(answer.Header("Vary"), "Accept-Encoding");
    EXPECT_LT(answer.Size(), 200u);
}

TEST(Codings, LeaveLargeAndSmallAndDenseAnswersAsTheyAre) {
    Request request;
    request.headers = {{"Accept-Encoding", "zstd"}};
    std::string dense;
    for (std::uint32_t i = 0, x = 1; i < 5000; ++i)
        dense += static_cast<char>((x = x * 1664525 + 1013904223) >> 24);
    for (const std::string& text : {std::string(100, 'x'), std::string(2 << 20, 'x'), dense}) {
        Answer answer;
        answer.body = text;
        answer.compressible = true;
        Compress(request, 1 << 20, answer);
        EXPECT_EQ(answer.Header("Content-Encoding"), "");
        EXPECT_EQ(answer.Text(), text);
    }
}

TEST(Escaping, LeavesNothingThatAPageWouldTakeForItsOwn) {
    EXPECT_EQ(Escaped("<a href=\"x\">'&"), "&lt;a href=&quot;x&quot;&gt;&#39;&amp;");
    EXPECT_EQ(Escaped("\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80"),
              "\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80");
    EXPECT_EQ(Escaped("\xFF\x01"), "\xEF\xBF\xBD\xEF\xBF\xBD");
    EXPECT_EQ(Escaped("\xC0\xAF"), "\xEF\xBF\xBD\xEF\xBF\xBD");
    EXPECT_EQ(Escaped("\xED\xA0\x80"), "\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD");
    EXPECT_EQ(Escaped("\xEF\xBF\xBE"), "\xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD");
    EXPECT_EQ(Quoted("a\nb\"\x80"), "\"a\\x0Ab\"\\x80\"");
}

TEST(Answers, OfTextAreOneLine) { EXPECT_EQ(TextAnswer(400, "a\r\nb").Text(), "a  b\n"); }

TEST(AccessLog, LinesHoldNothingOfAClientThatCouldBeTakenForALine) {
    const LoggedRequest request{
        "::1", "GET", "/a\"\n\\ \xC3", "HTTP/1.1", 404, 7, std::chrono::microseconds(12)};
    EXPECT_EQ(AccessLog::LineOf(request, 784111777),
              "::1 - - [06/Nov/1994:08:49:37 +0000] \"GET /a\\x22\\x0A\\x5C\\x20\\xC3 HTTP/1.1\" "
              "404 7 12\n");
}

TEST(Npy, HeadersAreThoseOfVersionOne) {
    const std::string header = NpyHeader({12, 5, 3, 2});
    EXPECT_EQ(header.size() % 64, 0u);
    EXPECT_EQ(header.substr(0, 8), std::string("\x93NUMPY\x01\0", 8));
    const std::size_t length =
        static_cast<unsigned char>(header[8]) + 256u * static_cast<unsigned char>(header[9]);
    EXPECT_EQ(length + 10, header.size());
    EXPECT_EQ(header.substr(10, 62),
              "{'descr': '<u2', 'fortran_order': False, 'shape': (3, 5, 2), }");
    EXPECT_EQ(header.back(), '\n');
}

}  // namespace
}  // namespace zmcserve
