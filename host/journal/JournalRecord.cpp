#include "host/journal/JournalRecord.h"

#include <utility>

#include "format/DocumentLimits.h"
#include "host/base/Checksum.h"

namespace zmchost {
namespace {

constexpr std::string_view kMagic = "ZMCMETA1";
constexpr std::size_t kNumber = 8;
// Seven numbers stand in front of the texts.
static_assert(JournalRecord::kHeadBytes == kMagic.size() + 7 * kNumber);

void Append(std::string& bytes, std::uint64_t number) {
    for (unsigned i = 0; i < kNumber; ++i) bytes += static_cast<char>(number >> (8 * i));
}

// Takes pieces off the front of some bytes; `good` tells whether there were enough so far.
class Scanner {
public:
    explicit Scanner(std::string_view bytes) : rest(bytes) {}
    std::string_view Text(std::uint64_t size) {
        good = good && size <= rest.size();
        const std::string_view text = rest.substr(0, good ? static_cast<std::size_t>(size) : 0);
        rest.remove_prefix(text.size());
        return text;
    }
    std::uint64_t Number() {
        std::uint64_t number = 0;
        unsigned shift = 0;
        for (const char c : Text(kNumber)) {
            number |= std::uint64_t{static_cast<unsigned char>(c)} << shift;
            shift += 8;
        }
        return number;
    }

private:
    std::string_view rest;
    bool good = true;
};

}  // namespace

const std::uint64_t JournalRecord::kMaxBytes = zelm::kMaxDocumentBytes + 1024;

std::string JournalRecord::Encode() const {
    std::string bytes(kMagic);
    for (const std::uint64_t number : {offset, fileSize, fileNumber, frontSize, frontSum,
                                       std::uint64_t{systemRun.size()}, std::uint64_t{text.size()}})
        Append(bytes, number);
    bytes += systemRun;
    bytes += text;
    Append(bytes, Checksum(bytes));
    return bytes;
}

std::optional<std::uint64_t> JournalRecord::SizeFrom(std::string_view head) {
    if (head.size() < kHeadBytes || !head.starts_with(kMagic)) return std::nullopt;
    Scanner sizes(head.substr(kHeadBytes - 2 * kNumber));
    const std::uint64_t runSize = sizes.Number();
    const std::uint64_t textSize = sizes.Number();
    if (runSize > kMaxBytes || textSize > kMaxBytes) return std::nullopt;
    return kHeadBytes + runSize + textSize + kNumber;
}

std::optional<JournalRecord> JournalRecord::Decode(std::string bytes) {
    if (SizeFrom(std::string_view(bytes).substr(0, kHeadBytes)) != bytes.size())
        return std::nullopt;
    const std::size_t end = bytes.size() - kNumber;
    const std::string_view summed = std::string_view(bytes).substr(0, end);
    if (Scanner(std::string_view(bytes).substr(end)).Number() != Checksum(summed))
        return std::nullopt;
    Scanner scanner(summed.substr(kMagic.size()));
    JournalRecord record;
    for (std::uint64_t* number : {&record.offset, &record.fileSize, &record.fileNumber,
                                  &record.frontSize, &record.frontSum})
        *number = scanner.Number();
    const std::uint64_t runSize = scanner.Number();
    static_cast<void>(scanner.Number());
    record.systemRun = scanner.Text(runSize);
    bytes.resize(end);
    bytes.erase(0, kHeadBytes + record.systemRun.size());
    record.text = std::move(bytes);
    return record;
}

}  // namespace zmchost
