// Number codes of pixel types, interleaves and tile orderings, and their words.
//
// The codes stand in connection strings, the words in the documents of pyramid files; both are
// fixed. Nothing here fails: what is not known takes a neutral value.
#ifndef ZMC_CORE_PIXELVOCABULARY_H
#define ZMC_CORE_PIXELVOCABULARY_H

#include <cstdint>
#include <iosfwd>

namespace zelm {

// Layout of a raster's samples, slowest dimension first.
namespace Interleave {
inline constexpr std::int32_t None = -1;  // lines, samples; one band
inline constexpr std::int32_t BIP = 0;    // lines, samples, bands
inline constexpr std::int32_t BIL = 1;    // lines, bands, samples
inline constexpr std::int32_t BSQ = 2;    // bands, lines, samples
}  // namespace Interleave

// True for the four codes.
constexpr bool IsInterleave(std::int32_t code) {
    return code >= Interleave::None && code <= Interleave::BSQ;
}

// Order of the tiles in a pyramid file.
namespace TileOrder {
inline constexpr std::uint32_t Scanline = 0;
inline constexpr std::uint32_t Blocked = 1;
inline constexpr std::uint32_t Morton = 2;
}  // namespace TileOrder

// Code to word. The words are static texts, which nobody frees: a name is asked for in messages and
// tables, where a text to own would be a burden. A code that is not known is "Unknown", and for a
// tile ordering "Scanline".
const char* PixelTypeName(std::uint32_t code);
const char* InterleaveName(std::int32_t code);
const char* TileOrderName(std::uint32_t code);

// Read one token with ReadTrimmedToken and compare it with the words, exact and case-sensitive. A
// word that is not known gives 0, and for an interleave -1. "USHORT" is read as UInt16; no writer
// emits it.
void ParsePixelType(std::istream& stream, std::uint32_t& code);
void ParseInterleave(std::istream& stream, std::int32_t& code);
void ParseTileOrder(std::istream& stream, std::uint32_t& code);

// The code itself if a reader exists for it, else 0.
std::uint32_t CheckedPixelType(std::uint32_t code);

// Bytes of a sample: 1, 2, 4, 8 or 16, and 1 for every code without a reader, whatever its word
// says. This is the size that file layout goes by.
std::uint32_t PixelSize(std::uint32_t code);

}  // namespace zelm

#endif
