// Parameter strings of memory rasters: any text through the helpers that read it and through the
// factory, beside a reader of the same grammar written out by hand; then tiles of what opened.
//
// In the text of an input the byte 1 stands for the address of a buffer of this program, and 2 for
// that address without its prefix. An address is taken as it stands, and so are the sizes: by the
// contract only code of the process makes such strings, with sizes that the buffer has. So pixels
// move only where the address is the buffer's and the sizes fit into it; all else that can be asked
// of a connection is asked of every one.
#include <algorithm>
#include <bit>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <optional>
#include <string>
#include <vector>
#include <xercesc/util/PlatformUtils.hpp>

#include "connection/ConnectionStrings.h"
#include "connection/MemoryRasterDataConnection.h"
#include "connection/RasterDataConnectionFactory.h"
#include "core/ElementTypes.h"
#include "fuzz/support/Expect.h"
#include "fuzz/support/InputBytes.h"
#include "fuzz/support/TextModel.h"

namespace {

using zelm::Array;
using zelm::ArrayShape;
using zelm::String;
using zmcfuzz::InputBytes;

__extension__ typedef unsigned __int128 Wide;

// --- the grammar, over bytes: all keys and marks are ASCII, so units make no difference ---

using Value = std::optional<std::string>;

// As the module holds it: bytes that make no character are replaced by one that is.
std::string Held(const std::string& text) { return zmcfuzz::Utf8Of(zmcfuzz::Utf16Of(text)); }

// Of a text and a key as they are held.
Value FindValue(const std::string& source, const std::string& key) {
    if (key.empty()) return {};
    const std::size_t at = source.find(key + "=");
    if (at == std::string::npos) return {};
    const std::size_t start = at + key.size() + 1;
    const std::string value = source.substr(start, source.find(';', start) - start);
    return value.empty() ? Value() : Value(value);
}

bool IsBlank(char c) { return c == ' ' || (c >= '\t' && c <= '\r'); }

int DigitOf(char c) {
    if (c >= '0' && c <= '9') return c - '0';
    if (c >= 'a' && c <= 'f') return c - 'a' + 10;
    if (c >= 'A' && c <= 'F') return c - 'A' + 10;
    return 99;
}

struct Number {
    bool negative = false;
    Wide magnitude = 0;  // far beyond 64 bits it stays where it is
};

Number NumberOf(const std::string& text) {
    Number number;
    std::size_t at = 0;
    while (at < text.size() && IsBlank(text[at])) ++at;
    if (at < text.size() && (text[at] == '+' || text[at] == '-'))
        number.negative = text[at++] == '-';
    int base = 10;
    if (at < text.size() && text[at] == '0') {
        const bool hex = at + 2 < text.size() && (text[at + 1] == 'x' || text[at + 1] == 'X') &&
                         DigitOf(text[at + 2]) < 16;
        base = hex ? 16 : 8;
        if (hex) at += 2;
    }
    for (; at < text.size() && DigitOf(text[at]) < base; ++at)
        if (number.magnitude < Wide{1} << 100)
            number.magnitude = number.magnitude * static_cast<unsigned>(base) +
                               static_cast<unsigned>(DigitOf(text[at]));
    return number;
}

std::uint32_t UnsignedOf(const std::string& text) {
    const Number number = NumberOf(text);
    if (number.magnitude > 0xFFFFFFFFu) return 0xFFFFFFFFu;
    const auto value = static_cast<std::uint32_t>(number.magnitude);
    return number.negative ? 0u - value : value;
}

std::int32_t SignedOf(const std::string& text) {
    const Number number = NumberOf(text);
    const Wide limit = Wide{0x7FFFFFFF} + (number.negative ? 1 : 0);
    const auto value = static_cast<std::int64_t>(std::min(number.magnitude, limit));
    return static_cast<std::int32_t>(number.negative ? -value : value);
}

std::vector<std::string> Pieces(const std::string& text, char mark, std::size_t skip) {
    std::vector<std::string> pieces;
    for (std::size_t start = 0; start < text.size();) {
        const std::size_t stop = std::min(text.find(mark, start), text.size());
        if (stop != start) pieces.push_back(text.substr(start, stop - start));
        start = stop + skip;
    }
    return pieces;
}

bool IsPixelType(std::int32_t code) {
    for (const int known : {1, 2, 3, 4, 5, 6, 9, 12, 13, 14, 15, 99})
        if (code == known) return true;
    return false;
}

// --- the helpers ---

Array<String> ArrayOf(const std::vector<std::string>& texts) {
    Array<String> array;
    for (const std::string& text : texts) ZMC_EXPECT(array.Append(text.c_str()));
    return array;
}

bool IsSameReal(double a, double b) {
    return std::bit_cast<std::uint64_t>(a) == std::bit_cast<std::uint64_t>(b) ||
           (std::isnan(a) && std::isnan(b));
}

void ExpectPair(const String& source, const String& key, const Value& value) {
    double pair[2] = {-77, -78};
    const bool found = zelm::ReadDoublePairParameter(source, key, pair[0], pair[1]);
    const std::vector<std::string> tokens =
        value ? Pieces(*value, ',', 1) : std::vector<std::string>();
    ZMC_EXPECT(found == (tokens.size() == 2));
    for (std::size_t i = 0; i < 2; ++i) {
        if (!found)
            ZMC_EXPECT(pair[i] == -77 - static_cast<double>(i));
        else
            ZMC_EXPECT(IsSameReal(pair[i], std::strtod(tokens[i].c_str(), nullptr)));
    }
}

void ExpectHelpers(const std::string& text, const std::string& held, const std::string& keyText) {
    const String source(text.c_str());
    const String key(keyText.c_str());
    const Value value = FindValue(held, Held(keyText));
    String found("old");
    ZMC_EXPECT(zelm::FindParameterValue(source, key, found) == value.has_value());
    ZMC_EXPECT(found == value.value_or("").c_str());
    std::uint32_t number = 0xABCD;
    ZMC_EXPECT(zelm::ReadUnsignedParameter(source, key, number) == value.has_value());
    ZMC_EXPECT(number == (value ? UnsignedOf(*value) : 0xABCD));
    std::int32_t signedNumber = -99;
    ZMC_EXPECT(zelm::ReadSignedParameter(source, key, signedNumber) == value.has_value());
    ZMC_EXPECT(signedNumber == (value ? SignedOf(*value) : -99));
    std::uint32_t code = 0xABCD;
    const bool isType = value && IsPixelType(SignedOf(*value));
    ZMC_EXPECT(zelm::ReadPixelTypeParameter(source, key, code) == isType);
    ZMC_EXPECT(code == (isType ? static_cast<std::uint32_t>(SignedOf(*value)) : 0xABCD));
    ExpectPair(source, key, value);
    void* pointer = &number;
    ZMC_EXPECT(zelm::ReadPointerParameter(source, key, &pointer) == value.has_value());
    if (!value) ZMC_EXPECT(!pointer);
    ZMC_EXPECT(!zelm::ReadPointerParameter(source, key, nullptr));
}

void ExpectSplit(const std::string& text, const std::string& delimiter) {
    Array<String> pieces;
    const bool split = zelm::SplitString(text.c_str(), delimiter.c_str(), pieces);
    ZMC_EXPECT(split == (!text.empty() && !delimiter.empty()));
    // Delimiters outside ASCII have fewer units than bytes.
    const bool ascii =
        std::all_of(delimiter.begin(), delimiter.end(), [](char c) { return c > 0; });
    if (!split || !ascii) return;
    const std::vector<std::string> expected = Pieces(text, delimiter[0], delimiter.size());
    // What a skip cuts in two is another character to units than to bytes.
    if (std::any_of(text.begin(), text.end(), [](char c) { return c <= 0; })) return;
    ZMC_EXPECT(pieces.shape.elements == expected.size());
    for (std::uint32_t i = 0; i < pieces.shape.elements; ++i)
        ZMC_EXPECT(pieces.data[i] == expected[i].c_str());
    String room[2];
    Array<String> view(room, ArrayShape(2));
    ZMC_EXPECT(zelm::SplitString(text.c_str(), delimiter.c_str(), view));
    ZMC_EXPECT(!room[0].wide && !room[1].wide);
}

// --- connections ---

// What a string says, if it says all that it has to.
struct Description {
    std::uint32_t samples, lines, bands;
    std::int32_t interleave;
    std::uint32_t pixelType;
    std::string address;

