#include "pyramid/PyramidXMLDocument.h"

#include <cstdio>
#include <new>

#include <xercesc/dom/DOM.hpp>
#include <xercesc/framework/MemBufFormatTarget.hpp>
#include <xercesc/sax/ErrorHandler.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLException.hpp>

#include "core/PixelVocabulary.h"
#include "format/NumberText.h"
#include "format/XercesText.h"
#include "pyramid/DocumentStore.h"

namespace zelm {
namespace {

// Xerces reports success for any text if nobody listens.
class FaultCounter : public xercesc::ErrorHandler {
public:
    void warning(const xercesc::SAXParseException&) override {}
    void error(const xercesc::SAXParseException&) override { ++faults; }
    void fatalError(const xercesc::SAXParseException&) override { ++faults; }
    void resetErrors() override { faults = 0; }

    std::uint32_t faults = 0;
};

struct Releaser {
    template <class T>
    void operator()(T* object) const {
        object->release();
    }
};
template <class T>
using Released = std::unique_ptr<T, Releaser>;

// Runs a step that may throw; on an XMLException prints `heading` and its message.
template <class Step>
bool Attempt(const char* heading, Step step) {
    try {
        return step();
    } catch (const xercesc::XMLException& exception) {
        PrintError(heading);
        PrintError(" Exception message:");
        PrintError(exception.getMessage());
    } catch (...) {
        // Memory ran out, or the DOM was asked for something impossible: no text tells which.
    }
    return false;
}

void Serialize(const xercesc::DOMDocument& document, xercesc::MemBufFormatTarget& target,
               bool& complete) {
    xercesc::DOMImplementation* implementation =
        xercesc::DOMImplementationRegistry::getDOMImplementation(u"LS");
    xercesc::MemoryManager* memory = xercesc::XMLPlatformUtils::fgMemoryManager;
    const Released<xercesc::DOMLSSerializer> writer(implementation->createLSSerializer(memory));
    const Released<xercesc::DOMLSOutput> output(implementation->createLSOutput(memory));
    writer->getDomConfig()->setParameter(xercesc::XMLUni::fgDOMWRTFormatPrettyPrint, true);
    output->setEncoding(u"UTF-8");
    output->setByteStream(&target);
    complete = writer->write(&document, output.get());
}

// A record and its children, which have none of their own.
std::uint64_t ElementsOf(const xercesc::DOMElement& record) {
    return 1 + std::uint64_t{record.getChildElementCount()};
}

std::string FormatColor(const Color& color) {
    return FormatDecimal(color.red) + '|' + FormatDecimal(color.green) + '|' +
           FormatDecimal(color.blue) + '|' + FormatDecimal(color.alpha);
}

// All bins of the record; those beyond its count array are 0.
template <class T>
std::string FormatCounts(const RasterBandHistogram<T>& histogram) {
    const std::uint32_t known = histogram.counts.data ? histogram.counts.shape.elements : 0;
    std::string text;
    for (std::uint32_t i = 0; i < histogram.binCount; ++i) {
        if (i != 0) text += '|';
        text += FormatDecimal(i < known ? histogram.counts.data[i] : std::uint64_t{0});
    }
    return text;
}

}  // namespace

std::unique_ptr<PyramidXMLDocument> PyramidXMLDocument::Make() {
    try {
        return std::make_unique<PyramidXMLDocument>();
    } catch (const xercesc::XMLException& exception) {
        PrintError("Error during Xerces-c Initialization.\n Exception message:");
        PrintError(exception.getMessage());
    } catch (...) {
        // Out of memory.
    }
    return nullptr;
}

PyramidXMLDocument::PyramidXMLDocument() = default;

PyramidXMLDocument::~PyramidXMLDocument() { DropTree(); }

bool PyramidXMLDocument::CreateDocument() {
    DropTree();
    return Attempt("Exception when creating the Client XML:\n", [this] {
        xercesc::DOMImplementation* implementation =
            xercesc::DOMImplementationRegistry::getDOMImplementation(u"Core");
        const auto root = kElementNames[static_cast<int>(ElementName::DATASET)];
        document = implementation->createDocument(nullptr, root.data(), nullptr,
                                                  xercesc::XMLPlatformUtils::fgMemoryManager);
        elementCount = 1;
        return true;
    });
}

bool PyramidXMLDocument::ParseTree(const xercesc::InputSource& source) {
    DropTree();
    FaultCounter handler;
    const bool parsed = Attempt("", [&] {
        setErrorHandler(&handler);
        parse(source);
        return handler.faults == 0;
    });
    setErrorHandler(nullptr);
    if (!parsed) return false;
    document = adoptDocument();
    elementCount = limits.nodes;
    return document != nullptr;
}

void PyramidXMLDocument::DropTree() {
    if (document) document->release();
    document = nullptr;
    elementCount = 0;
}

void PyramidXMLDocument::AppendValueElement(xercesc::DOMElement& parent, ElementName name,
                                            const std::string& text) {
    xercesc::DOMElement* element =
        document->createElement(kElementNames[static_cast<int>(name)].data());
    element->appendChild(document->createTextNode(ToWide(text).c_str()));
    parent.appendChild(element);
}

// The children are built aside, so that a record is appended whole or not at all.
template <class Build>
bool PyramidXMLDocument::AppendRecord(ElementName name, Build build) {
    if (!document) return false;
    return Attempt("", [&] {
        xercesc::DOMElement* record =
            document->createElement(kElementNames[static_cast<int>(name)].data());
        build(*record);
        const std::uint64_t count = ElementsOf(*record);
        if (elementCount + count > kMaxDocumentNodes) {
            record->release();
            return false;
        }
        document->getDocumentElement()->appendChild(record);
        elementCount += count;
        return true;
    });
}

bool PyramidXMLDocument::WriteHeaderElement(const PyramidHeaderRecord& header) {
    return AppendRecord(ElementName::HEADER, [&](xercesc::DOMElement& record) {
        const auto number = [&](ElementName name, std::uint32_t value) {
            AppendValueElement(record, name, FormatDecimal(value));
        };
        number(ElementName::HEADER_VERSION_MAJOR, header.versionMajor);
        number(ElementName::HEADER_VERSION_MINOR, header.versionMinor);
        number(ElementName::HEADER_BANDS, header.bandCount);
        number(ElementName::HEADER_PIXEL_HEIGHT, header.height);
        number(ElementName::HEADER_PIXEL_WIDTH, header.width);
        number(ElementName::HEADER_LEVELMIN, header.levelMin);
        number(ElementName::HEADER_LEVELMAX, header.levelMax);
        number(ElementName::HEADER_TILESIZE, header.tileSize);
        AppendValueElement(record, ElementName::HEADER_INTERLEAVE,
                           InterleaveName(header.interleave));
        AppendValueElement(record, ElementName::HEADER_BUILD_METHOD,
                           TileOrderName(header.tileOrdering));
        AppendValueElement(record, ElementName::HEADER_PIXEL_TYPE, PixelTypeName(header.pixelType));
    });
}

template <class T>
bool PyramidXMLDocument::WriteBandStatsElement(const RasterBandStats<T>& stats) {
    return AppendRecord(ElementName::BANDSTATISTICS, [&](xercesc::DOMElement& record) {
        const auto present = [&](std::uint32_t flag, ElementName name, const std::string& text) {
            if (stats.flags & flag) AppendValueElement(record, name, text);
        };
        const auto real = [](double value) { return FormatReal(value, kRealDigits); };
        AppendValueElement(record, ElementName::RSTC_BAND, FormatDecimal(stats.band));
        // All statistics of a file count as those of level 0.
        AppendValueElement(record, ElementName::RSTC_LEVEL, "0");
        present(StatsFlag::Minimum, ElementName::RSTC_MINIMUM, FormatPixel(stats.minimum));
        present(StatsFlag::Maximum, ElementName::RSTC_MAXIMUM, FormatPixel(stats.maximum));
        present(StatsFlag::Mean, ElementName::RSTC_MEAN, real(stats.mean));
        present(StatsFlag::StandardDeviation, ElementName::RSTC_STANDARDDEVIATION,
                real(stats.standardDeviation));
        present(StatsFlag::Sum, ElementName::RSTC_SUM, real(stats.sum));
        present(StatsFlag::SumOfSquares, ElementName::RSTC_SUM2, real(stats.sumOfSquares));
        present(StatsFlag::RootMeanSquare, ElementName::RSTC_RMS, real(stats.rootMeanSquare));
    });
}

template <class T>
bool PyramidXMLDocument::WriteHistogramElement(const RasterBandHistogram<T>& histogram) {
    // Each bin takes two characters at least.
    if (histogram.binCount > kMaxDocumentBytes / 2) return false;
    return AppendRecord(ElementName::HISTOGRAMS, [&](xercesc::DOMElement& record) {
        AppendValueElement(record, ElementName::HIST_BAND, FormatDecimal(histogram.band));
        AppendValueElement(record, ElementName::HIST_LEVEL, FormatDecimal(histogram.level));
        // Whatever the record says: the word for histograms that a pyramid file keeps.
        AppendValueElement(record, ElementName::HIST_SOURCE, "ORVA");
        AppendValueElement(record, ElementName::HIST_BINCOUNT, FormatDecimal(histogram.binCount));
        AppendValueElement(record, ElementName::HIST_BINSIZE,
                           FormatReal(histogram.binSize, kRealDigits));
        AppendValueElement(record, ElementName::HIST_MIN, FormatPixel(histogram.minimum));
        AppendValueElement(record, ElementName::HIST_MAX, FormatPixel(histogram.maximum));
        AppendValueElement(record, ElementName::HIST_COUNTS, FormatCounts(histogram));
    });
}

bool PyramidXMLDocument::WritePaletteElement(std::uint32_t band, const Palette& palette) {
    // Each colour is an element.
    if (palette.nextIndex > kMaxDocumentNodes) return false;
    return AppendRecord(ElementName::PALETTE, [&](xercesc::DOMElement& record) {
        AppendValueElement(record, ElementName::PALETTE_BAND, FormatDecimal(band));
        AppendValueElement(record, ElementName::PALETTE_COUNT, FormatDecimal(palette.nextIndex));
        const Color nullColor;
        for (std::uint32_t i = 0; i < palette.nextIndex; ++i) {
            const auto entry = palette.colors.find(i);
            const bool known = entry != palette.colors.end() && entry->second;
            AppendValueElement(record, ElementName::PALETTE_RGBA,
                               FormatColor(known ? *entry->second : nullColor));
        }
    });
}

bool PyramidXMLDocument::SerializeDocument(files::ByteSource& file, std::uint64_t offset) {
    tooLong = false;
    if (!document) return false;
    return Attempt("Exception when serializing the XML:\n", [&] {
        xercesc::MemBufFormatTarget target(1023);
        bool complete = false;
        Serialize(*document, target, complete);
        const std::size_t length = target.getLen();
        tooLong = length > kMaxDocumentBytes;
        if (!complete || tooLong) return false;
        return DocumentStore<files::ByteSource>(file, offset).Write(target.getRawBuffer(), length);
    });
}

std::uint32_t PyramidXMLDocument::RecordCount() const {
    return document
               ? static_cast<std::uint32_t>(document->getDocumentElement()->getChildElementCount())
               : 0;
}

void PyramidXMLDocument::RemoveFrom(std::uint32_t position) {
    if (!document) return;
    xercesc::DOMElement* root = document->getDocumentElement();
    for (std::uint32_t count = RecordCount(); count > position; --count) {
        xercesc::DOMElement* last = root->getLastElementChild();
        xercesc::DOMNode* const removed = root->removeChild(last);
        elementCount -= ElementsOf(*last);
        try {
            removed->release();
        } catch (...) {
            // Giving memory back takes some. The document keeps what is not given back, unseen.
        }
    }
}

#define ZMC_X(type, name, code)                                                            \
    template bool PyramidXMLDocument::WriteBandStatsElement(const RasterBandStats<type>&); \
    template bool PyramidXMLDocument::WriteHistogramElement(const RasterBandHistogram<type>&);
ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X

}  // namespace zelm
