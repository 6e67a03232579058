#include "format/PyramidXMLReaderHandlers.h"

#include <algorithm>
#include <new>

#include <xercesc/sax/SAXParseException.hpp>

#include "core/NumericConversion.h"
#include "format/HeaderParser.h"
#include "format/NumberText.h"
#include "format/XercesText.h"

namespace zelm {
namespace {

using enum ElementName;

void PrintMessage(const char* heading, const xercesc::SAXParseException& exception) {
    try {
        PrintError(heading + ToNarrow(exception.getSystemId()) + ", line " +
                   FormatDecimal(exception.getLineNumber()) + ", char " +
                   FormatDecimal(exception.getColumnNumber()) +
                   "\n Message: " + ToNarrow(exception.getMessage()) + "\n");
    } catch (...) {
        // No memory for a message.
    }
}

// Takes the text up to the next bar, or to the end, off the front; false if that was the last.
bool TakeToken(std::string_view& text, std::string_view& token) {
    const std::size_t bar = text.find('|');
    token = text.substr(0, bar);
    if (bar == std::string_view::npos) return false;
    text.remove_prefix(bar + 1);
    return true;
}

std::uint32_t ReadSource(std::string_view text) {
    if (text == "Native") return HistogramSource::Native;
    if (text == "Dynamic") return HistogramSource::Dynamic;
    return text == "ORVA" ? HistogramSource::ORVA : 0;
}

// A value that 64 bits do not hold gives 2 to the 63: no top bit is added to a rest that has it.
std::uint64_t ToUint64(double value) {
    constexpr std::uint64_t top = std::uint64_t{1} << 63;
    constexpr auto limit = static_cast<double>(top);
    if (!(value > limit)) return static_cast<std::uint64_t>(TruncateToSigned<std::int64_t>(value));
    const double rest = value - limit;
    const auto low = static_cast<std::uint64_t>(TruncateToSigned<std::int64_t>(rest));
    return rest < limit ? low | top : low;
}

template <class T>
T ToPixel(double value) {
    if constexpr (std::is_same_v<T, std::uint64_t>)
        return ToUint64(value);
    else
        return FromDouble<T>(value);
}

// Copies of arrays that find no memory are empty and say nothing, so arrays are handed over.
template <class T>
void Move(RasterBandStats<T>& from, RasterBandStats<T>& to) {
    to = from;  // its arrays are empty
}

template <class T>
void Move(RasterBandHistogram<T>& from, RasterBandHistogram<T>& to) {
    Array<std::uint64_t> counts;
    Hand(from.counts, counts);
    to = from;
    Hand(counts, to.counts);
}

// Array::Append grows by one element, which takes time in the square of their number.
template <class T>
void AppendGrowing(Array<T>& array, T& value) {
    const std::uint32_t count = array.shape.elements;
    if (count == array.capacity) {
        Array<T> longer;
        if (!longer.Reserve(std::max(8u, count * 2))) throw std::bad_alloc();
        for (std::uint32_t i = 0; i < count; ++i) Move(array.data[i], longer.data[i]);
        Hand(longer, array);
    }
    Move(value, array.data[count]);
    array.shape = ArrayShape(count + 1);
}

// Gives an array that owns its elements `count` of them, the new ones 0.
void Extend(Array<std::uint64_t>& array, std::uint32_t count) {
    const std::uint32_t before = array.shape.elements;
    if (count <= before) return;
    if (!array.SetShape(ArrayShape(count))) throw std::bad_alloc();
    std::fill(array.data + before, array.data + count, 0);
}

}  // namespace

void CountList::Begin() {
    binCount = 0;
    entries = 0;
}

void CountList::Take(std::string_view text, std::uint32_t bins, Array<std::uint64_t>& counts) {
    if (bins == 0) return;
    const auto bars = static_cast<std::uint64_t>(std::count(text.begin(), text.end(), '|'));
    // The first entry of a later piece is the rest of the last one before, or a list of its own.
    if (binCount == 0) {
        binCount = bins;
        entries = 1;
    }
    entries += bars;
    // A later piece may come under another number of bins.
    const auto end =
        static_cast<std::uint32_t>(std::min<std::uint64_t>(std::min(bins, binCount), bars + 1));
    Extend(counts, end);
    std::string_view token;
    for (std::uint32_t i = 0; i < end; ++i) {
        TakeToken(text, token);
        counts.data[i] = ToUint64(ReadReal(token));
    }
}

void CountList::End(std::uint64_t& spareBins, Array<std::uint64_t>& counts) const {
    const std::uint64_t spare = binCount > entries ? binCount - entries : 0;
    if (spare > spareBins) return counts.Clear();
    spareBins -= spare;
    Extend(counts, binCount);
}

void PyramidXMLReaderCore::Enter(std::int32_t state) {
    if (state == StateOf(BANDSTATISTICS)) {
        BeginStats();
    } else if (state == StateOf(HISTOGRAMS)) {
        BeginHistogram();
    } else if (state == StateOf(PALETTE)) {
        currentPalette.Clear();
    }
}

void PyramidXMLReaderCore::Leave(std::int32_t state) {
    if (state == StateOf(BANDSTATISTICS)) {
        EndStats();
    } else if (state == StateOf(HISTOGRAMS)) {
        EndHistogram();
    } else if (state == StateOf(PALETTE)) {
        palettes[paletteBand] = currentPalette;
    }
}

void PyramidXMLReaderCore::TakeText(ElementName name, std::string_view text) {
    if (name < HIST_LEVEL)
        TakeStatsText(name, text);
    else if (name < HEADER_VERSION_MAJOR)
        TakeHistogramText(name, text);
    else if (name < PALETTE_BAND)
        TakeHeaderText(header, name, text);
    else
        TakePaletteText(name, text);
}

void PyramidXMLReaderCore::TakePaletteText(ElementName name, std::string_view text) {
    if (name == PALETTE_BAND) {
        paletteBand = ReadInteger(text);
    } else if (name == PALETTE_COUNT) {
        // Sets no length: the colours are counted. The lookup leaves a null colour behind.
        currentPalette.LookUp(ReadInteger(text));
    } else {
        // PALETTE_RGBA, the last of all names.
        ColorList::Rgba rgba = 0;
        std::string_view token;
        bool more = true;
        for (int i = 0; more && i < 4; ++i) {
            more = TakeToken(text, token);
            const std::int64_t channel = TruncateToSigned<std::int64_t>(ReadReal(token));
            rgba |= static_cast<ColorList::Rgba>(channel & 0xFF) << (8 * i);
        }
        currentPalette.Add(rgba);
    }
}

void PyramidXMLReaderCore::warning(const xercesc::SAXParseException& exception) {
    PrintMessage("\nWarning at file ", exception);
}

void PyramidXMLReaderCore::error(const xercesc::SAXParseException& exception) {
    PrintMessage("\nError at file ", exception);
}

void PyramidXMLReaderCore::fatalError(const xercesc::SAXParseException& exception) {
    PrintMessage("\nFatal Error at file ", exception);
}

template <class T>
void PyramidXMLReaderHandlers<T>::BeginStats() {
    pendingStats = std::make_unique<RasterBandStats<T>>();
    pendingStats->band = initialBand;
}

template <class T>
void PyramidXMLReaderHandlers<T>::EndStats() {
    // Nothing is pending behind a record within a record.
    if (pendingStats) AppendGrowing(bandStats, *pendingStats);
    pendingStats.reset();
}

template <class T>
void PyramidXMLReaderHandlers<T>::BeginHistogram() {
    pendingHistogram = std::make_unique<RasterBandHistogram<T>>();
    pendingHistogram->band = initialBand;
    countList.Begin();
}

template <class T>
void PyramidXMLReaderHandlers<T>::EndHistogram() {
    if (pendingHistogram) {
        countList.End(spareBins, pendingHistogram->counts);
        AppendGrowing(histograms, *pendingHistogram);
    }
    pendingHistogram.reset();
}

template <class T>
void PyramidXMLReaderHandlers<T>::TakeStatsText(ElementName name, std::string_view text) {
    if (!pendingStats) return;
    RasterBandStats<T>& stats = *pendingStats;
    const auto take = [&](auto& field, std::uint32_t flag) {
        field = ToPixel<std::remove_reference_t<decltype(field)>>(ReadReal(text));
        stats.flags |= flag;
    };
    switch (name) {
        case RSTC_BAND:
            stats.band = ReadInteger(text);
            break;
        case RSTC_MINIMUM:
            take(stats.minimum, StatsFlag::Minimum);
            break;
        case RSTC_MAXIMUM:
            take(stats.maximum, StatsFlag::Maximum);
            break;
        case RSTC_MEAN:
            take(stats.mean, StatsFlag::Mean);
            break;
        case RSTC_STANDARDDEVIATION:
            take(stats.standardDeviation, StatsFlag::StandardDeviation);
            break;
        case RSTC_SUM:
            take(stats.sum, StatsFlag::Sum);
            break;
        case RSTC_SUM2:
            take(stats.sumOfSquares, StatsFlag::SumOfSquares);
            break;
        case RSTC_RMS:
            take(stats.rootMeanSquare, StatsFlag::RootMeanSquare);
            break;
        default:
            break;
    }
}

template <class T>
void PyramidXMLReaderHandlers<T>::TakeHistogramText(ElementName name, std::string_view text) {
    if (!pendingHistogram) return;
    RasterBandHistogram<T>& histogram = *pendingHistogram;
    switch (name) {
        case HIST_LEVEL:
            histogram.level = ReadInteger(text);
            break;
        case HIST_BAND:
            histogram.band = ReadInteger(text);
            break;
        case HIST_SOURCE:
            histogram.source = ReadSource(text);
            break;
        case HIST_BINCOUNT:
            histogram.binCount = ReadInteger(text);
            break;
        case HIST_BINSIZE:
            histogram.binSize = ReadReal(text);
            break;
        case HIST_MIN:
            histogram.minimum = ToPixel<T>(ReadReal(text));
            break;
        case HIST_MAX:
            histogram.maximum = ToPixel<T>(ReadReal(text));
            break;
        case HIST_COUNTS:
            countList.Take(text, histogram.binCount, histogram.counts);
            break;
        default:
            break;
    }
}

#define ZMC_X(type, name, code) template class PyramidXMLReaderHandlers<type>;
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zelm
