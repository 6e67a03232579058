// The 39 element names of the header and metadata documents, in one list for writer and reader.
//
// Names stand in files: they are compared exactly, case included, and none may change. RSTC_SUMXY,
// RSTC_COV and HIST_TYPE are reserved: nothing writes them, and their text is dropped on reading.
#ifndef ZMC_FORMAT_ELEMENTNAMES_H
#define ZMC_FORMAT_ELEMENTNAMES_H

#include <string_view>
#include <type_traits>

#include <xercesc/util/XercesDefs.hpp>

#define ZMC_ELEMENT_NAMES(X)  \
    X(DATASET)                \
    X(BANDSTATISTICS)         \
    X(HISTOGRAMS)             \
    X(PALETTE)                \
    X(HEADER)                 \
    X(RSTC_LEVEL)             \
    X(RSTC_BAND)              \
    X(RSTC_MINIMUM)           \
    X(RSTC_MAXIMUM)           \
    X(RSTC_MEAN)              \
    X(RSTC_STANDARDDEVIATION) \
    X(RSTC_SUM)               \
    X(RSTC_SUM2)              \
    X(RSTC_RMS)               \
    X(RSTC_SUMXY)             \
    X(RSTC_COV)               \
    X(HIST_LEVEL)             \
    X(HIST_BAND)              \
    X(HIST_SOURCE)            \
    X(HIST_BINCOUNT)          \
    X(HIST_BINSIZE)           \
    X(HIST_MIN)               \
    X(HIST_MAX)               \
    X(HIST_TYPE)              \
    X(HIST_COUNTS)            \
    X(HEADER_VERSION_MAJOR)   \
    X(HEADER_VERSION_MINOR)   \
    X(HEADER_BANDS)           \
    X(HEADER_PIXEL_WIDTH)     \
    X(HEADER_PIXEL_HEIGHT)    \
    X(HEADER_TILESIZE)        \
    X(HEADER_LEVELMIN)        \
    X(HEADER_LEVELMAX)        \
    X(HEADER_INTERLEAVE)      \
    X(HEADER_BUILD_METHOD)    \
    X(HEADER_PIXEL_TYPE)      \
    X(PALETTE_BAND)           \
    X(PALETTE_COUNT)          \
    X(PALETTE_RGBA)

namespace zelm {

// The texts of the parser are 16-bit units like those of the object model.
static_assert(std::is_same_v<XMLCh, char16_t>);

// Position of a name in the list.
enum class ElementName : int {
#define ZMC_X(name) name,
    ZMC_ELEMENT_NAMES(ZMC_X)
#undef ZMC_X
};

inline constexpr std::u16string_view kElementNames[] = {
#define ZMC_X(name) u"" #name,
    // NOLINTNEXTLINE(bugprone-suspicious-missing-comma): a text of two pieces each.
    ZMC_ELEMENT_NAMES(ZMC_X)
#undef ZMC_X
};
inline constexpr int kElementNameCount = static_cast<int>(std::size(kElementNames));
static_assert(kElementNameCount == 39);

// Position of the name in the list, or -1.
constexpr int FindElementName(std::u16string_view name) {
    int i = kElementNameCount - 1;  // from the last on: of colours there are many
    while (i >= 0 && kElementNames[i] != name) --i;
    return i;
}

}  // namespace zelm

#endif
