#include "tests/campaigns/DocumentOracle.h"

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <set>

namespace zmctest {
namespace {

constexpr std::uint64_t kMaxBytes = std::uint64_t{256} << 20;
constexpr std::uint64_t kMaxNodes = 1048576;
constexpr std::uint64_t kSpareBins = 1048576;
// Longer texts may reach a reader in several pieces.
constexpr std::size_t kSurelyOnePiece = 8192;

constexpr const char* kKnownNames[] = {"DATASET",
                                       "BANDSTATISTICS",
                                       "HISTOGRAMS",
                                       "PALETTE",
                                       "HEADER",
                                       "RSTC_LEVEL",
                                       "RSTC_BAND",
                                       "RSTC_MINIMUM",
                                       "RSTC_MAXIMUM",
                                       "RSTC_MEAN",
                                       "RSTC_STANDARDDEVIATION",
                                       "RSTC_SUM",
                                       "RSTC_SUM2",
                                       "RSTC_RMS",
                                       "RSTC_SUMXY",
                                       "RSTC_COV",
                                       "HIST_LEVEL",
                                       "HIST_BAND",
                                       "HIST_SOURCE",
                                       "HIST_BINCOUNT",
                                       "HIST_BINSIZE",
                                       "HIST_MIN",
                                       "HIST_MAX",
                                       "HIST_TYPE",
                                       "HIST_COUNTS",
                                       "HEADER_VERSION_MAJOR",
                                       "HEADER_VERSION_MINOR",
                                       "HEADER_BANDS",
                                       "HEADER_PIXEL_WIDTH",
                                       "HEADER_PIXEL_HEIGHT",
                                       "HEADER_TILESIZE",
                                       "HEADER_LEVELMIN",
                                       "HEADER_LEVELMAX",
                                       "HEADER_INTERLEAVE",
                                       "HEADER_BUILD_METHOD",
                                       "HEADER_PIXEL_TYPE",
                                       "PALETTE_BAND",
                                       "PALETTE_COUNT",
                                       "PALETTE_RGBA"};

bool IsKnown(const std::string& name) {
    return std::any_of(std::begin(kKnownNames), std::end(kKnownNames),
                       [&](const char* known) { return name == known; });
}

bool IsSpace(char c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r'; }

std::string FirstWord(std::string_view text) {
    std::size_t start = 0;
    while (start < text.size() && IsSpace(text[start])) ++start;
    std::size_t end = start;
    while (end < text.size() && !IsSpace(text[end])) ++end;
    return std::string(text.substr(start, end - start));
}

std::uint32_t PixelTypeOf(const std::string& word) {
    static const std::map<std::string, std::uint32_t> codes{
        {"Byte", 1},    {"Int16", 2},         {"Int32", 3},         {"Single", 4},
        {"Double", 5},  {"ComplexSingle", 6}, {"ComplexDouble", 9}, {"UInt16", 12},
        {"UInt32", 13}, {"Int64", 14},        {"UInt64", 15},       {"Char", 99},
        {"Quad", 95},   {"ComplexQuad", 96},  {"Bool", 98},         {"USHORT", 12}};
    const auto found = codes.find(word);
    return found == codes.end() ? 0 : found->second;
}

std::vector<std::string_view> Tokens(std::string_view text) {
    std::vector<std::string_view> tokens;
    for (;;) {
        const std::size_t bar = text.find('|');
        tokens.push_back(text.substr(0, bar));
        if (bar == std::string_view::npos) return tokens;
        text.remove_prefix(bar + 1);
    }
}

// Takes the events of a document, in the order of its text.
class Meaning {
public:
    explicit Meaning(DocumentOracle& result) : out(result) {}

    void Open(const std::string& name) {
        names.push_back(name);
        if (name == "BANDSTATISTICS") {
            stats = {};
            inStats = true;
        } else if (name == "HISTOGRAMS") {
            histogram = {};
            listBins = entries = 0;
            inHistogram = true;
        } else if (name == "PALETTE") {
            palette = {};
        }
    }
    void Close() {
        const std::string name = names.back();
        names.pop_back();
        if (name == "BANDSTATISTICS") {
            if (inStats) out.meta.stats.push_back(stats);
            inStats = false;
        } else if (name == "HISTOGRAMS") {
            if (inHistogram) {
                FillCounts();
                out.meta.histograms.push_back(histogram);
            }
            inHistogram = false;
        } else if (name == "PALETTE") {
            out.meta.palettes[paletteBand] = palette;
        }
    }
    void Text(std::string_view text) {
        if (names.empty()) return;
        const std::string& name = names.back();
        if (name.compare(0, 7, "HEADER_") == 0)
            TakeHeader(name, text);
        else if (name.compare(0, 5, "RSTC_") == 0 && inStats)
            TakeStats(name, text);
        else if (name.compare(0, 5, "HIST_") == 0 && inHistogram)
            TakeHistogram(name, text);
        else if (name.compare(0, 8, "PALETTE_") == 0)
            TakePalette(name, text);
    }

private:
    void TakeHeader(const std::string& name, std::string_view text) {
        HeaderFields& h = out.header;
        const std::map<std::string, std::uint32_t*> numbers{
            {"HEADER_VERSION_MAJOR", &h.versionMajor},
            {"HEADER_VERSION_MINOR", &h.versionMinor},
            {"HEADER_BANDS", &h.bands},
            {"HEADER_PIXEL_WIDTH", &h.width},
            {"HEADER_PIXEL_HEIGHT", &h.height},
            {"HEADER_TILESIZE", &h.tileSize},
            {"HEADER_LEVELMIN", &h.levelMin},
            {"HEADER_LEVELMAX", &h.levelMax}};
        const auto number = numbers.find(name);
        if (number != numbers.end()) *number->second = IntegerOf(text);
        const std::string word = FirstWord(text);
        if (name == "HEADER_INTERLEAVE")
            h.interleave = word == "BIP" ? 0 : word == "BIL" ? 1 : word == "BSQ" ? 2 : -1;
        if (name == "HEADER_BUILD_METHOD")
            h.ordering = word == "Morton" ? 2 : word == "Blocked" ? 1 : 0;
        if (name == "HEADER_PIXEL_TYPE") h.pixelType = PixelTypeOf(word);
    }

    void TakeStats(const std::string& name, std::string_view text) {
        if (name == "RSTC_BAND") stats.band = IntegerOf(text);
        const std::pair<const char*, double*> reals[] = {
            {"RSTC_MINIMUM", &stats.minimum}, {"RSTC_MAXIMUM", &stats.maximum},
            {"RSTC_MEAN", &stats.mean},       {"RSTC_STANDARDDEVIATION", &stats.deviation},
            {"RSTC_SUM", &stats.sum},         {"RSTC_SUM2", &stats.squares},
            {"RSTC_RMS", &stats.rms}};
        for (std::uint32_t i = 0; i < 7; ++i)
            if (name == reals[i].first) {
                *reals[i].second = RealOf(text);
                stats.flags |= 1u << i;
            }
    }

    void TakeHistogram(const std::string& name, std::string_view text) {
        HistogramRecord& h = histogram;
        if (name == "HIST_LEVEL") h.level = IntegerOf(text);
        if (name == "HIST_BAND") h.band = IntegerOf(text);
        if (name == "HIST_SOURCE")
            h.source = text == "Native" ? 1 : text == "Dynamic" ? 2 : text == "ORVA" ? 3 : 0;
        if (name == "HIST_BINCOUNT") h.binCount = IntegerOf(text);
        if (name == "HIST_BINSIZE") h.binSize = RealOf(text);
        if (name == "HIST_MIN") h.minimum = RealOf(text);
        if (name == "HIST_MAX") h.maximum = RealOf(text);
        if (name == "HIST_COUNTS" && h.binCount != 0) TakeCounts(text);
    }

    void TakeCounts(std::string_view text) {
        HistogramRecord& h = histogram;
        const std::vector<std::string_view> tokens = Tokens(text);
        if (text.size() > kSurelyOnePiece) h.sure = false;
        if (listBins == 0) {
            listBins = h.binCount;
            entries = 1;
        }
        entries += tokens.size() - 1;
        const std::size_t end = std::min<std::size_t>({tokens.size(), listBins, h.binCount});
        h.counts.resize(std::max(h.counts.size(), end));
        for (std::size_t i = 0; i < end; ++i) {
            const double value = RealOf(tokens[i]);
            if (!(value >= 0 && value < 9e15)) h.sure = false;
            h.counts[i] = h.sure ? static_cast<std::uint64_t>(value) : 0;
        }
    }

    // What the list lacks is 0, unless it lacks too much.
    void FillCounts() {
        const std::uint64_t spare = listBins > entries ? listBins - entries : 0;
        const bool given = spare <= spareBins;
        if (given) spareBins -= spare;
        histogram.counts.resize(given ? listBins : 0);
    }

    void TakePalette(const std::string& name, std::string_view text) {
        if (name == "PALETTE_BAND") paletteBand = IntegerOf(text);
        if (name != "PALETTE_RGBA") return;
        std::array<std::uint8_t, 4> color{};
        const std::vector<std::string_view> tokens = Tokens(text);
        for (std::size_t i = 0; i < std::min<std::size_t>(4, tokens.size()); ++i) {
            const double value = RealOf(tokens[i]);
            if (!(std::abs(value) < 2e9)) palette.sure = false;
            if (palette.sure)
                color[i] = static_cast<std::uint8_t>(static_cast<std::int64_t>(value));
        }
        palette.colors.push_back(color);
    }

    DocumentOracle& out;
    std::vector<std::string> names;
    StatsRecord stats;
    HistogramRecord histogram;
    PaletteRecord palette;
    bool inStats = false, inHistogram = false;
    std::uint32_t paletteBand = 0;
    std::uint64_t listBins = 0, entries = 0;  // of the histogram's lists
    std::uint64_t spareBins = kSpareBins;
};

struct Bad {};

class Scanner {
public:
    Scanner(std::string_view document, DocumentOracle& result)
        : text(document), out(result), meaning(result) {}

    void Run() {
        try {
            Document();
            out.trust = unsure ? Trust::Unsure : Trust::Sound;
        } catch (const Bad&) {
            out.trust = unsure ? Trust::Unsure : Trust::Malformed;
        }
        if (unsure) out.values = Trust::Unsure;
        out.nodes = nodes;
    }

private:
    [[noreturn]] static void Refuse() { throw Bad(); }
    bool Looking(std::string_view what) const { return text.substr(at, what.size()) == what; }
    char Now() const { return at < text.size() ? text[at] : '\0'; }
    void Need(std::string_view what) {
        if (!Looking(what)) Refuse();
        at += what.size();
    }
    bool SkipSpace() {
        const std::size_t start = at;
        while (at < text.size() && IsSpace(text[at])) ++at;
        return at != start;
    }

    void Document() {
        if (text.size() > kMaxBytes || text.find('\0') != std::string_view::npos) {
            // A mark of another encoding changes what a zero byte is.
            if (Looking("\xFE\xFF") || Looking("\xFF\xFE")) unsure = true;
            Refuse();
        }
        if (Looking("\xEF\xBB\xBF") || Looking("\xFE\xFF") || Looking("\xFF\xFE") ||
            Looking("\x4C\x6F"))
            unsure = true;
        if (Looking("<?xml") && at + 5 < text.size() && IsSpace(text[at + 5])) Declaration();
        Misc();
        if (Now() != '<') Refuse();
        Content();
        Misc();
        if (at != text.size()) Refuse();
    }

    // What a changed declaration means is not decided here.
    void Declaration() {
        const std::size_t end = text.find("?>");
        const std::string_view all = text.substr(0, end == std::string_view::npos ? 0 : end);
        if (all != "<?xml version=\"1.0\" encoding=\"UTF-8\"" &&
            all != "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"no\" ")
            unsure = true;
        if (end == std::string_view::npos) Refuse();
        at = end + 2;
    }

    void Misc() {
        for (;;) {
            if (SkipSpace()) continue;
            if (Looking("<!--"))
                Comment();
            else if (Looking("<?"))
                Instruction();
            else
                return;
        }
    }

    void Node() {
        if (++nodes > kMaxNodes) Refuse();
    }

    void Comment() {
        Node();
        at += 4;
        while (!Looking("--")) Character();
        Need("-->");
    }

    void Instruction() {
        Node();
        at += 2;
        const std::string target = Name();
        if (target.size() == 3 && std::tolower(target[0]) == 'x' &&
            std::tolower(target[1]) == 'm' && std::tolower(target[2]) == 'l')
            Refuse();
        if (!Looking("?>") && !SkipSpace()) Refuse();
        while (!Looking("?>")) Character();
        at += 2;
    }

    std::string Name() {
        const std::size_t start = at;
        for (; at < text.size(); ++at) {
            const auto c = static_cast<unsigned char>(text[at]);
            if (c >= 0x80) {
                unsure = true;
                continue;
            }
            const bool first = std::isalpha(c) || c == '_' || c == ':';
            if (!first && (at == start || !(std::isdigit(c) || c == '.' || c == '-'))) break;
        }
        if (at == start) Refuse();
        return std::string(text.substr(start, at - start));
    }

    void Foreign(const std::string& name) {
        names.insert(name);
        if (names.size() > 256) Refuse();
    }

    // From the first tag to the end of the element that it opens.
    void Content() {
        std::vector<std::string> open;
        do {
            if (at >= text.size()) Refuse();
            if (Looking("<!--")) {
                Comment();
            } else if (Looking("<![CDATA[")) {
                Section();
            } else if (Looking("<!")) {
                Refuse();
            } else if (Looking("<?")) {
                Instruction();
            } else if (Looking("</")) {
                at += 2;
                if (open.empty() || Name() != open.back()) Refuse();
                SkipSpace();
                Need(">");
                open.pop_back();
                meaning.Close();
            } else if (Now() == '<') {
                ++at;
                Tag(open);
            } else {
                Text();
            }
        } while (!open.empty());
    }

    void Tag(std::vector<std::string>& open) {
        const std::string name = Name();
        std::set<std::string> attributes;
        for (bool space = SkipSpace(); Now() != '>' && !Looking("/>"); space = SkipSpace()) {
            if (!space) Refuse();
            const std::string attribute = Name();
            SkipSpace();
            Need("=");
            SkipSpace();
            const char quote = Now();
            if (quote != '"' && quote != '\'') Refuse();
            ++at;
            while (Now() != quote) {
                if (Now() == '<') Refuse();
                if (Now() == '&')
                    Reference();
                else
                    Character();
            }
            ++at;
            if (!attributes.insert(attribute).second) Refuse();
        }
        if (open.size() + 1 > 64 || attributes.size() > 64) Refuse();
        Node();
        if (!IsKnown(name)) Foreign(name);
        for (const std::string& attribute : attributes) Foreign(attribute);
        meaning.Open(name);
        open.push_back(name);
        if (Now() == '/') {
            ++at;
            open.pop_back();
            meaning.Close();
        }
        Need(">");
    }

    void Text() {
        const std::size_t start = at;
        while (at < text.size() && Now() != '<') {
            if (Looking("]]>")) Refuse();
            if (Now() == '&')
                Reference();
            else
                Character();
        }
        const std::string_view piece = text.substr(start, at - start);
        // Line ends become one character, wherever they count.
        if (piece.size() > kSurelyOnePiece) out.values = Trust::Unsure;
        meaning.Text(piece);
    }

    void Section() {
        Node();
        at += 9;
        const std::size_t start = at;
        while (!Looking("]]>")) Character();
        meaning.Text(text.substr(start, at - start));
        at += 3;
    }

    void Reference() {
        out.values = Trust::Unsure;
        for (const char* known : {"&lt;", "&gt;", "&amp;", "&apos;", "&quot;"})
            if (Looking(known)) {
                at += std::strlen(known);
                return;
            }
        if (!Looking("&#")) Refuse();
        unsure = true;
        const std::size_t end = text.find(';', at);
        if (end == std::string_view::npos || end == at + 2) Refuse();
        at = end + 1;
    }

    // One character of UTF-8 that XML has.
    void Character() {
        if (at >= text.size()) Refuse();
        const auto byte = [&](std::size_t i) {
            return at + i < text.size() ? static_cast<unsigned char>(text[at + i]) : 0u;
        };
        const unsigned first = byte(0);
        if (first < 0x80) {
            if (first < 0x20 && !IsSpace(static_cast<char>(first))) Refuse();
            ++at;
            return;
        }
        const std::size_t length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
        if (first < 0xC2 || first > 0xF4) Refuse();
        std::uint32_t code = first & (0x7Fu >> length);
        for (std::size_t i = 1; i < length; ++i) {
            if ((byte(i) & 0xC0) != 0x80) Refuse();
            code = code << 6 | (byte(i) & 0x3F);
        }
        const bool tooLong = (length == 3 && code < 0x800) || (length == 4 && code < 0x10000);
        if (tooLong || code > 0x10FFFF || (code >= 0xD800 && code < 0xE000) ||
            (code & 0xFFFE) == 0xFFFE)
            Refuse();
        at += length;
    }

    std::string_view text;
    DocumentOracle& out;
    Meaning meaning;
    std::size_t at = 0;
    std::uint64_t nodes = 0;
    std::set<std::string> names;
    bool unsure = false;
};

}  // namespace

std::uint32_t IntegerOf(std::string_view text) {
    std::size_t at = 0;
    while (at < text.size() && std::strchr(" \t\n\v\f\r", text[at])) ++at;
    bool negative = false;
    if (at < text.size() && (text[at] == '-' || text[at] == '+')) negative = text[at++] == '-';
    // Beyond 64 bits with a sign the nearest of them stands.
    const std::uint64_t most = static_cast<std::uint64_t>(INT64_MAX) + (negative ? 1 : 0);
    std::uint64_t value = 0;
    for (; at < text.size() && text[at] >= '0' && text[at] <= '9'; ++at) {
        const auto digit = static_cast<std::uint64_t>(text[at] - '0');
        value = value > (most - digit) / 10 ? most : value * 10 + digit;
    }
    const auto low = static_cast<std::uint32_t>(value);
    return negative ? 0u - low : low;
}

double RealOf(std::string_view text) { return std::strtod(std::string(text).c_str(), nullptr); }

DocumentOracle::DocumentOracle(std::string_view text) { Scanner(text, *this).Run(); }

}  // namespace zmctest
