// Palette: a sparse table of index to colour.
//
// `nextIndex` is what users take for the length. It is no count of entries: a lookup creates an
// entry without moving it, and SetColor stores beyond it without moving it; only AddColor, Clear
// and CopyTo change it. Not synchronised, and GetColor inserts, so reading needs care too. The
// operations that insert can throw std::bad_alloc from the map.
#ifndef ZMC_COLOUR_PALETTE_H
#define ZMC_COLOUR_PALETTE_H

#include <cstdint>
#include <map>

#include "colour/Color.h"
#include "core/Pointer.h"

namespace zelm {

class Palette {
public:
    std::map<std::uint32_t, ColorPtr> colors;  // an entry may hold no colour
    std::uint32_t nextIndex = 0;               // where AddColor stores

    Palette() = default;
    Palette(const Palette&) = delete;  // copies are made by CopyTo, so that no colour is shared
    Palette& operator=(const Palette&) = delete;
    virtual ~Palette() = default;

    void Clear();

    // The colour at `index`, made null where there is none; good as long as the entry stands.
    // Null only if memory ran out.
    Color* GetColor(std::uint32_t index);

    // Stores a copy at `nextIndex`, replacing what is there, and moves on.
    void AddColor(const Color& color);

    // Overwrites the colour at `index` in place, so that every holder sees it, or stores a copy.
    void SetColor(std::uint32_t index, const Color& color);

    // Makes `target` a copy of this palette; entries without a colour are not carried over.
    // A palette copied to itself stays as it is, and so does the target of a copy that throws.
    void CopyTo(Palette& target) const;
};

class PalettePtr : public Pointer<Palette> {
public:
    using Pointer::Pointer;
};

}  // namespace zelm

#endif
