// PyramidXMLReaderHandlers<T>: turns the two documents of a pyramid file back into records.
//
// One object serves one parse. T is the element type of the pixels and matters for minima and
// maxima alone; the header is read by the instance for char, because the type is not known before.
//
// Each piece of a text is taken for a whole value (ElementReader.h): in a list each piece starts
// again from the first entry.
//
// Palettes are kept as numbers, and share the colours that belong to several of them: what is kept
// is in proportion to the text.
// Nothing here allocates by a number from the file: see CountList.
#ifndef ZMC_FORMAT_PYRAMIDXMLREADERHANDLERS_H
#define ZMC_FORMAT_PYRAMIDXMLREADERHANDLERS_H

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <utility>

#include "colour/ColorList.h"
#include "core/Array.h"
#include "format/ElementReader.h"
#include "format/PyramidHeaderRecord.h"
#include "raster/RasterBandHistogram.h"
#include "raster/RasterBandStats.h"

namespace zelm {

// Bins that the histograms of one document may have beyond the entries of their lists, all
// together. A histogram that would take more keeps no counts: it claims what its text cannot hold.
inline constexpr std::uint64_t kSpareBins = 1u << 20;

// Gives the elements of the owning array `from` to `to`, without copying them; a view takes what it
// has room for.
template <class T>
void Hand(Array<T>& from, Array<T>& to) {
    if (!to.owned) {
        to = from;
        return;
    }
    to.Clear();
    std::swap(to.data, from.data);
    std::swap(to.shape, from.shape);
    std::swap(to.capacity, from.capacity);
}

// Reads the counts of the histogram in hand. They grow with the pieces of the list, and take their
// full number when its end has been seen: before that, nobody can tell what the text lacks. May
// throw bad_alloc.
class CountList {
public:
    // Of a new histogram.
    void Begin();
    // Takes a piece of a list under this number of bins; the first piece tells how many there are.
    void Take(std::string_view text, std::uint32_t bins, Array<std::uint64_t>& counts);
    // Fills up with zeros, or drops the counts if they lack more than there are `spareBins` left.
    void End(std::uint64_t& spareBins, Array<std::uint64_t>& counts) const;

private:
    std::uint32_t binCount = 0;  // 0 before the first piece
    std::uint64_t entries = 0;   // of all pieces together
};

// The part that does not depend on the element type.
class PyramidXMLReaderCore : public ElementReader {
public:
    static constexpr auto& elementNames = kElementNames;
    static constexpr std::int32_t initialBand = 0;  // band of a record that names none

    PyramidHeaderRecord header;
    // The palette in hand. Colours without a palette around them, and those of one around it, are
    // added to it too: it stays until the next begins.
    ColorList currentPalette;
    std::map<std::uint32_t, ColorList> palettes;  // finished palettes, by band
    std::uint32_t paletteBand = 0;                // the last one told, in whatever element

    // Each prints a message to the standard error stream; none throws.
    void warning(const xercesc::SAXParseException& exception) override;
    void error(const xercesc::SAXParseException& exception) override;
    void fatalError(const xercesc::SAXParseException& exception) override;

protected:
    void Enter(std::int32_t state) override;
    void Leave(std::int32_t state) override;
    void TakeText(ElementName name, std::string_view text) override;

    virtual void BeginStats() = 0;
    virtual void EndStats() = 0;
    virtual void BeginHistogram() = 0;
    virtual void EndHistogram() = 0;
    virtual void TakeStatsText(ElementName name, std::string_view text) = 0;
    virtual void TakeHistogramText(ElementName name, std::string_view text) = 0;

    CountList countList;
    std::uint64_t spareBins = kSpareBins;

private:
    void TakePaletteText(ElementName name, std::string_view text);
};

template <class T>
class PyramidXMLReaderHandlers : public PyramidXMLReaderCore {
public:
    Array<RasterBandStats<T>> bandStats;       // finished records, in document order
    Array<RasterBandHistogram<T>> histograms;  // likewise
    std::unique_ptr<RasterBandStats<T>> pendingStats;
    std::unique_ptr<RasterBandHistogram<T>> pendingHistogram;

protected:
    void BeginStats() override;
    void EndStats() override;
    void BeginHistogram() override;
    void EndHistogram() override;
    void TakeStatsText(ElementName name, std::string_view text) override;
    void TakeHistogramText(ElementName name, std::string_view text) override;
};

}  // namespace zelm

#endif
