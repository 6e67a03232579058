// PyramidXMLDocument: one DOM document with the root DATASET, as it stands in a pyramid file.
//
// The header document is written once, when a file is laid out; the metadata document grows by one
// element per record and is rewritten whole after every change, in place. Xerces-C++ must have been
// initialised by the host. Failures are written to the standard error stream; nothing throws. One
// thread at a time.
//
// The object stands without a tree until CreateDocument or ParseTree succeeds, and then refuses
// every record. So it does for records that would take the document beyond what readers accept
// (DocumentLimits.h).
//
// A palette may have 65,536 colours, each an element with a text: in the tree it is an element with
// a comment, which stands for its children, and those are kept as the text that they are written
// as.
#ifndef ZMC_PYRAMID_PYRAMIDXMLDOCUMENT_H
#define ZMC_PYRAMID_PYRAMIDXMLDOCUMENT_H

#include <cstdint>
#include <map>
#include <memory>
#include <string>

#include <xercesc/parsers/XercesDOMParser.hpp>

#include "colour/Palette.h"
#include "files/ByteSource.h"
#include "format/BoundedParser.h"
#include "format/ElementNames.h"
#include "format/PyramidHeaderRecord.h"
#include "raster/RasterBandHistogram.h"
#include "raster/RasterBandStats.h"

namespace XERCES_CPP_NAMESPACE {
class DOMDocument;
class DOMElement;
class DOMNode;
class InputSource;
}  // namespace XERCES_CPP_NAMESPACE

namespace zelm {

class PyramidXMLDocument : public BoundedParser<xercesc::XercesDOMParser> {
public:
    xercesc::DOMDocument* document = nullptr;  // the tree, owned, or null

    // A new object without a tree; null if memory ran out.
    static std::unique_ptr<PyramidXMLDocument> Make();
    PyramidXMLDocument();
    ~PyramidXMLDocument() override;
    PyramidXMLDocument(const PyramidXMLDocument&) = delete;
    PyramidXMLDocument& operator=(const PyramidXMLDocument&) = delete;

    // Makes an empty document with the root DATASET, encoding UTF-8.
    bool CreateDocument();
    // Takes the tree of the text, or stands without one, and in silence, if the text is malformed
    // or memory runs out.
    enum class Taken { Tree, Malformed, NoMemory };
    Taken TakeTree(const xercesc::InputSource& source);
    // The same; true for a tree.
    bool ParseTree(const xercesc::InputSource& source) { return TakeTree(source) == Taken::Tree; }
    void DropTree();

    // Each appends one element with its children. False, with nothing appended, if there is no
    // document, or it would grow beyond the limits, or memory ran out.
    bool WriteHeaderElement(const PyramidHeaderRecord& header);
    template <class T>
    bool WriteBandStatsElement(const RasterBandStats<T>& stats);
    template <class T>
    bool WriteHistogramElement(const RasterBandHistogram<T>& histogram);
    bool WritePaletteElement(std::uint32_t band, const Palette& palette);

    // Makes the element with one text node and appends it to `parent`. May throw what Xerces does.
    void AppendValueElement(xercesc::DOMElement& parent, ElementName name, const std::string& text);

    // Writes the whole document at the offset, over the one that stands there, in the order of
    // steps of DocumentStore.h. False, with a message where Xerces gives one, if there is none, or
    // it is beyond the limits, or it cannot be written; the file then keeps what it had, or has a
    // document that no parser accepts. A file that reaches further is filled with line ends, so
    // that the text behind the document, which a writer of longer lines may have left, does not
    // spoil it.
    bool SerializeDocument(files::ByteSource& file, std::uint64_t offset);
    // The last SerializeDocument failed because the text was beyond the limits.
    bool IsTooLong() const { return tooLong; }

    // Number of elements under the root; RemoveFrom takes back all from that position on.
    std::uint32_t RecordCount() const;
    void RemoveFrom(std::uint32_t position);

private:
    // Children of a record that are not in the tree.
    struct ChildText {
        std::string text;
        std::uint64_t count = 0;
    };
    using ChildTexts = std::map<const xercesc::DOMNode*, ChildText>;
    class TextFiller;

    template <class Build>
    bool AppendRecord(ElementName name, Build build);
    void AppendChildText(xercesc::DOMElement& record, ChildText children);
    void ForgetChildText(const xercesc::DOMElement& record);
    // Gives up a record that is not appended.
    void Abandon(xercesc::DOMElement& record);
    // A record and its children, which have none of their own.
    std::uint64_t ElementsOf(const xercesc::DOMElement& record) const;

    ChildTexts childTexts;  // by the comment that stands for them
    bool tooLong = false;
    std::uint64_t elementCount = 0;  // elements of the tree, the root included
};

}  // namespace zelm

#endif
