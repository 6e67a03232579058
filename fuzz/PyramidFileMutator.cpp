// Mutations for whole files that keep what a blind one breaks: the offset behind the header
// document, the place of the metadata document, the script behind the file. Half of them touch one
// part and put the file together again; the others are libFuzzer's own on all bytes.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <random>
#include <string>
#include <string_view>

#include "format/PyramidFront.h"
#include "fuzz/support/FileAndScript.h"

extern "C" std::size_t LLVMFuzzerMutate(std::uint8_t* data, std::size_t size, std::size_t maxSize);

namespace {

constexpr std::size_t kFront = zelm::PyramidFront::kHeaderOffset;

const char* const kFields[] = {"BANDS",      "PIXEL_HEIGHT", "PIXEL_WIDTH",   "TILESIZE",
                               "LEVELMIN",   "LEVELMAX",     "VERSION_MAJOR", "VERSION_MINOR",
                               "INTERLEAVE", "BUILD_METHOD", "PIXEL_TYPE"};
constexpr std::size_t kNumbers = 8;
const char* const kNumberTexts[] = {"0",          "1",          "2",       "3",
                                    "4",          "5",          "7",       "8",
                                    "9",          "15",         "16",      "17",
                                    "31",         "32",         "33",      "63",
                                    "64",         "255",        "256",     "1023",
                                    "1024",       "2048",       "2049",    "65535",
                                    "65536",      "65537",      "1048576", "2147483647",
                                    "2147483648", "4294967295", "-1",      "99999999999999999999"};
const char* const kWords[] = {
    "None",   "BIP",           "BIL",           "BSQ",    "Scanline", "Blocked", "Morton", "Byte",
    "Char",   "UInt16",        "Int16",         "UInt32", "Int32",    "UInt64",  "Int64",  "Single",
    "Double", "ComplexSingle", "ComplexDouble", "Quad",   "Bool",     "USHORT"};
const char* const kRecords[] = {
    "<BANDSTATISTICS><RSTC_BAND>1</RSTC_BAND><RSTC_LEVEL>0</RSTC_LEVEL>"
    "<RSTC_MINIMUM>3</RSTC_MINIMUM><RSTC_MEAN>1.5</RSTC_MEAN></BANDSTATISTICS>",
    "<HISTOGRAMS><HIST_BAND>0</HIST_BAND><HIST_BINCOUNT>3</HIST_BINCOUNT>"
    "<HIST_COUNTS>1|2|3</HIST_COUNTS></HISTOGRAMS>",
    "<PALETTE><PALETTE_BAND>1</PALETTE_BAND><PALETTE_COUNT>1</PALETTE_COUNT>"
    "<PALETTE_RGBA>1|2|3|4</PALETTE_RGBA></PALETTE>"};

using Random = std::minstd_rand;

template <class T, std::size_t N>
const T& Pick(const T (&list)[N], Random& random) {
    return list[random() % N];
}

// An input in its parts; each may be empty.
struct Parts {
    std::string front;   // magic and offsets
    std::string header;  // document
    std::string pixels;
    std::string metadata;  // document
    std::string script;

    Parts(const std::uint8_t* data, std::size_t size) {
        const zmcfuzz::FileAndScriptBytes input(data, size);
        script = input.script;
        std::string_view file = input.file;
        front = file.substr(0, kFront);
        file.remove_prefix(front.size());
        const std::string_view end = "</DATASET>";
        const std::size_t headerEnd = file.find(end);
        if (headerEnd != file.npos) {
            header = file.substr(0, headerEnd + end.size());
            file.remove_prefix(header.size());
        }
        std::size_t start = file.find("<?xml");
        if (start == file.npos) start = file.find("<DATASET");
        pixels = file.substr(0, start);
        if (start != file.npos) metadata = file.substr(start);
    }

    std::size_t Write(std::uint8_t* data, std::size_t maxSize) {
        front.resize(kFront);
        std::memcpy(front.data(), zelm::PyramidFront::kMagic, sizeof zelm::PyramidFront::kMagic);
        const std::uint64_t start = kFront + header.size();
        for (std::size_t i = 0; i < 8; ++i) front[4 + i] = static_cast<char>(start >> (8 * i));
        script.resize(std::min<std::size_t>(script.size(), 255));
        std::string all = front + header + pixels + metadata + script;
        all += static_cast<char>(script.size());
        if (all.size() > maxSize) return 0;
        std::copy(all.begin(), all.end(), data);
        return all.size();
    }

