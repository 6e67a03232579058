// Metadata documents whose elements are repeated, removed, moved, emptied and made huge, up to the
// documented limits and beyond.
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "tests/campaigns/Campaign.h"
#include "tests/campaigns/FileTrial.h"
#include "tests/campaigns/Samples.h"
#include "tests/support/CampaignLength.h"
#include "tests/support/XercesEnvironment.h"

namespace zmctest {
namespace {

// One element of the sample's document, from the first character of its start tag to behind its
// end tag.
struct Element {
    std::string name;
    std::size_t start, textStart, textEnd, end;
};

// In the order of their start tags; the root comes first.
std::vector<Element> ElementsOf(const std::string& document) {
    std::vector<Element> elements;
    std::vector<std::size_t> open;
    for (std::size_t at = document.find('<', 1); at != std::string::npos;
         at = document.find('<', at + 1)) {
        const std::size_t close = document.find('>', at);
        if (document[at + 1] == '/') {
            elements[open.back()].textEnd = at;
            elements[open.back()].end = close + 1;
            open.pop_back();
        } else {
            open.push_back(elements.size());
            elements.push_back({document.substr(at + 1, close - at - 1), at, close + 1, 0, 0});
        }
    }
    return elements;
}

std::string Repeated(const std::string& text, std::size_t times) {
    std::string all;
    all.reserve(text.size() * times);
    for (std::size_t i = 0; i < times; ++i) all += text;
    return all;
}

class Document {
public:
    std::string text = SampleDocument();
    std::vector<Element> elements = ElementsOf(text);