    static std::optional<Description> Of(const std::string& text) {
        std::string values[9];
        const char* const keys[9] = {"SAMPLES",   "LINES",    "BANDS", "INTERLEAVE", "PIXELTYPE",
                                     "PIXELSIZE", "TIEPTMAP", "NAME",  "PIXELDATA"};
        for (int i = 0; i < 9; ++i) {
            const Value value = FindValue(text, keys[i]);
            if (!value) return {};
            values[i] = *value;
        }
        const std::int32_t interleave = SignedOf(values[3]);
        const std::int32_t type = SignedOf(values[4]);
        if (interleave < -1 || interleave > 2 || !IsPixelType(type)) return {};
        if (Pieces(values[5], ',', 1).size() != 2 || Pieces(values[6], ',', 1).size() != 2)
            return {};
        return Description{UnsignedOf(values[0]),
                           UnsignedOf(values[1]),
                           UnsignedOf(values[2]),
                           interleave,
                           static_cast<std::uint32_t>(type),
                           values[8]};
    }
};

std::uint32_t AtLeastOne(std::uint32_t size) { return std::max(size, 1u); }

// The buffer of this program, at the end of its block so that the byte behind it is nobody's.
class Buffer {
public:
    static constexpr std::size_t kBytes = 3000;

    // Some bytes are left out in front: an address need not be one that elements like.
    explicit Buffer(std::size_t skipped) : bytes(new unsigned char[kBytes]), start(skipped) {
        for (std::size_t i = 0; i < kBytes; ++i) bytes[i] = static_cast<unsigned char>(i * 29 + 5);
    }

