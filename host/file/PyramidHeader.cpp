#include "host/file/PyramidHeader.h"

#include <algorithm>
#include <charconv>
#include <cstring>
#include <map>
#include <sstream>
#include <stdexcept>
#include <string_view>

#include "core/PixelVocabulary.h"
#include "host/base/Error.h"
#include "host/base/Text.h"
#include "host/file/HeaderScanner.h"
#include "platform/File.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

// These stand in files and never change.
constexpr char kMagic[] = {'K', 'O', 'B', 'T'};
constexpr std::uint64_t kDocumentOffset = 20;
constexpr std::uint64_t kMaxDocument = 1 << 20;
constexpr std::uint64_t kUsualStart = 1024;  // holds the header of every file that is written
constexpr std::uint32_t kMaxTileSize = 2048;
constexpr std::uint32_t kMaxLevel = 63;

[[noreturn]] void Refuse(const std::string& file, const std::string& reason) {
    throw Error(file, "read the header", reason);
}

// Where the file says that its tiles begin; `start` holds both offsets.
std::uint64_t LoadTileDataStart(std::string_view start) {
    std::uint64_t value = 0;
    for (unsigned i = 0; i < 8; ++i)
        value |= std::uint64_t{static_cast<unsigned char>(start[4 + i])} << (8 * i);
    return value;
}

// Where the header document ends, from the first bytes of a file.
std::uint64_t DocumentEnd(const std::string& file, std::string_view start, std::uint64_t fileSize) {
    if (start.size() < kDocumentOffset || std::memcmp(start.data(), kMagic, sizeof kMagic) != 0)
        Refuse(file, "it is no pyramid file");
    const std::uint64_t end = LoadTileDataStart(start);
    if (end <= kDocumentOffset || end - kDocumentOffset > kMaxDocument || end > fileSize)
        Refuse(file, "its header is damaged or was never finished");
    return end;
}

std::string ReadStart(const std::string& file, platform::File& stream, std::size_t size) {
    std::string start(size, '\0');
    if (stream.ReadAt(0, start.data(), size) != size) Refuse(file, "its header cannot be read");
    return start;
}

class Fields {
public:
    Fields(const std::string& fileName, std::string_view document) : file(fileName) {
        try {
            byName = ScanHeaderDocument(document);
        } catch (const std::runtime_error& failure) {
            Refuse(file, failure.what());
        }
    }

    std::uint32_t Number(std::string_view name) const {
        const std::string& text = Text(name);
        std::uint32_t value = 0;
        const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
        if (error != std::errc() || end != text.data() + text.size())
            Refuse(file, std::string(name) + " is no number");
        return value;
    }
    // Words that are not known take the neutral value of the vocabulary, as in the readers.
    template <class Code>
    Code Word(std::string_view name, void (*parse)(std::istream&, Code&)) const {
        Code code{};
        std::istringstream stream(Text(name));
        parse(stream, code);
        return code;
    }

private:
    const std::string& file;
    std::map<std::string, std::string, std::less<>> byName;

    const std::string& Text(std::string_view name) const {
        const auto found = byName.find(name);
        if (found == byName.end()) Refuse(file, std::string(name) + " is missing");
        return found->second;
    }
};

// Whether the bytes of all levels, which are less than twice those of level 0, can be counted.
bool CanBeCounted(const PyramidHeader& header) {
    std::uint64_t bytes = 2;
    for (const std::uint64_t factor :
         {std::uint64_t{header.width}, std::uint64_t{header.height}, std::uint64_t{header.bands},
          std::uint64_t{zelm::PixelSize(header.pixelType)}})
        if (__builtin_mul_overflow(bytes, factor, &bytes)) return false;
    return bytes <= UINT64_MAX - header.tileDataStart;
}

void Check(const std::string& file, const PyramidHeader& header) {
    if (header.tileSize == 0 || header.tileSize > kMaxTileSize)
        Refuse(file, "its tile size is " + std::to_string(header.tileSize));
    if (header.minLevel > header.maxLevel || header.maxLevel > kMaxLevel)
        Refuse(file, "its levels are " + std::to_string(header.minLevel) + " to " +
                         std::to_string(header.maxLevel));
    if (zelm::CheckedPixelType(header.pixelType) == 0) Refuse(file, "its pixel type is not known");
    if (!CanBeCounted(header)) Refuse(file, "its sizes are too large");
}

}  // namespace

std::uint64_t PyramidHeader::LevelBytes(std::uint32_t level) const {
    return (std::uint64_t{width} >> level) * (std::uint64_t{height} >> level) * bands *
           zelm::PixelSize(pixelType);
}

std::uint64_t PyramidHeader::LevelOffset(std::uint32_t level) const {
    std::uint64_t offset = tileDataStart;
    for (std::uint32_t coarser = maxLevel; coarser > level; --coarser)
        offset += LevelBytes(coarser);
    return offset;
}

PyramidHeader PyramidHeader::Read(const std::string& file) {
    const zelm::String name = WideFileName(file);
    const auto stream = platform::File::Open(name.wide, platform::File::Mode::Read);
    if (!stream) Refuse(file, platform::LastErrorText());
    const std::uint64_t size = stream->Size();
    std::string start =
        ReadStart(file, *stream, static_cast<std::size_t>(std::min(size, kUsualStart)));
    const std::uint64_t end = DocumentEnd(file, start, size);
    if (end > start.size()) start = ReadStart(file, *stream, static_cast<std::size_t>(end));
    return Parse(file, start, size);
}

bool PyramidHeader::IsWhole(std::string_view start) {
    return start.size() >= kDocumentOffset && LoadTileDataStart(start) <= start.size();
}

PyramidHeader PyramidHeader::Parse(const std::string& file, std::string_view start,
                                   std::uint64_t fileSize) {
    PyramidHeader header;
    header.fileSize = fileSize;
    header.tileDataStart = DocumentEnd(file, start, fileSize);
    if (header.tileDataStart > start.size()) Refuse(file, "its header cannot be read");
    const Fields fields(
        file, start.substr(kDocumentOffset,
                           static_cast<std::size_t>(header.tileDataStart - kDocumentOffset)));
    header.versionMajor = fields.Number("HEADER_VERSION_MAJOR");
    header.versionMinor = fields.Number("HEADER_VERSION_MINOR");
    header.bands = fields.Number("HEADER_BANDS");
    header.width = fields.Number("HEADER_PIXEL_WIDTH");
    header.height = fields.Number("HEADER_PIXEL_HEIGHT");
    header.tileSize = fields.Number("HEADER_TILESIZE");
    header.minLevel = fields.Number("HEADER_LEVELMIN");
    header.maxLevel = fields.Number("HEADER_LEVELMAX");
    header.pixelType = fields.Word("HEADER_PIXEL_TYPE", zelm::ParsePixelType);
    header.interleave = fields.Word("HEADER_INTERLEAVE", zelm::ParseInterleave);
    header.tileOrdering = fields.Word("HEADER_BUILD_METHOD", zelm::ParseTileOrder);
    Check(file, header);
    header.tileDataEnd = header.LevelOffset(header.minLevel) + header.LevelBytes(header.minLevel);
    return header;
}

}  // namespace zmchost
