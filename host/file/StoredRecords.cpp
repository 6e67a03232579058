#include "host/file/StoredRecords.h"

#include <algorithm>
#include <utility>

#include "core/ElementTypes.h"
#include "format/DocumentParse.h"
#include "format/DocumentText.h"
#include "format/PyramidXMLReaderHandlers.h"
#include "host/base/Xerces.h"

namespace zmchost {
namespace {

// Says nothing on the standard error stream: hosts that want to know what is wrong with a document
// ask for it (MetadataDocument.h).
//
// Nobody looks at the palette in hand afterwards, so one that is not inside another is not copied.
template <class T>
class QuietReader : public zelm::PyramidXMLReaderHandlers<T> {
public:
    void warning(const xercesc::SAXParseException&) override {}
    void error(const xercesc::SAXParseException&) override {}
    void fatalError(const xercesc::SAXParseException&) override {}

protected:
    void KeepPalette(zelm::Palette& kept) override {
        constexpr auto palette = zelm::StateOf(zelm::ElementName::PALETTE);
        if (std::count(this->stateStack.begin(), this->stateStack.end(), palette) != 0)
            return zelm::PyramidXMLReaderHandlers<T>::KeepPalette(kept);
        kept.Clear();
        kept.colors.swap(this->currentPalette.colors);
        std::swap(kept.nextIndex, this->currentPalette.nextIndex);
    }
};

template <class Record>
std::span<const Record> SpanOf(const zelm::Array<Record>& records) {
    return {records.data, records.data ? records.shape.elements : 0};
}

}  // namespace

template <class T>
StoredRecords<T>::StoredRecords() = default;

template <class T>
StoredRecords<T>::~StoredRecords() = default;

template <class T>
std::shared_ptr<const StoredRecords<T>> StoredRecords<T>::Read(zelm::files::ByteSource& source,
                                                               std::uint64_t offset) {
    auto records = std::make_shared<StoredRecords>();
    zelm::DocumentText text = zelm::DocumentText::Take(source, offset);
    records->settled = text.bytes && !text.IsUnfinished();
    if (!text.bytes) return records;
    InitialiseXerces();
    auto reader = std::make_unique<QuietReader<T>>();
    if (!zelm::ParseDocumentBytes(text.bytes.get(), text.size, *reader)) return records;
    records->kept = std::move(reader);
    records->MapPlaces();
    return records;
}

template <class T>
void StoredRecords<T>::MapPlaces() {
    std::uint32_t place = 0;
    for (const auto& record : Statistics()) {
        first.emplace(record.band, place);
        if (record.flags != 0) newest[record.band] = place;
        ++place;
    }
}

template <class T>
std::span<const zelm::RasterBandStats<T>> StoredRecords<T>::Statistics() const {
    if (!kept) return {};
    return SpanOf(kept->bandStats);
}

template <class T>
std::span<const zelm::RasterBandHistogram<T>> StoredRecords<T>::Histograms() const {
    if (!kept) return {};
    return SpanOf(kept->histograms);
}

template <class T>
const zelm::RasterBandStats<T>* StoredRecords<T>::At(const Places& places,
                                                     std::uint32_t band) const {
    const auto found = places.find(band);
    return found == places.end() ? nullptr : &Statistics()[found->second];
}

template <class T>
const zelm::RasterBandStats<T>* StoredRecords<T>::FirstStatistics(std::uint32_t band) const {
    return At(first, band);
}

template <class T>
const zelm::RasterBandStats<T>* StoredRecords<T>::NewestStatistics(std::uint32_t band) const {
    return At(newest, band);
}

template <class T>
const zelm::Palette* StoredRecords<T>::BandPalette(std::uint32_t band) const {
    if (!kept) return nullptr;
    const auto found = kept->palettes.find(band);
    const bool has = found != kept->palettes.end() && found->second.nextIndex != 0;
    return has ? &found->second : nullptr;
}

#define ZMC_X(type, word, code) template class StoredRecords<type>;
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zmchost
