// Statistics, histograms and palettes: stored as elements of the metadata document, fetched by
// parsing it afresh.
#include <new>

#include <xercesc/framework/MemBufInputSource.hpp>

#include "core/ElementTypes.h"
#include "format/PyramidXMLReaderHandlers.h"
#include "pyramid/PyramidDataset.h"

namespace zelm {
namespace {

// Parses the metadata document and has `take` look at the records; `withoutText` is the answer
// where there is no document.
template <class T, class Take>
bool ParseMeta(PyramidDataset& dataset, bool withoutText, Take take) {
    if (!dataset.MetaLoaded && !dataset.LoadMetaDocument()) return withoutText;
    try {
        PyramidXMLReaderHandlers<T> handlers;
        const int result = dataset.ParseDocument(&handlers, dataset.MetaSource, dataset.MetaLoaded);
        if (result != PyramidDataset::kParsed) return false;
        take(handlers);
        return true;
    } catch (...) {
        return false;
    }
}

// Has `append` add records to the tree and writes the whole document. A store is whole or nothing:
// where a record is refused, those before it are taken back. In a file without a layout, whose
// tiles are too large, nobody knows where the document is: the offset in the file is not to be
// trusted.
template <class Append>
bool Store(PyramidDataset& dataset, Append append) {
    if (!dataset.Writable || !dataset.File || !dataset.LevelOffsets) return false;
    PyramidXMLDocument* document = dataset.EnsureMetaDocument();
    if (!document || !document->document) return false;
    const std::uint32_t before = document->RecordCount();
    // What a failing disk did not take is written with the next store. What makes the document too
    // long never would be, nor would anything after it.
    if (append(*document) &&
        (document->SerializeDocument(*dataset.File, dataset.MetaDocumentOffset) ||
         !document->IsTooLong())) {
        // The text of before the store serves nobody any more.
        dataset.MetaLoaded = false;
        dataset.MetaSource.reset();
        return true;
    }
    document->RemoveFrom(before);
    return false;
}

template <class Record, class Write>
bool StoreAll(PyramidDataset& dataset, const Array<Record>& records, Write write) {
    return Store(dataset, [&](PyramidXMLDocument& document) {
        for (std::uint32_t i = 0; records.data && i < records.shape.elements; ++i)
            if (!write(document, records.data[i])) return false;
        return true;
    });
}

}  // namespace

template <class T>
bool PyramidDataset::LoadBandStats(Array<RasterBandStats<T>>& out) {
    return ParseMeta<T>(*this, false, [&](auto& handlers) { Hand(handlers.bandStats, out); });
}

template <class T>
bool PyramidDataset::LoadHistograms(Array<RasterBandHistogram<T>>& out) {
    return ParseMeta<T>(*this, true, [&](auto& handlers) { Hand(handlers.histograms, out); });
}

template <class T>
bool PyramidDataset::LoadPalette(std::uint32_t band, Palette& out) {
    return ParseMeta<T>(*this, true, [&](auto& handlers) {
        // Aside, since it may end halfway.
        Palette made;
        handlers.palettes[band].CopyTo(made);
        out.colors.swap(made.colors);
        out.nextIndex = made.nextIndex;
    });
}

template <class T>
bool PyramidDataset::HasBandStats(std::uint32_t band) {
    Array<RasterBandStats<T>> stats;
    if (!LoadBandStats(stats)) return false;
    for (std::uint32_t i = 0; i < stats.shape.elements; ++i)
        if (stats.data[i].band == band) return true;
    return false;
}

template <class T>
RasterBandStats<T> PyramidDataset::GetBandStats(std::int32_t band) {
    Array<RasterBandStats<T>> stats;
    const auto position = static_cast<std::uint32_t>(band);
    if (!LoadBandStats(stats) || position >= stats.shape.elements) return RasterBandStats<T>();
    return stats.data[position];
}

template <class T>
bool PyramidDataset::SetBandStats(const Array<RasterBandStats<T>>& stats) {
    return StoreAll(*this, stats, [](PyramidXMLDocument& document, const auto& record) {
        return document.WriteBandStatsElement(record);
    });
}

template <class T>
Array<RasterBandHistogram<T>> PyramidDataset::GetHistograms() {
    Array<RasterBandHistogram<T>> histograms;
    LoadHistograms(histograms);
    return histograms;
}

template <class T>
bool PyramidDataset::SetHistograms(const Array<RasterBandHistogram<T>>& histograms) {
    return StoreAll(*this, histograms, [](PyramidXMLDocument& document, const auto& record) {
        return document.WriteHistogramElement(record);
    });
}

template <class T>
PalettePtr PyramidDataset::GetPalette(std::uint32_t band) {
    CurrentPalette = PalettePtr(new (std::nothrow) Palette);
    if (CurrentPalette) LoadPalette<T>(band, *CurrentPalette);
    return CurrentPalette;
}

bool PyramidDataset::SetPalette(std::uint32_t band, const Palette& palette) {
    return Store(*this, [&](PyramidXMLDocument& document) {
        return document.WritePaletteElement(band, palette);
    });
}

#define ZMC_X(type, name, code)                                                           \
    template bool PyramidDataset::HasBandStats<type>(std::uint32_t);                      \
    template RasterBandStats<type> PyramidDataset::GetBandStats(std::int32_t);            \
    template bool PyramidDataset::SetBandStats(const Array<RasterBandStats<type>>&);      \
    template Array<RasterBandHistogram<type>> PyramidDataset::GetHistograms();            \
    template bool PyramidDataset::SetHistograms(const Array<RasterBandHistogram<type>>&); \
    template PalettePtr PyramidDataset::GetPalette<type>(std::uint32_t);                  \
    template bool PyramidDataset::LoadBandStats(Array<RasterBandStats<type>>&);           \
    template bool PyramidDataset::LoadHistograms(Array<RasterBandHistogram<type>>&);      \
    template bool PyramidDataset::LoadPalette<type>(std::uint32_t, Palette&);
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zelm