    unsigned char* Begin() const { return bytes.get() + start; }
    std::size_t Size() const { return kBytes - start; }
    std::string Address(bool prefix) const {
        char text[32];
        static_cast<void>(std::snprintf(text, sizeof text, prefix ? "%#zx" : "%zx",
                                        reinterpret_cast<std::size_t>(Begin())));
        return text;
    }

private:
    std::unique_ptr<unsigned char[]> bytes;
    const std::size_t start;
};

std::string WithAddresses(const std::string& text, const Buffer& buffer) {
    std::string result;
    for (const char c : text) {
        if (c == 1 || c == 2)
            result += buffer.Address(c == 1);
        else
            result += c;
    }
    // cppcheck-suppress stlcstrReturn ; it ends at the first zero
    return result.c_str();
}

// Index of a sample in a layout of w x h x n.
std::size_t IndexOf(std::int32_t interleave, std::size_t w, std::size_t h, std::size_t n,
                    std::size_t x, std::size_t y, std::size_t band) {
    switch (interleave) {
        case 0:
            return (y * w + x) * n + band;
        case 1:
            return (y * n + band) * w + x;
        case 2:
            return (band * h + y) * w + x;
        default:
            return y * w + x;
    }
}

template <class T>
class Tiles {
public:
    Tiles(zelm::RasterReader<T>& typed, const Description& described, const Buffer& pixels,
          InputBytes& bytes)
        : reader(typed),
          d(described),
          buffer(pixels),
          input(bytes),
          samples(AtLeastOne(d.samples)),
          lines(AtLeastOne(d.lines)),
          bands(AtLeastOne(d.bands)) {}

