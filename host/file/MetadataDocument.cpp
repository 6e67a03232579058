#include "host/file/MetadataDocument.h"

#include <algorithm>
#include <memory>
#include <utility>

#include "files/FileSource.h"
#include "format/DocumentLimits.h"
#include "format/DocumentParse.h"
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

const std::string kSubject = "the metadata document";
constexpr std::uint64_t kPiece = std::uint64_t{1} << 20;

class RootReader : public zelm::FaultReader {
public:
    bool hasOurRoot = false;

protected:
    void Enter(std::int32_t state) override {
        if (stateStack.size() == 1) hasOurRoot = state == StateOf(zelm::ElementName::DATASET);
    }
};

[[noreturn]] void FailToRead(const std::string& name, const std::string& reason) {
    throw Error(name, "read its metadata document", reason);
}

std::shared_ptr<FileSource> OpenFile(const std::string& file) {
    int error = 0;
    auto source = FileSource::Open(WideFileName(file), OpenMode::Read, &error);
    if (!source) FailToRead(file, platform::ErrorText(error));
    return source;
}

// Bytes behind the tiles.
std::uint64_t DocumentSize(ByteSource& source, const std::string& name,
                           const PyramidHeader& header) {
    std::uint64_t size = 0;
    int error = 0;
    if (!source.TellSize(size, &error)) FailToRead(name, platform::ErrorText(error));
    return size > header.tileDataEnd ? size - header.tileDataEnd : 0;
}

std::string JudgeSize(const std::string& subject, std::uint64_t bytes) {
    if (bytes > zelm::kMaxDocumentBytes)
        return subject + " is longer than " + std::to_string(zelm::kMaxDocumentBytes >> 20) +
               " MiB";
    return Limits::Current().Judge(&Limits::document, bytes,
                                   subject + " has " + std::to_string(bytes) + " bytes");
}

}  // namespace

std::string JudgeMetadataBytes(std::string_view text) {
    const std::string subject = kSubject + " ";
    if (text.find_first_not_of(" \t\r\n") == text.npos) return subject + "is empty";
    if (static_cast<unsigned char>(text.front()) == zelm::kUnfinishedDocument)
        return subject + "is damaged: a store did not end";
    if (text.find('\0') != text.npos) return subject + "holds bytes of 0";
    if ((text.back() & 0x80) != 0) return subject + "ends in the middle of a character";
    return "";
}

std::string JudgeMetadataParse(const std::string& fault, bool hasOurRoot) {
    if (!fault.empty()) return kSubject + " is malformed: " + fault;
    return hasOurRoot ? "" : kSubject + " has no root DATASET";
}

std::string JudgeMetadataSize(std::uint64_t bytes) { return JudgeSize(kSubject, bytes); }

std::string JudgeMetadataText(std::string text) {
    if (std::string wrong = JudgeMetadataBytes(text); !wrong.empty()) return wrong;
    InitialiseXerces();
    RootReader reader;
    const std::string fault = zelm::ParseDocumentText(std::move(text), reader);
    return JudgeMetadataParse(fault, reader.hasOurRoot);
}

std::string ReadMetadataText(ByteSource& source, const std::string& name,
                             const PyramidHeader& header) {
    const std::uint64_t size = DocumentSize(source, name, header);
    if (const std::string wrong = JudgeSize("it", size); !wrong.empty()) FailToRead(name, wrong);
    std::string text;
    // What has a NUL is no document, and the rest of it, which may be a hole, is not read.
    for (bool hasNul = false; !hasNul && text.size() < size;) {
        const std::size_t before = text.size();
        const auto piece = static_cast<std::size_t>(std::min<std::uint64_t>(size - before, kPiece));
        text.resize(before + piece);
        int error = 0;
        if (source.ReadAt(header.tileDataEnd + before, text.data() + before, piece, &error) !=
            piece)
            FailToRead(name, error != 0 ? platform::ErrorText(error) : "the file was cut");
        hasNul = text.find('\0', before) != text.npos;
    }
    return text;
}

std::string ReadMetadataText(const std::string& file, const PyramidHeader& header) {
    return ReadMetadataText(*OpenFile(file), file, header);
}

std::string JudgeMetadata(ByteSource& source, const std::string& name,
                          const PyramidHeader& header) {
    if (std::string wrong = JudgeMetadataSize(DocumentSize(source, name, header)); !wrong.empty())
        return wrong;
    std::string text = ReadMetadataText(source, name, header);
    return text.empty() ? "" : JudgeMetadataText(std::move(text));
}

std::string JudgeMetadata(const std::string& file, const PyramidHeader& header) {
    return JudgeMetadata(*OpenFile(file), file, header);
}

}  // namespace zmchost
