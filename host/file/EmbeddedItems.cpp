#include "host/file/EmbeddedItems.h"

#include <cstdint>

#include "format/DocumentLimits.h"
#include "format/DocumentParse.h"
#include "format/DocumentText.h"
#include "format/XercesText.h"
#include "host/base/Error.h"
#include "host/base/Xerces.h"
#include "host/file/MetadataDocument.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

using zelm::files::ByteSource;

// As the serializer of the documents writes the beginning of each.
constexpr std::string_view kDocumentStart =
    "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"no\" ?>\n<DATASET>";
constexpr std::string_view kItemsStart = "\n\n  <SIDECAR>";
constexpr std::string_view kItemsEnd = "</SIDECAR>";
constexpr std::string_view kDocumentEnd = "\n\n</DATASET>\n";
constexpr char16_t kElement[] = u"SIDECAR";

// The root is the first element, and its child the second.
constexpr int kItemsDepth = 2;

[[noreturn]] void Fail(const std::string& name, const std::string& reason) {
    throw Error(name, "keep its metadata in the file", reason);
}

// Whether a document begins as one with items does. Of its first byte a store takes its hands last.
bool BeginsWithItems(std::string_view start) {
    const std::string expected = std::string(kDocumentStart) + std::string(kItemsStart);
    return start.size() >= expected.size() && !start.empty() &&
           start.substr(1).starts_with(std::string_view(expected).substr(1));
}

// A line end of one kind is made of another, and control characters are refused by every parser.
void AppendEscaped(std::string& text, std::string_view items) {
    for (const char c : items) {
        if (c == '&')
            text += "&amp;";
        else if (c == '<')
            text += "&lt;";
        else if (c == '>')
            text += "&gt;";
        else if (static_cast<unsigned char>(c) < ' ' && c != '\n' && c != '\t')
            text += "&amp;#" + std::to_string(static_cast<int>(c)) + ';';
        else
            text += c;
    }
}

std::string WithItems(const std::string& name, const std::string& document,
                      std::string_view items) {
    if (!document.empty() && !document.starts_with(kDocumentStart))
        Fail(name, "its metadata document begins in another way than those of this project");
    if (BeginsWithItems(document)) Fail(name, "the file keeps metadata already");
    std::string text(kDocumentStart);
    text += kItemsStart;
    AppendEscaped(text, items);
    text += kItemsEnd;
    if (document.empty()) return text.append(kDocumentEnd);
    return text.append(document, kDocumentStart.size());
}

void CheckDocument(const std::string& name, const std::string& text) {
    std::string wrong = JudgeMetadataSize(text.size());
    if (wrong.empty()) wrong = JudgeMetadataText(text);
    if (!wrong.empty()) Fail(name, "with it " + wrong);
}

void WriteAt(ByteSource& file, const std::string& name, std::uint64_t offset,
             std::string_view text) {
    int error = 0;
    if (file.WriteAt(offset, text.data(), text.size(), &error) != text.size())
        Fail(name, platform::ErrorText(error));
}

// Marked as unfinished while it is.
void WriteDocument(ByteSource& file, const std::string& name, std::uint64_t offset,
                   std::string_view text) {
    constexpr char mark = zelm::kUnfinishedDocument;
    WriteAt(file, name, offset, {&mark, 1});
    WriteAt(file, name, offset + 1, text.substr(1));
    WriteAt(file, name, offset, text.substr(0, 1));
    int error = 0;
    if (!file.Sync(&error)) Fail(name, platform::ErrorText(error));
}

// A text comes in pieces, which may divide a character.
class ItemsReader final : public zelm::FaultReader {
public:
    std::u16string text;

    void startElement(const XMLCh* const name, xercesc::AttributeList&) override {
        ++depth;
        inside = !found && depth == kItemsDepth && std::u16string_view(name) == kElement;
        found |= inside;
    }
    void endElement(const XMLCh* const) override {
        --depth;
        inside = false;
    }
    void characters(const XMLCh* const piece, const XMLSize_t length) override {
        if (inside) text.append(piece, length);
    }

private:
    int depth = 0;
    bool inside = false, found = false;
};

}  // namespace

void EmbedItems(ByteSource& file, const std::string& name, std::string_view items) {
    const PyramidHeader header = PyramidHeader::Read(file, name);
    if (header.BytesMissing() > 0) Fail(name, "the pyramid is incomplete");
    const std::string document = ReadMetadataText(file, name, header);
    const std::string text = WithItems(name, document, items);
    CheckDocument(name, text);
    WriteDocument(file, name, header.tileDataEnd, text);
}

std::string ReadEmbeddedItems(ByteSource& file, const std::string& name,
                              const PyramidHeader& header) {
    if (header.fileSize <= header.tileDataEnd) return "";
    char start[kDocumentStart.size() + kItemsStart.size()] = {};
    if (!BeginsWithItems({start, file.ReadAt(header.tileDataEnd, start, sizeof start)})) return "";
    const std::string wrong = JudgeMetadataSize(header.fileSize - header.tileDataEnd);
    if (!wrong.empty()) throw Error(name, "read its metadata document", wrong);
    zelm::DocumentText document = zelm::DocumentText::Take(file, header.tileDataEnd);
    if (!document.bytes) return "";
    InitialiseXerces();
    ItemsReader reader;
    std::string fault;
    fault = zelm::ParseDocumentBytes(document.bytes.get(), document.size, reader, reader.fault);
    return fault.empty() ? zelm::ToNarrow(reader.text.c_str()) : "";
}

}  // namespace zmchost