    // Sizes that the buffer does not have are their maker's own fault.
    bool Fit() const {
        const Wide planes = d.interleave == -1 ? 1 : bands;
        return Wide{samples} * lines * planes * sizeof(T) <= buffer.Size();
    }

    void Run() {
        SetNoData();
        for (int i = 0; i < 4; ++i) {
            TakeWindow();
            if (input.Flag())
                Write();
            else
                Read();
        }
    }

    // What moves no pixel can be asked whatever the sizes are.
    void AskWithoutPixels() {
        T pixel[1]{};
        unsigned char mark[1] = {0xA4};
        Array<int> band0;
        band0.Append(0);
        ZMC_EXPECT(reader.IsValid() && reader.IsValidLevel(0) && !reader.IsValidLevel(1));
        ZMC_EXPECT(!reader.ReadTile(0, 0, 1, 1, band0, 1, pixel, mark));
        ZMC_EXPECT(!reader.WriteTile(0, 0, 1, 1, band0, 1, pixel, mark));
        ZMC_EXPECT(!reader.WriteTile(0, 0, 1, 1, band0, 0, nullptr, mark));
        ZMC_EXPECT(!reader.WriteTile(0, 0, 1, 1, band0, 0, pixel, nullptr));
        ZMC_EXPECT(reader.ReadTile(0, 0, 0, 7, band0, 0, pixel, mark));
        ZMC_EXPECT(reader.ReadTile(0, 0, 7, 0, band0, 0, pixel, mark));
        ZMC_EXPECT(mark[0] == 0xA4);
        ZMC_EXPECT(reader.GetSamples(0) == d.samples && reader.GetLines(0) == d.lines &&
                   reader.GetBands() == d.bands && reader.GetCapabilities() == 1);
        ZMC_EXPECT(reader.GetMinLevel() == 0 && reader.GetMaxLevel() == 0 && !reader.HasPyramid());
        const std::int32_t pair[] = {2, 2};
        ZMC_EXPECT(reader.GetBaseReduction() == 0 && reader.GetLevelReduction() == 0 &&
                   !reader.BuildPyramid(0, 1, 0, pair) && !reader.CanBuildPyramid() &&
                   !reader.DeletePyramid() && !reader.RefreshPyramidState());
        ZMC_EXPECT(reader.GetStatsMask() == 0 && !reader.CanStoreBandStats() &&
                   !reader.CanStoreHistograms() && reader.SupportsNoData() &&
                   !reader.ReservedReaderQuery() && reader.GetConnection());
        const std::uint32_t band = input.Size();
        ZMC_EXPECT(!reader.HasBandStats(band) && !reader.SetBandStats({}) &&
                   !reader.SetHistograms({}) && !reader.SetPalette(band, zelm::Palette()));
        ZMC_EXPECT(reader.GetBandStats(band).band == band && !reader.HasPalette(band) &&
                   !reader.GetPalette(band) && reader.GetHistograms().shape.elements == 0);
    }

private:
    void SetNoData() {
        zelm::RasterProps props;
        props.bands = d.bands;
        for (std::uint32_t i = input.UpTo(3); i > 0; --i) {
            const double values[] = {0, 5, 34, -1, 1e300, std::nan("")};
            const std::uint32_t band = input.UpTo(7);
            props.SetNoDataValue(band, input.OneOf(values));
            if (input.Byte() % 4 == 0) props.SetNoDataFlag(band, input.Flag());
            if (props.HasNoDataValue(band)) props.GetNoDataValue(band) += 0;
        }
        reader.SetNoDataValues(props);
        for (std::uint32_t band = 0; band < 9; ++band)
            ZMC_EXPECT(reader.HasNoDataValue(band) == props.HasNoDataValue(band));
        hasValues = !props.noDataValues.empty();
    }

