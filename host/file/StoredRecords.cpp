#include "host/file/StoredRecords.h"

#include <string_view>
#include <utility>

#include "core/ElementTypes.h"
#include "format/DocumentParse.h"
#include "format/DocumentText.h"
#include "format/PyramidXMLReaderHandlers.h"
#include "host/base/Xerces.h"
#include "host/file/MetadataDocument.h"

namespace zmchost {
namespace {

// Says nothing on the standard error stream, and keeps what is wrong for those who ask.
template <class T>
class JudgingReader : public zelm::PyramidXMLReaderHandlers<T> {
public:
    std::string fault;
    bool hasOurRoot = false;
    std::uint64_t elements = 0;  // up to the fault, if there is one

    void warning(const xercesc::SAXParseException&) override {}
    void error(const xercesc::SAXParseException& exception) override {
        if (fault.empty()) fault = zelm::TextOfFault(exception);
    }
    void fatalError(const xercesc::SAXParseException& exception) override { error(exception); }

protected:
    void Enter(std::int32_t state) override {
        ++elements;
        if (this->stateStack.size() == 1)
            hasOurRoot = state == zelm::StateOf(zelm::ElementName::DATASET);
        zelm::PyramidXMLReaderHandlers<T>::Enter(state);
    }
};

// Whether the text behind `offset` is beyond what is read.
std::string JudgeSize(const zelm::files::ByteSource& source, std::uint64_t offset) {
    std::uint64_t size = 0;
    return source.TellSize(size) && size > offset ? JudgeMetadataSize(size - offset) : "";
}

// Why the text behind `offset` could not be had; empty if there is none.
std::string JudgeAbsence(const zelm::files::ByteSource& source, std::uint64_t offset) {
    std::uint64_t size = 0;
    return source.TellSize(size) && size <= offset ? "" : "the metadata document cannot be read";
}

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
    records->fault = JudgeSize(source, offset);
    if (!records->fault.empty()) return records;
    zelm::DocumentText text = zelm::DocumentText::Take(source, offset);
    records->settled = text.bytes && !text.IsUnfinished();
    if (text.bytes)
        records->Parse(std::move(text));
    else
        records->fault = JudgeAbsence(source, offset);
    return records;
}

template <class T>
void StoredRecords<T>::Parse(zelm::DocumentText text) {
    // The parse changes the bytes.
    const std::string_view bytes(reinterpret_cast<const char*>(text.bytes.get()), text.size);
    fault = JudgeMetadataBytes(bytes);
    InitialiseXerces();
    auto reader = std::make_unique<JudgingReader<T>>();
    const std::string wrong =
        zelm::ParseDocumentBytes(text.bytes.get(), text.size, *reader, reader->fault);
    elements = reader->elements;
    if (fault.empty()) fault = JudgeMetadataParse(wrong, reader->hasOurRoot);
    if (!wrong.empty()) return;
    kept = std::move(reader);
    MapPlaces();
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
const zelm::ColorList* StoredRecords<T>::BandPalette(std::uint32_t band) const {
    if (!kept) return nullptr;
    const auto found = kept->palettes.find(band);
    return found != kept->palettes.end() && !found->second.Colors().empty() ? &found->second
                                                                            : nullptr;
}

#define ZMC_X(type, word, code) template class StoredRecords<type>;
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zmchost
