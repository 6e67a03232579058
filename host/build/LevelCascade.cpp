#include "host/build/LevelCascade.h"

#include <algorithm>
#include <cstring>

#include "host/base/Lanes.h"

namespace zmchost {
namespace {

// Whether a mask has a byte that is not 0: 1 as a rule, others only where samples are hidden.
bool AnyMarked(const unsigned char* mask, std::size_t bytes) {
    if (std::memchr(mask, 1, bytes)) return true;
    unsigned char any = 0;
    for (std::size_t i = 0; i < bytes; ++i) any |= mask[i];
    return any != 0;
}

}  // namespace

LevelCascade::LevelCascade(const CascadeSetup& cascadeSetup, const Column& column,
                           PixelWork& pixelWork, StripStore& stripStore, MemoryMeter& meter)
    : setup(cascadeSetup), work(pixelWork), store(stripStore) {
    levels.resize(setup.topLevel - setup.baseLevel + 1);
    const std::uint32_t maskBytes = work.NeedsMasks() ? setup.bands : 0;
    for (std::uint32_t i = 0; i < levels.size(); ++i) {
        levels[i].width = (column.readEnd >> i) - (column.readBegin >> i);
        levels[i].begin = setup.firstLine >> i;
        levels[i].end = setup.endLine >> i;
        levels[i].nextRow = setup.firstLine >> (i + 1);
        const bool keeps = setup.halo != 0 && i + 1 < levels.size();
        const std::uint32_t keptRows = keeps ? 2 * setup.halo + 2 : 0;
        levels[i].kept = std::make_unique<Strip>(meter, setup.baseLevel + i,
                                                 std::size_t{keptRows} * levels[i].width,
                                                 setup.pixelBytes, maskBytes, keptRows);
    }
}

void LevelCascade::Take(const Strip& strip, std::vector<StripStore::Loan>& finished) {
    MakeRows(setup.baseLevel, strip, finished);
}

void LevelCascade::MakeRows(std::uint32_t level, const Strip& strip,
                            std::vector<StripStore::Loan>& finished) {
    if (level == setup.topLevel) return;
    Level& source = At(level);
    const std::uint32_t ready = RowsReady(source, strip);
    while (source.nextRow < ready) {
        Strip& target = Filling(level + 1);
        const std::uint32_t end = std::min(ready, target.End());
        InLanes(setup.lanes, source.nextRow, end,
                [&](std::uint32_t, std::uint32_t first, std::uint32_t last) {
                    for (std::uint32_t row = first; row < last; ++row)
                        MakeRow(level, strip, target, row);
                });
        source.nextRow = end;
        if (end < target.End()) continue;
        MakeRows(level + 1, target, finished);
        finished.push_back(std::move(At(level + 1).filling));
    }
    KeepRows(source, strip);
}

std::uint32_t LevelCascade::RowsReady(const Level& level, const Strip& strip) const {
    const std::uint32_t end = strip.End();
    if (end >= level.end) return level.end / 2;
    return end < setup.halo ? 0 : (end - setup.halo) / 2;
}

Strip& LevelCascade::Filling(std::uint32_t level) {
    Level& coarser = At(level);
    if (!coarser.filling) {
        const std::uint32_t first = At(level - 1).nextRow;
        coarser.filling = store.Take(level);
        coarser.filling->Begin(first, StripLines(first, coarser.end), coarser.width);
    }
    return *coarser.filling;
}

void LevelCascade::MakeRow(std::uint32_t level, const Strip& strip, Strip& target,
                           std::uint32_t row) const {
    const Level& source = At(level);
    RowWindow window;
    const std::int64_t first = std::int64_t{2} * row - setup.halo;
    for (std::uint32_t place = 0; place < 2 * setup.halo + 2; ++place)
        TakeSourceRow(source, strip, first + place, place, window);
    unsigned char* const mask = window.anyMask || work.MayMark() ? target.MaskRow(row) : nullptr;
    work.ReduceRow(window, source.width, target.Row(row), mask);
    target.SetMarked(row, mask && AnyMarked(mask, target.MaskRowBytes()));
}

void LevelCascade::TakeSourceRow(const Level& level, const Strip& strip, std::int64_t line,
                                 std::uint32_t place, RowWindow& window) const {
    if (line < level.begin || line >= level.end) return;
    const auto known = static_cast<std::uint32_t>(line);
    const Strip& holder = known >= strip.firstLine ? strip : *level.kept;
    window.rows[place] = holder.Row(known);
    window.masks[place] = holder.MaskIfMarked(known);
    window.anyMask = window.anyMask || window.masks[place];
}

void LevelCascade::KeepRows(Level& level, const Strip& strip) const {
    if (setup.halo == 0 || strip.End() >= level.end) return;
    const std::uint32_t needed = 2 * level.nextRow;
    const std::uint32_t first = std::max(needed - std::min(needed, setup.halo), strip.firstLine);
    Strip& kept = *level.kept;
    kept.Begin(first, strip.End() - first, level.width);
    for (std::uint32_t line = first; line < strip.End(); ++line) {
        std::memcpy(kept.Row(line), strip.Row(line), strip.RowBytes());
        const unsigned char* const mask = strip.MaskIfMarked(line);
        kept.SetMarked(line, mask != nullptr);
        if (mask) std::memcpy(kept.MaskRow(line), mask, strip.MaskRowBytes());
    }
}

}  // namespace zmchost