    void TakeWindow() {
        x = input.UpTo(255) % samples;
        y = input.UpTo(255) % lines;
        width = input.UpTo(255) % (samples - x + 1);
        height = input.UpTo(255) % (lines - y + 1);
        list.Clear();
        bandList.clear();
        for (std::uint32_t i = input.UpTo(12); i > 0; --i) {
            bandList.push_back(static_cast<int>(input.UpTo(255) % bands));
            list.Append(bandList.back());
        }
        const std::size_t planes = d.interleave == -1 ? 1 : bandList.size();
        tile.assign(std::size_t{width} * height * planes, T{});
        mask.assign(tile.size(), 0xA4);
    }

    template <class Visit>
    void ForEachSample(Visit&& visit) const {
        // Without interleave there is one band, whatever the list says, and the list may be empty.
        const std::size_t planes = d.interleave == -1 ? 1 : bandList.size();
        for (std::size_t i = 0; i < planes; ++i)
            for (std::size_t row = 0; row < height; ++row)
                for (std::size_t column = 0; column < width; ++column) {
                    const auto band =
                        static_cast<std::size_t>(d.interleave == -1 ? 0 : bandList[i]);
                    visit(IndexOf(d.interleave, samples, lines, bands, x + column, y + row, band),
                          IndexOf(d.interleave, width, height, planes, column, row, i));
                }
    }

    bool Move(bool write) {
        T none{};
        unsigned char noMask = 0;
        T* const pixels = tile.empty() ? &none : tile.data();
        unsigned char* const marks = mask.empty() ? &noMask : mask.data();
        const auto left = static_cast<std::int32_t>(x);
        const auto top = static_cast<std::int32_t>(y);
        const auto level = -static_cast<std::int32_t>(input.UpTo(1));  // counts as 0
        if (write) return reader.WriteTile(left, top, width, height, list, level, pixels, marks);
        return reader.ReadTile(left, top, width, height, list, level, pixels,
                               input.Flag() ? marks : nullptr);
    }

    void Read() {
        const std::vector<unsigned char> before(buffer.Begin(), buffer.Begin() + buffer.Size());
        ZMC_EXPECT(Move(false));
        ZMC_EXPECT(std::equal(before.begin(), before.end(), buffer.Begin()));
        ForEachSample([&](std::size_t inRaster, std::size_t inTile) {
            ZMC_EXPECT(HasBytes(tile[inTile], buffer.Begin() + inRaster * sizeof(T)));
        });
        ExpectMask();
    }

    static bool HasBytes(const T& sample, const unsigned char* bytes) {
        // NOLINTNEXTLINE(bugprone-suspicious-memory-comparison): every bit counts, of any NaN too.
        return std::memcmp(&sample, bytes, sizeof(T)) == 0;
    }

    // Of a mask byte only its lowest bit changes, and integers are marked by a value alone.
    void ExpectMask() const {
        constexpr bool integral = !std::is_floating_point_v<T> && !zelm::kIsComplex<T>;
        for (const unsigned char mark : mask) {
            ZMC_EXPECT((mark | 1) == 0xA5);
            if (integral && !hasValues) ZMC_EXPECT(mark == 0xA4);
        }
    }

    void Write() {
        for (std::size_t i = 0; i < tile.size(); ++i) {
            unsigned char sample[sizeof(T)] = {};
            for (std::size_t b = 0; b < sizeof(T); ++b)
                sample[b] = static_cast<unsigned char>(i * 3 + b);
            std::memcpy(&tile[i], sample, sizeof(T));
            mask[i] = static_cast<unsigned char>(0xA4 | (i % 5 == 0 ? 1 : 0));
        }
        std::vector<unsigned char> expected(buffer.Begin(), buffer.Begin() + buffer.Size());
        ZMC_EXPECT(Move(true));
        // Marked samples have become the value of their band, which the tile shows.
        ForEachSample([&](std::size_t inRaster, std::size_t inTile) {
            std::memcpy(&expected.at(inRaster * sizeof(T)), &tile[inTile], sizeof(T));
        });
        if (HasBandTwice()) return;
        ZMC_EXPECT(std::equal(expected.begin(), expected.end(), buffer.Begin()));
    }

