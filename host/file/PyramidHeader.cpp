#include "host/file/PyramidHeader.h"

#include <algorithm>

#include "core/PixelVocabulary.h"
#include "files/FileSource.h"
#include "format/DocumentLimits.h"
#include "format/HeaderParser.h"
#include "format/PyramidFront.h"
#include "format/PyramidLimits.h"
#include "host/base/Error.h"
#include "host/base/Text.h"
#include "host/base/Xerces.h"
#include "host/file/Limits.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

using zelm::files::ByteSource;
using zelm::files::FileSource;
using zelm::files::OpenMode;

constexpr std::uint64_t kUsualStart = 1024;  // holds the header of every file that is written

[[noreturn]] void Refuse(const std::string& name, const std::string& reason) {
    throw Error(name, "read the header", reason);
}

void Demand(const std::string& name, std::uint64_t Limits::*limit, std::uint64_t claimed,
            const std::string& what) {
    if (const std::string wrong = Limits::Current().Judge(limit, claimed, what); !wrong.empty())
        Refuse(name, wrong);
}

// Where the tiles begin, from the first bytes of a file.
std::uint64_t TileDataStart(const std::string& name, std::string_view start,
                            std::uint64_t fileSize) {
    zelm::PyramidFront front;
    const zelm::FrontFault fault = zelm::DecodeFront(start, fileSize, front);
    if (fault == zelm::FrontFault::NoPyramid) Refuse(name, "it is no pyramid file");
    if (fault == zelm::FrontFault::NoHeader || front.HeaderBytes() > zelm::kMaxDocumentBytes)
        Refuse(name, "its header is damaged or was never finished");
    Demand(name, &Limits::header, front.HeaderBytes(),
           "its header has " + std::to_string(front.HeaderBytes()) + " bytes");
    return front.tileDataStart;
}

std::string ReadStart(const std::string& name, ByteSource& source, std::uint64_t size) {
    std::string start(static_cast<std::size_t>(size), '\0');
    int error = 0;
    if (source.ReadAt(0, start.data(), start.size(), &error) != start.size())
        Refuse(name, error != 0 ? platform::ErrorText(error) : "its header cannot be read");
    return start;
}

// The module opens some of these, and then gives no sample.
void Check(const std::string& name, const PyramidHeader& header) {
    using namespace zelm::PyramidLimits;
    if (header.tileSize == 0 || header.tileSize > kMaxTileSize)
        Refuse(name, "its tile size is " + std::to_string(header.tileSize));
    if (header.levelMin > header.levelMax || header.levelMax > kMaxLevel)
        Refuse(name, "its levels are " + std::to_string(header.levelMin) + " to " +
                         std::to_string(header.levelMax));
    if (zelm::CheckedPixelType(header.pixelType) == 0) Refuse(name, "its pixel type is not known");
    if (!Allow(header)) Refuse(name, "its sizes are too large");
    Demand(name, &Limits::bands, header.bandCount,
           "it has " + std::to_string(header.bandCount) + " bands");
}

}  // namespace

PyramidHeader PyramidHeader::Read(const std::string& file) {
    int error = 0;
    const auto source = FileSource::Open(WideFileName(file), OpenMode::Read, &error);
    if (!source) Refuse(file, platform::ErrorText(error));
    return Read(*source, file);
}

PyramidHeader PyramidHeader::Read(ByteSource& source, const std::string& name) {
    std::uint64_t size = 0;
    int error = 0;
    if (!source.TellSize(size, &error)) Refuse(name, platform::ErrorText(error));
    std::string start = ReadStart(name, source, std::min(size, kUsualStart));
    const std::uint64_t end = TileDataStart(name, start, size);
    if (end > start.size()) start = ReadStart(name, source, end);
    return Parse(name, start, size);
}

bool PyramidHeader::IsWhole(std::string_view start) {
    zelm::PyramidFront front;
    return zelm::DecodeFront(start, start.size(), front) == zelm::FrontFault::None;
}

PyramidHeader PyramidHeader::Parse(const std::string& name, std::string_view start,
                                   std::uint64_t fileSize) {
    PyramidHeader header;
    header.fileSize = fileSize;
    header.tileDataStart = TileDataStart(name, start, fileSize);
    if (header.tileDataStart > start.size()) Refuse(name, "its header cannot be read");
    InitialiseXerces();
    const std::string_view text = start.substr(0, static_cast<std::size_t>(header.tileDataStart))
                                      .substr(zelm::PyramidFront::kHeaderOffset);
    if (const std::string wrong = zelm::ParseHeaderText(text, header); !wrong.empty())
        Refuse(name, wrong);
    Check(name, header);
    header.tileDataEnd = header.tileDataStart + header.TileDataBytes();
    return header;
}

}  // namespace zmchost