    std::string Of(const Element& e) const { return text.substr(e.start, e.end - e.start); }
    std::string Replaced(const Element& e, const std::string& by) const {
        return text.substr(0, e.start) + by + text.substr(e.end);
    }
    std::string WithText(const Element& e, const std::string& by) const {
        return text.substr(0, e.textStart) + by + text.substr(e.textEnd);
    }
    bool IsLeaf(const Element& e) const { return text.find('<', e.textStart) == e.textEnd; }
};

using Change = std::function<std::string(const Document&, const Element&)>;

// Changes of one element. The root takes part: its copies make a document malformed.
const std::vector<Change>& Changes() {
    static const std::vector<Change> changes{
        [](const auto& d, const auto& e) { return d.Replaced(e, ""); },
        [](const auto& d, const auto& e) { return d.Replaced(e, Repeated(d.Of(e), 2)); },
        [](const auto& d, const auto& e) { return d.Replaced(e, Repeated(d.Of(e), 100)); },
        [](const auto& d, const auto& e) { return d.WithText(e, ""); },
        [](const auto& d, const auto& e) { return d.WithText(e, " \n\t "); },
        [](const auto& d, const auto& e) { return d.Replaced(e, "<" + e.name + "/>"); },
        [](const auto& d, const auto& e) { return d.WithText(e, d.Of(e)); },
        [](const auto& d, const auto& e) { return d.WithText(e, "none"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "-1"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "4294967295"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "4294967296"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "1048577"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "1e308"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "-1e999"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "nan"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "|"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "1|2|3|4|5|6|7"); },
        [](const auto& d, const auto& e) { return d.WithText(e, Repeated("|", 8000)); },
        [](const auto& d, const auto& e) { return d.WithText(e, Repeated("9", 8000)); },
        [](const auto& d, const auto& e) { return d.WithText(e, Repeated("1|", 100000)); },
        [](const auto& d, const auto& e) { return d.WithText(e, Repeated(" ", 100000) + "5"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "1<!-- 5 -->2"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "<![CDATA[12]]>"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "1<foreign>5</foreign>"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "<"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "&undefined;"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "]]>"); },
        [](const auto& d, const auto& e) { return d.WithText(e, std::string(1, '\0')); },
        [](const auto& d, const auto& e) { return d.WithText(e, "\xC3"); },
        [](const auto& d, const auto& e) { return d.WithText(e, "\xC3\xA4"); },
        [](const auto& d, const auto& e) {
            return d.Replaced(e, "<foreign>" + d.Of(e) + "</foreign>");
        },
        [](const auto& d, const auto& e) {
            return d.Replaced(e, "<" + e.name + " a=\"1\" b='2'>1</" + e.name + ">");
        },
        [](const auto& d, const auto& e) {
            return d.Replaced(e, "<" + e.name + " a=\"1\" a=\"2\"/>");
        },
        [](const auto& d, const auto& e) { return d.Replaced(e, "<" + e.name + ">"); },
        [](const auto& d, const auto& e) { return d.Replaced(e, "</" + e.name + ">"); },
        [](const auto& d, const auto& e) {
            return d.Replaced(
                e, Repeated("<" + e.name + ">", 40) + "1" + Repeated("</" + e.name + ">", 40));
        },
    };
    return changes;
}

Bytes WithDocument(const Sample& sample, const std::string& document) {
    Bytes file = sample.Tiles();
    file.insert(file.end(), document.begin(), document.end());
    return file;
}

TEST(Metadata, EveryElementChanged) {
    FileTrial trial;
    Campaign campaign("Metadata.EveryElementChanged", 3);
    const Document document;
    const std::size_t count = document.elements.size();
    for (const Sample& sample : Samples())
        campaign.Run(sample.name, count * Changes().size(), [&](std::uint64_t i) {
            const Change& change = Changes()[i / count];
            return trial.Try(WithDocument(sample, change(document, document.elements[i % count])),
                             {});
        });
}

// Each element taken out, and put in front of, behind, or into each other one.
TEST(Metadata, EveryElementMoved) {
    FileTrial trial;
    Campaign campaign("Metadata.EveryElementMoved", 5);
    const Document document;
    const std::size_t count = document.elements.size();
    for (const Sample& sample : Samples())
        campaign.Run(sample.name, count * count * 3, [&](std::uint64_t i) {
            const Element& moved = document.elements[i / 3 / count];
            const Element& place = document.elements[i / 3 % count];
            const std::size_t to = i % 3 == 0   ? place.start
                                   : i % 3 == 1 ? place.end
                                                : place.textEnd;
            const std::string text = document.Of(moved);
            std::string changed = document.text;
            if (to >= moved.end) {
                changed.insert(to, text);
                changed.erase(moved.start, text.size());
            } else {
                changed.erase(moved.start, text.size());
                changed.insert(std::min(to, moved.start), text);
            }
            return trial.Try(WithDocument(sample, changed), {});
        });
}

std::string Root(const std::string& content) { return "<DATASET>" + content + "</DATASET>"; }

std::string Stats(const std::string& band) {
    return "<BANDSTATISTICS><RSTC_BAND>" + band +
           "</RSTC_BAND><RSTC_MEAN>3</RSTC_MEAN></BANDSTATISTICS>";
}

std::string Histogram(const std::string& bins, const std::string& counts) {
    return "<HISTOGRAMS><HIST_BINCOUNT>" + bins + "</HIST_BINCOUNT><HIST_COUNTS>" + counts +
           "</HIST_COUNTS></HISTOGRAMS>";
}

std::string Nested(std::size_t depth) {
    return Root(Repeated("<a>", depth - 1) + Repeated("</a>", depth - 1));
}

std::string Names(std::size_t count) {
    std::string text;
    for (std::size_t i = 0; i < count; ++i) text += "<n" + std::to_string(i) + "/>";
    return Root(text + Stats("1"));
}

std::string Attributes(std::size_t count) {
    std::string text = "<RSTC_BAND";
    for (std::size_t i = 0; i < count; ++i) text += " a" + std::to_string(i) + "=\"\"";
    return Root("<BANDSTATISTICS>" + text + ">1</RSTC_BAND></BANDSTATISTICS>");
}

// Documents at the documented limits, one below and one beyond.
std::vector<std::function<std::string()>> LimitDocuments() {
    std::vector<std::function<std::string()>> all;
    for (const std::size_t n : {63u, 64u, 65u, 1000u, 100000u})
        all.push_back([=] { return Nested(n); });
    for (const std::size_t n : {255u, 256u, 257u, 10000u}) all.push_back([=] { return Names(n); });
    for (const std::size_t n : {63u, 64u, 65u, 1000u}) all.push_back([=] { return Attributes(n); });
    // Bins claimed and not listed, in one histogram and in several.
    for (const char* bins : {"1048576", "1048577", "1048578", "4294967295", "-1"})
        for (const char* counts : {"", "7", "7|8"})
            all.push_back([=] { return Root(Histogram(bins, counts)); });
    for (const std::size_t n : {1u, 2u, 3u, 1000u})
        all.push_back([=] { return Root(Repeated(Histogram("524289", "1"), n)); });
    for (const std::size_t n : {4095u, 4096u, 4097u, 20000u})
        all.push_back([=] { return Root(Histogram(std::to_string(n), Repeated("1|", n))); });
    for (const std::size_t n : {255u, 256u, 257u, 65536u})
        all.push_back([=] {
            return Root("<PALETTE>" + Repeated("<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA>", n) +
                        "</PALETTE>");
        });
    for (const char* count : {"4294967295", "-1", "1048577"})
        all.push_back([=] {
            return Root("<PALETTE><PALETTE_COUNT>" + std::string(count) +
                        "</PALETTE_COUNT></PALETTE>");
        });
    all.push_back([] { return "<!DOCTYPE DATASET>" + Root(Stats("1")); });
    all.push_back([] {
        return "<!DOCTYPE d [<!ENTITY a \"1\"><!ENTITY b \"&a;&a;&a;\">]>" + Root(Stats("&b;"));
    });
    return all;
}

// What takes long to make and to read: the full form alone asks for it.
std::vector<std::function<std::string()>> LargeDocuments() {
    std::vector<std::function<std::string()>> all;
    // The root is an element too.
    for (const std::size_t n : {1048574u, 1048575u, 1048576u})
        all.push_back([=] { return Root(Repeated("<a/>", n)); });
    for (const std::size_t n : {1048574u, 1048575u, 1048576u})
        all.push_back([=] { return Root(Repeated("<!---->", n)); });
    all.push_back([] { return Root(Repeated(Stats("1"), 300000)); });
    all.push_back([] { return Root(Repeated(Histogram("1", "1"), 300000)); });
    for (const std::size_t more : {0u, 1u}) {
        const std::size_t limit = (std::size_t{256} << 20) + more;
        all.push_back([=] {
            const std::string text = Root(Stats("1"));
            return text + std::string(limit - text.size(), '\n');
        });
        all.push_back([=] {
            const std::string front = "<DATASET><a>", back = "</a></DATASET>";
            return front + std::string(limit - front.size() - back.size(), 'x') + back;
        });
    }
    return all;
}

TEST(Metadata, DocumentsAtTheLimits) {
    FileTrial trial;
    Campaign campaign("Metadata.DocumentsAtTheLimits", 1);
    const auto documents = LimitDocuments();
    for (const Sample& sample : Samples())
        campaign.Run(sample.name, documents.size(), [&](std::uint64_t i) {
            return trial.Try(WithDocument(sample, documents[i]()), {});
        });
    if (!zmctest::IsFullCampaign()) return;
    const auto large = LargeDocuments();
    campaign.Run("large", large.size(), [&](std::uint64_t i) {
        const Sample sample = MakeSample("Blocked", 1, 4, 26, 37, 2);
        Verdict verdict = trial.Try(WithDocument(sample, large[i]()), {.stores = false});
        // In proportion to the text, which is read once for each question.
        verdict.allowedSeconds = 60;
        return verdict;
    });
}

}  // namespace
}  // namespace zmctest