    // Two values for one sample: which of them stays is the order of the list, told elsewhere.
    bool HasBandTwice() const {
        std::vector<int> sorted = bandList;
        std::sort(sorted.begin(), sorted.end());
        return std::adjacent_find(sorted.begin(), sorted.end()) != sorted.end();
    }

    zelm::RasterReader<T>& reader;
    const Description& d;
    const Buffer& buffer;
    InputBytes& input;
    const std::uint32_t samples, lines, bands;
    bool hasValues = false;
    std::uint32_t x = 0, y = 0, width = 0, height = 0;
    std::vector<int> bandList;
    Array<int> list;
    std::vector<T> tile;
    std::vector<unsigned char> mask;
};

void ExpectConnection(zelm::MemoryRasterDataConnection& connection, const std::string& text,
                      const Description& d, const Buffer& buffer, InputBytes& input) {
    ZMC_EXPECT(connection.IsOpen() == (connection.pixelData != nullptr));
    ZMC_EXPECT(connection.IsAvailable() == connection.IsOpen() &&
               connection.IsReadable() == connection.IsOpen());
    ZMC_EXPECT(connection.GetPixelType() == (connection.IsOpen() ? d.pixelType : 0));
    ZMC_EXPECT(connection.GetConnectionString() == ("{MemoryRaster}@" + text).c_str());
    const Array<String> parameters = connection.GetParameters();
    ZMC_EXPECT(parameters.shape.elements == 2 && parameters.data[0] == "MemoryRaster" &&
               parameters.data[1] == text.c_str());
    ZMC_EXPECT(connection.rasterProps.samples == d.samples &&
               connection.rasterProps.lines == d.lines && connection.rasterProps.bands == d.bands &&
               connection.rasterProps.interleave == d.interleave);
    if (d.address == buffer.Address(true) || d.address == buffer.Address(false))
        ZMC_EXPECT(connection.pixelData == buffer.Begin());
    const zelm::RasterReaderDispatchPtr dispatch = connection.GetReader();
    ZMC_EXPECT(dispatch && dispatch->IsValidLevel() == connection.IsOpen());
    const bool visited = dispatch->Visit([&](auto& reader) {
        Tiles tiles(reader, d, buffer, input);
        tiles.AskWithoutPixels();
        if (connection.pixelData == buffer.Begin() && tiles.Fit()) tiles.Run();
    });
    ZMC_EXPECT(visited == connection.IsOpen());
    // Without pixels the dispatch is invalid, and its defaults close the connection.
    ZMC_EXPECT(connection.GetRasterProps().samples == (visited ? d.samples : 0));
    connection.Close();
    ZMC_EXPECT(!connection.IsOpen() && connection.GetParameters().shape.elements == 0);
}

// Knows the size that it was told last; a clone counts as told nothing.
class Georeference final : public zelm::GeoRef {
public:
    zelm::GeoRef* Clone() const override { return new Georeference; }
    void SetRasterSize(std::uint32_t samples, std::uint32_t lines) override {
        toldSamples = samples;
        toldLines = lines;
    }
    std::uint32_t toldSamples = 1u << 31;
    std::uint32_t toldLines = 1u << 31;
};

void ExpectGeoref(const zelm::GeoRefPtr& held, const Description& d, bool given) {
    ZMC_EXPECT(static_cast<bool>(held) == given);
    if (!given) return;
    const auto& georeference = dynamic_cast<const Georeference&>(*held);
    ZMC_EXPECT(georeference.toldSamples == d.samples && georeference.toldLines == d.lines);
}

// Format words and texts around the parameter string, as the first byte says.
struct Argument {
    std::vector<std::string> elements;
    bool memory;  // a word says so
    bool single;  // one element is left when the words are gone
};

Argument ArgumentOf(std::uint8_t kind, const std::string& text) {
    if (kind == 0 || kind == 0x58) return {{text}, false, true};
    switch (kind & 7) {
        case 1:
            return {{text, "MemoryRaster"}, true, true};
        case 2:
            return {{"MemoryRaster", "Pyramid", text}, true, true};
        case 3:
            return {{"MemoryRaster", text, text}, true, false};
        case 4:
            return {{"MemoryRaster"}, true, false};
        default:
            return {{"MemoryRaster", text}, true, true};
    }
}

bool IsWord(const std::string& text);

// A new pyramid needs a name alone, and no file is made for it yet; memory rasters are not created.
void ExpectCreate(const zelm::DataConnectionPtr& created, bool pyramid, const Argument& argument) {
    const auto name = std::find_if_not(argument.elements.begin(), argument.elements.end(), IsWord);
    const bool named = name != argument.elements.end() && !name->empty();
    ZMC_EXPECT(static_cast<bool>(created) == (pyramid && named));
    if (created) ZMC_EXPECT(!created->IsReadable());
}

bool IsWord(const std::string& text) { return text == "MemoryRaster" || text == "Pyramid"; }

void ExpectOpen(std::uint8_t kind, const std::string& text, const std::string& held,
                const Buffer& buffer, InputBytes& input) {
    const Argument argument = ArgumentOf(kind, text);
    const Array<String> connection = ArrayOf(argument.elements);
    zelm::RasterDataConnectionFactory factory;
    factory.Test(connection);
    ZMC_EXPECT(factory.IsRasterFactory() && !factory.CreateDefault());
    zelm::RasterProps props;
    const bool pyramid = kind >> 3 == 5;
    props.formatName = pyramid ? "Pyramid" : text.c_str();
    ExpectCreate(factory.Create(connection, props), pyramid || text == "Pyramid", argument);
    // Without a word, what is no memory raster is the name of a file, which is opened and, being no
    // pyramid, closed; those in other folders are let alone.
    if (!argument.memory && text.find('/') != std::string::npos) return;
    const bool located = (kind & 16) != 0;
    const zelm::DataConnectionPtr opened = factory.Open(
        connection, zelm::GeoRefPtr(located ? new Georeference : nullptr), zelm::MetadataPtr());
    const std::optional<Description> d = Description::Of(held);
    ZMC_EXPECT(static_cast<bool>(opened) == (d && argument.single && !IsWord(text)));
    if (!opened) return;
    ZMC_EXPECT(factory.Test(connection));
    auto* const memory = dynamic_cast<zelm::MemoryRasterDataConnection*>(opened.Get());
    ZMC_EXPECT(memory);
    ExpectGeoref(memory->rasterProps.geoRef, *d, located);
    ZMC_EXPECT(!memory->Create(connection, props) && !memory->ReservedConnectionQuery());
    ExpectConnection(*memory, text, *d, buffer, input);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    // What is taken for a pyramid meets its parser, which the host makes ready.
    static const bool ready = (xercesc::XMLPlatformUtils::Initialize(), true);
    static_cast<void>(ready);
    InputBytes input(data, size);
    const std::uint8_t kind = input.Byte();
    const Buffer buffer((kind >> 3 & 3) == 3 ? kind >> 5 : 0);
    const std::string key = input.Bytes(kind >> 5).c_str();
    InputBytes steps(data, 0);
    const std::string whole = input.Rest();
    // Behind a zero stand the steps of the tiles.
    const std::size_t end = std::min(whole.find('\0'), whole.size());
    const std::string text = WithAddresses(whole.substr(0, end), buffer);
    if (end < whole.size())
        steps = InputBytes(reinterpret_cast<const std::uint8_t*>(whole.data()) + end + 1,
                           whole.size() - end - 1);
    const std::string held = Held(text);
    ExpectHelpers(text, held, key);
    ExpectSplit(text, key);
    ExpectOpen(kind, text, held, buffer, steps);
    return 0;
}
