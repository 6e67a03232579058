#include "gdal/GeoKeys.h"

#include <cstdint>
#include <memory>
#include <utility>

#include "files/FileSource.h"
#include "host/base/Error.h"
#include "host/base/Text.h"

namespace zmcgdal {
namespace {

using zelm::files::FileSource;

constexpr std::uint64_t kMostEntries = 1024;
constexpr std::uint64_t kMostBytes = std::uint64_t{1} << 16;  // of a tag

class TiffReader {
public:
    explicit TiffReader(const std::string& path)
        : file(FileSource::Open(zmchost::WideFileName(path), zelm::files::OpenMode::Read)) {}

    std::optional<std::string> Keys() {
        if (!file || !Read(0, 16)) return std::nullopt;
        isBig = bytes.starts_with("MM");
        if (!isBig && !bytes.starts_with("II")) return std::nullopt;
        const std::uint64_t version = Number(2, 2);
        isLong = version == 43;
        if (version != 42 && !isLong) return std::nullopt;
        const std::uint64_t directory = isLong ? Number(8, 8) : Number(4, 4);
        const std::uint64_t countSize = isLong ? 8 : 2, entrySize = isLong ? 20 : 12;
        if (!Read(directory, countSize)) return std::nullopt;
        const std::uint64_t count = Number(0, countSize);
        if (count > kMostEntries || !Read(directory + countSize, count * entrySize))
            return std::nullopt;
        const std::string entries = std::move(bytes);
        std::string keys;
        for (std::uint64_t i = 0; i < count; ++i) {
            bytes = entries.substr(static_cast<std::size_t>(i * entrySize),
                                   static_cast<std::size_t>(entrySize));
            const std::uint64_t tag = Number(0, 2);
            if (tag < 34735 || tag > 34737) continue;
            if (!ReadTag()) return std::nullopt;
            keys += std::to_string(tag) + ':' + std::to_string(bytes.size()) + ':' + bytes;
        }
        return std::string(isBig ? "M" : "I") + keys;
    }

private:
    // From an entry to the bytes that it stands for.
    bool ReadTag() {
        const std::uint64_t type = Number(2, 2);
        const std::uint64_t unit = type == 12 ? 8 : type == 3 ? 2 : type == 2 ? 1 : 0;
        const std::uint64_t word = isLong ? 8 : 4;
        const std::uint64_t count = Number(4, word);
        if (unit == 0 || count > kMostBytes / unit) return false;
        const std::uint64_t size = count * unit;
        if (size > word) return Read(Number(4 + word, word), size);
        bytes = bytes.substr(static_cast<std::size_t>(4 + word), static_cast<std::size_t>(size));
        return true;
    }

    bool Read(std::uint64_t offset, std::uint64_t size) {
        bytes.resize(static_cast<std::size_t>(size));
        return file->ReadAt(offset, bytes.data(), bytes.size()) == size;
    }

    std::uint64_t Number(std::uint64_t place, std::uint64_t size) const {
        std::uint64_t number = 0;
        for (std::uint64_t i = 0; i < size; ++i) {
            const std::uint64_t at = place + (isBig ? i : size - 1 - i);
            number = number << 8 | static_cast<unsigned char>(bytes[static_cast<std::size_t>(at)]);
        }
        return number;
    }

    std::shared_ptr<FileSource> file;
    std::string bytes;
    bool isBig = false;   // the upper byte of a number stands first
    bool isLong = false;  // BigTIFF
};

}  // namespace

std::optional<std::string> GeoKeysOf(const std::string& path) try {
    return TiffReader(path).Keys();
} catch (const zmchost::Error&) {
    return std::nullopt;
}

}  // namespace zmcgdal
