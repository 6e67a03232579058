#include "format/HeaderParser.h"

#include <atomic>
#include <locale>
#include <memory>
#include <sstream>
#include <utility>

#include "format/DocumentParse.h"
#include "format/NumberText.h"

namespace zelm {
namespace {

using enum ElementName;

template <class Code>
Code ReadWord(void (*parse)(std::istream&, Code&), std::string_view text) {
    std::istringstream stream{std::string(text)};
    stream.imbue(std::locale::classic());
    Code code{};
    parse(stream, code);
    return code;
}

class HeaderReader : public FaultReader {
public:
    PyramidHeaderRecord record;

protected:
    void TakeText(ElementName name, std::string_view text) override {
        TakeHeaderText(record, name, text);
    }
};

// A header that was read. The files of a mosaic have one text between them, a file is opened more
// than once, and to parse costs more than all the rest of looking at a header. Taken out while it
// is looked at: who finds none parses. The last is not destroyed, since others may still be at
// work.
struct KnownHeader {
    std::string text;
    PyramidHeaderRecord record;
};
constexpr std::size_t kMaxKnownText = 4096;
std::atomic<KnownHeader*> lastHeader = nullptr;

void Keep(std::unique_ptr<KnownHeader> header) {
    const std::unique_ptr<KnownHeader> other(lastHeader.exchange(header.release()));
}

bool Recall(std::string_view text, PyramidHeaderRecord& record) {
    std::unique_ptr<KnownHeader> last(lastHeader.exchange(nullptr));
    if (!last) return false;
    const bool known = last->text == text;
    if (known) record = last->record;
    Keep(std::move(last));
    return known;
}

}  // namespace

void TakeHeaderText(PyramidHeaderRecord& record, ElementName name, std::string_view text) {
    switch (name) {
        case HEADER_VERSION_MAJOR:
            record.versionMajor = ReadInteger(text);
            break;
        case HEADER_VERSION_MINOR:
            record.versionMinor = ReadInteger(text);
            break;
        case HEADER_BANDS:
            record.bandCount = ReadInteger(text);
            break;
        case HEADER_PIXEL_WIDTH:
            record.width = ReadInteger(text);
            break;
        case HEADER_PIXEL_HEIGHT:
            record.height = ReadInteger(text);
            break;
        case HEADER_TILESIZE:
            record.tileSize = ReadInteger(text);
            break;
        case HEADER_LEVELMIN:
            record.levelMin = ReadInteger(text);
            break;
        case HEADER_LEVELMAX:
            record.levelMax = ReadInteger(text);
            break;
        case HEADER_INTERLEAVE:
            record.interleave = ReadWord(ParseInterleave, text);
            break;
        case HEADER_BUILD_METHOD:
            record.tileOrdering = ReadWord(ParseTileOrder, text);
            break;
        case HEADER_PIXEL_TYPE:
            record.pixelType = ReadWord(ParsePixelType, text);
            break;
        default:
            break;
    }
}

std::string ParseHeaderText(std::string_view text, PyramidHeaderRecord& record) {
    if (Recall(text, record)) return "";
    HeaderReader reader;
    std::string wrong = ParseDocumentText(std::string(text), reader);
    if (!wrong.empty()) return wrong;
    record = reader.record;
    if (text.size() <= kMaxKnownText)
        Keep(std::make_unique<KnownHeader>(KnownHeader{std::string(text), record}));
    return "";
}

}  // namespace zelm