    // Where the text of a header field begins and ends.
    bool Find(const std::string& name, std::size_t& from, std::size_t& to) const {
        const std::string open = "<HEADER_" + name + ">";
        from = header.find(open);
        if (from == header.npos) return false;
        from += open.size();
        to = header.find('<', from);
        return to != header.npos;
    }
    std::uint64_t Number(const std::string& name) const {
        std::size_t from, to;
        if (!Find(name, from, to)) return 0;
        std::uint64_t value = 0;
        for (const char c : header.substr(from, std::min<std::size_t>(to - from, 9)))
            if (c >= '0' && c <= '9') value = value * 10 + static_cast<std::uint64_t>(c - '0');
        return value;
    }
    std::uint64_t SampleBytes() const {
        std::size_t from, to;
        if (!Find("PIXEL_TYPE", from, to)) return 1;
        const std::string word = header.substr(from, to - from);
        if (word == "ComplexDouble") return 16;
        if (word == "Double" || word == "ComplexSingle" || word == "Int64" || word == "UInt64")
            return 8;
        if (word == "Int32" || word == "UInt32" || word == "Single") return 4;
        return word == "Int16" || word == "UInt16" ? 2 : 1;
    }

    // As many bytes of pixels as the header announces, if that is not too many.
    void FitPixels() {
        double bytes = 0;
        const std::uint64_t last = std::min<std::uint64_t>(Number("LEVELMAX"), 31);
        for (std::uint64_t level = Number("LEVELMIN"); level <= last; ++level)
            bytes += static_cast<double>(Number("PIXEL_WIDTH") >> level) *
                     static_cast<double>(Number("PIXEL_HEIGHT") >> level) *
                     static_cast<double>(Number("BANDS") * SampleBytes());
        if (bytes > 16384) return;
        const std::size_t old = pixels.size();
        pixels.resize(static_cast<std::size_t>(bytes));
        for (std::size_t i = old; i < pixels.size(); ++i) pixels[i] = static_cast<char>(i * 37);
    }

    void SetField(Random& random) {
        const std::size_t field = random() % std::size(kFields);
        std::size_t from, to;
        if (!Find(kFields[field], from, to)) return;
        header.replace(from, to - from,
                       field < kNumbers ? Pick(kNumberTexts, random) : Pick(kWords, random));
    }

    void AddRecord(Random& random) {
        if (metadata.empty()) metadata = "<DATASET></DATASET>";
        const std::size_t at = metadata.rfind("</DATASET>");
        metadata.insert(at == metadata.npos ? metadata.size() : at, Pick(kRecords, random));
    }
};

void Mutate(std::string& text, std::size_t room) {
    const std::size_t size = text.size();
    text.resize(size + std::min<std::size_t>(room, 64));
    const std::size_t now =
        text.empty()
            ? 0
            : LLVMFuzzerMutate(reinterpret_cast<std::uint8_t*>(text.data()), size, text.size());
    text.resize(now);
}

}  // namespace

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size,
                                               std::size_t maxSize, unsigned int seed) {
    Random random(seed);
    const unsigned kind = static_cast<unsigned>(random() >> 3) % 16;
    if (kind < 3) return LLVMFuzzerMutate(data, size, maxSize);
    Parts parts(data, size);
    const std::size_t room = maxSize > size + kFront ? maxSize - size - kFront : 0;
    if (kind < 5) {
        Mutate(parts.header, room);
    } else if (kind < 8) {
        parts.SetField(random);
        if (kind != 5) parts.FitPixels();
    } else if (kind < 10) {
        Mutate(parts.metadata, room);
    } else if (kind == 10) {
        parts.AddRecord(random);
        parts.FitPixels();
    } else if (kind == 11) {
        Mutate(parts.pixels, room);
    } else {
        Mutate(parts.script, room);
    }
    const std::size_t written = parts.Write(data, maxSize);
    return written != 0 ? written : LLVMFuzzerMutate(data, size, maxSize);
}
