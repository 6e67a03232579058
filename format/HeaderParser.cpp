#include "format/HeaderParser.h"

#include <locale>
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

std::string ParseHeaderText(std::string text, PyramidHeaderRecord& record) {
    HeaderReader reader;
    std::string wrong = ParseDocumentText(std::move(text), reader);
    if (wrong.empty()) record = reader.record;
    return wrong;
}

}  // namespace zelm
