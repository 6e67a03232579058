#include "pyramid/PyramidXMLDocument.h"

#include <charconv>
#include <cstdio>
#include <new>
#include <span>
#include <string_view>
#include <utility>

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

// What else a step throws passes through.
template <class Step>
bool RunsOutOfMemory(Step step) {
    try {
        step();
        return false;
    } catch (const xercesc::OutOfMemoryException&) {
        return true;
    } catch (const std::bad_alloc&) {
        return true;
    }
}

void Serialize(const xercesc::DOMDocument& document, xercesc::MemBufFormatTarget& target,
               const xercesc::DOMLSSerializerFilter& filter, bool& complete) {
    xercesc::DOMImplementation* implementation =
        xercesc::DOMImplementationRegistry::getDOMImplementation(u"LS");
    xercesc::MemoryManager* memory = xercesc::XMLPlatformUtils::fgMemoryManager;
    const Released<xercesc::DOMLSSerializer> writer(implementation->createLSSerializer(memory));
    const Released<xercesc::DOMLSOutput> output(implementation->createLSOutput(memory));
    writer->getDomConfig()->setParameter(xercesc::XMLUni::fgDOMWRTFormatPrettyPrint, true);
    writer->setFilter(&const_cast<xercesc::DOMLSSerializerFilter&>(filter));
    output->setEncoding(u"UTF-8");
    output->setByteStream(&target);
    complete = writer->write(&document, output.get());
}

// One child of a record, laid out as the serializer does it. `value` needs no escapes.
void AddChildLine(std::string& text, std::string_view name, std::string_view value) {
    text.append("\n    <").append(name).append(">").append(value);
    text.append("</").append(name).append(">");
}

std::string NameOf(ElementName name) {
    const std::u16string_view wide = kElementNames[static_cast<int>(name)];
    std::string narrow;
    NarrowAscii(wide, narrow);
    return narrow;
}

// Red, green, blue and alpha in the space that is given, which has room for them.
std::string_view FormatColor(const Color& color, std::span<char, 16> space) {
    char* at = space.data();
    for (const std::uint8_t channel : {color.red, color.green, color.blue, color.alpha}) {
        if (at != space.data()) *at++ = '|';
        at = std::to_chars(at, space.data() + space.size(), channel).ptr;
    }
    return {space.data(), static_cast<std::size_t>(at - space.data())};
}

// All colours below `nextIndex`; those that the palette lacks are null.
void AddColorLines(std::string& text, const Palette& palette) {
    const std::string name = NameOf(ElementName::PALETTE_RGBA);
    const Color nullColor;
    char space[16];
    auto entry = palette.colors.begin();
    for (std::uint32_t i = 0; i < palette.nextIndex; ++i) {
        const bool present = entry != palette.colors.end() && entry->first == i;
        const bool known = present && entry->second;
        AddChildLine(text, name, FormatColor(known ? *entry->second : nullColor, space));
        if (present) ++entry;
    }
}

