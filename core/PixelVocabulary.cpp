#include "core/PixelVocabulary.h"

#include <cstring>
#include <string>
#include <string_view>

#include "core/ElementTypes.h"
#include "core/String.h"

namespace zelm {
namespace {

template <class Code>
struct Word {
    Code code;
    const char* text;
};

// The last three have a code and no reader.
constexpr Word<std::uint32_t> kPixelTypes[] = {
#define ZMC_X(type, name, code) {code, #name},
    ZMC_ELEMENT_TYPES(ZMC_X)
#undef ZMC_X
        {95, "Quad"},
    {96, "ComplexQuad"},
    {98, "Bool"},
};

constexpr Word<std::int32_t> kInterleaves[] = {
    {Interleave::None, "None"},
    {Interleave::BIP, "BIP"},
    {Interleave::BIL, "BIL"},
    {Interleave::BSQ, "BSQ"},
};

constexpr Word<std::uint32_t> kTileOrders[] = {
    {TileOrder::Scanline, "Scanline"},
    {TileOrder::Blocked, "Blocked"},
    {TileOrder::Morton, "Morton"},
};

template <class Code, std::size_t N>
const char* NameOf(const Word<Code> (&words)[N], Code code, const char* unknown) {
    for (const auto& word : words)
        if (word.code == code) return word.text;
    return unknown;
}

template <class Code, std::size_t N>
Code CodeOf(const Word<Code> (&words)[N], std::string_view token, Code unknown) {
    for (const auto& word : words)
        if (token == word.text) return word.code;
    return unknown;
}

// Narrow and short, so that it takes no memory: a word that were lost for want of it would pass for
// an unknown one, and a file be read by another ordering than its own.
std::string ReadToken(std::istream& stream) {
    std::string token;
    ReadTrimmedToken(stream, token);
    token.resize(std::strlen(token.c_str()));  // a word ends at a zero
    return token;
}

}  // namespace

const char* PixelTypeName(std::uint32_t code) { return NameOf(kPixelTypes, code, "Unknown"); }
const char* InterleaveName(std::int32_t code) { return NameOf(kInterleaves, code, "Unknown"); }
const char* TileOrderName(std::uint32_t code) { return NameOf(kTileOrders, code, "Scanline"); }

void ParsePixelType(std::istream& stream, std::uint32_t& code) {
    const std::string token = ReadToken(stream);
    code = token == "USHORT" ? PixelTypeCode::UInt16 : CodeOf(kPixelTypes, token, 0u);
}

void ParseInterleave(std::istream& stream, std::int32_t& code) {
    code = CodeOf(kInterleaves, ReadToken(stream), Interleave::None);
}

void ParseTileOrder(std::istream& stream, std::uint32_t& code) {
    code = CodeOf(kTileOrders, ReadToken(stream), TileOrder::Scanline);
}

std::uint32_t CheckedPixelType(std::uint32_t code) {
    return VisitElementType(code, [](auto) {}) ? code : 0;
}

std::uint32_t PixelSize(std::uint32_t code) {
    std::uint32_t size = 1;
    VisitElementType(code, [&size](auto type) {
        size = static_cast<std::uint32_t>(sizeof(typename decltype(type)::type));
    });
    return size;
}

}  // namespace zelm