std::string FormatPaletteChildren(std::uint32_t band, const Palette& palette) {
    constexpr std::size_t kUsualLine = 48;
    std::string text;
    text.reserve((std::size_t{palette.nextIndex} + 3) * kUsualLine);
    AddChildLine(text, NameOf(ElementName::PALETTE_BAND), FormatDecimal(band));
    AddChildLine(text, NameOf(ElementName::PALETTE_COUNT), FormatDecimal(palette.nextIndex));
    AddColorLines(text, palette);
    return text.append("\n  "), text;
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

// Writes the children of records in the place of the comments that stand for them. The serializer
// hands on what it writes as it goes, so that the text so far ends with the tag of the record; if
// it did not, the text would be no document.
class PyramidXMLDocument::TextFiller : public xercesc::DOMLSSerializerFilter {
public:
    TextFiller(const ChildTexts& texts, xercesc::MemBufFormatTarget& text)
        : childTexts(texts), target(text) {}

    FilterAction acceptNode(const xercesc::DOMNode* node) const override {
        const auto found = childTexts.find(node);
        if (found == childTexts.end()) return FILTER_ACCEPT;
        const std::string& text = found->second.text;
        const XMLSize_t length = target.getLen();
        // unreachable: the serializer has written the start of the record before it asks for this
        failed |= length == 0 || target.getRawBuffer()[length - 1] != '>';
        target.writeChars(reinterpret_cast<const XMLByte*>(text.data()), text.size(), nullptr);
        return FILTER_REJECT;
    }
    ShowType getWhatToShow() const override { return xercesc::DOMNodeFilter::SHOW_COMMENT; }

    bool HasFailed() const { return failed; }

private:
    const ChildTexts& childTexts;
    xercesc::MemBufFormatTarget& target;
    mutable bool failed = false;
};

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

PyramidXMLDocument::Taken PyramidXMLDocument::TakeTree(const xercesc::InputSource& source) {
    DropTree();
    FaultCounter handler;
    bool ranOut = false;
    const bool parsed = Attempt("", [&] {
        setErrorHandler(&handler);
        ranOut = RunsOutOfMemory([&] { parse(source); });
        return !ranOut && handler.faults == 0;
    });
    setErrorHandler(nullptr);
    if (ranOut) return Taken::NoMemory;
    if (!parsed) return Taken::Malformed;
    document = adoptDocument();
    elementCount = limits.nodes;
    return Taken::Tree;
}

void PyramidXMLDocument::DropTree() {
    if (document) document->release();
    document = nullptr;
    childTexts.clear();
    elementCount = 0;
}

void PyramidXMLDocument::AppendValueElement(xercesc::DOMElement& parent, ElementName name,
                                            const std::string& text) {
    xercesc::DOMElement* element =
        document->createElement(kElementNames[static_cast<int>(name)].data());
    element->appendChild(document->createTextNode(ToWide(text).c_str()));
    parent.appendChild(element);
}

void PyramidXMLDocument::AppendChildText(xercesc::DOMElement& record, ChildText children) {
    xercesc::DOMNode* const standIn = document->createComment(u"");
    const auto kept = childTexts.emplace(standIn, std::move(children)).first;
    try {
        record.appendChild(standIn);
    } catch (...) {
        childTexts.erase(kept);
        throw;
    }
}

void PyramidXMLDocument::ForgetChildText(const xercesc::DOMElement& record) {
    childTexts.erase(record.getFirstChild());
}

void PyramidXMLDocument::Abandon(xercesc::DOMElement& record) {
    ForgetChildText(record);
    record.release();
}

std::uint64_t PyramidXMLDocument::ElementsOf(const xercesc::DOMElement& record) const {
    const auto children = childTexts.find(record.getFirstChild());
    return 1 + (children != childTexts.end() ? children->second.count
                                             : std::uint64_t{record.getChildElementCount()});
}

// The children are built aside, so that a record is appended whole or not at all.
template <class Build>
bool PyramidXMLDocument::AppendRecord(ElementName name, Build build) {
    if (!document) return false;
    return Attempt("", [&] {
        xercesc::DOMElement* record =
            document->createElement(kElementNames[static_cast<int>(name)].data());
        try {
            build(*record);
            const std::uint64_t count = ElementsOf(*record);
            if (elementCount + count <= kMaxDocumentNodes) {
                document->getDocumentElement()->appendChild(record);
                elementCount += count;
                return true;
            }
        } catch (...) {
            Abandon(*record);
            throw;
        }
        Abandon(*record);
        return false;
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
        AppendChildText(
            record, {FormatPaletteChildren(band, palette), 2 + std::uint64_t{palette.nextIndex}});
    });
}

bool PyramidXMLDocument::SerializeDocument(files::ByteSource& file, std::uint64_t offset) {
    tooLong = false;
    if (!document) return false;
    return Attempt("Exception when serializing the XML:\n", [&] {
        xercesc::MemBufFormatTarget target(1023);
        const TextFiller filler(childTexts, target);
        bool complete = false;
        Serialize(*document, target, filler, complete);
        const std::size_t length = target.getLen();
        tooLong = length > kMaxDocumentBytes;
        // unreachable: the filler does not fail, and a target in memory takes all
        if (!complete || filler.HasFailed()) return false;
        if (tooLong) return false;
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
        ForgetChildText(*last);
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
