// Stores records of the input's choice in a dataset, and holds the module to what it promises: the
// new ones come back behind the old ones, everything in front of the metadata document stays as it
// was, and what is refused changes nothing.
#ifndef ZMC_FUZZ_SUPPORT_STORECHECK_H
#define ZMC_FUZZ_SUPPORT_STORECHECK_H

#include <algorithm>
#include <cstdint>
#include <vector>

#include "fuzz/support/Expect.h"
#include "fuzz/support/InputBytes.h"
#include "fuzz/support/MemoryFile.h"
#include "fuzz/support/Records.h"
#include "pyramid/PyramidDataset.h"

namespace zmcfuzz {

inline constexpr std::uint64_t kComparedBytes = 1u << 20;

template <class T>
class StoreCheck {
public:
    StoreCheck(zelm::PyramidDataset& checked, const MemoryFile& itsFile)
        : dataset(checked), file(itsFile) {
        hadText = file.Size() > dataset.MetaDocumentOffset;
        before.Load(dataset);
        // A rewrite may change what an odd document means, once.
        if (before.readable && !IsPlainDocument(Tail())) {
            ZMC_EXPECT(dataset.SetBandStats(zelm::Array<zelm::RasterBandStats<T>>()));
            before.Load(dataset);
            ZMC_EXPECT(before.readable);
        }
        front = Front();
        tail = Tail();
    }

    void Run(InputBytes& input) {
        switch (input.UpTo(2)) {
            case 0:
                return Stats(input);
            case 1:
                return Histograms(input);
            default:
                return StorePalette(input);
        }
    }

private:
    void Stats(InputBytes& input) {
        zelm::Array<zelm::RasterBandStats<T>> stats;
        for (std::uint32_t count = input.UpTo(3); count > 0; --count)
            stats.Append(TakeStats<T>(input));
        if (!Judge(dataset.SetBandStats(stats))) return;
        ZMC_EXPECT(CameBackBehind(before.stats, stats, after.stats));
        ZMC_EXPECT(SameRecords(before.histograms, after.histograms));
        ZMC_EXPECT(after.HasPalettesOf(before));
    }

    void Histograms(InputBytes& input) {
        zelm::Array<zelm::RasterBandHistogram<T>> histograms;
        for (std::uint32_t count = input.UpTo(3); count > 0; --count)
            histograms.Append(TakeHistogram<T>(input));
        if (input.UpTo(7) == 7) RefuseHistograms(histograms);
        if (!Judge(dataset.SetHistograms(histograms))) return;
        ZMC_EXPECT(CameBackBehind(before.histograms, histograms, after.histograms));
        ZMC_EXPECT(SameRecords(before.stats, after.stats));
        ZMC_EXPECT(after.HasPalettesOf(before));
    }

    // A store with a record that no document holds is refused as a whole.
    void RefuseHistograms(zelm::Array<zelm::RasterBandHistogram<T>> histograms) {
        zelm::RasterBandHistogram<T> tooLong;
        tooLong.binCount = 0xF0000000u;
        histograms.Append(tooLong);
        ZMC_EXPECT(!dataset.SetHistograms(histograms));
        after.Load(dataset);
        ZMC_EXPECT(after == before && Front() == front && Tail() == tail);
    }

    void StorePalette(InputBytes& input) {
        const std::uint32_t band = input.Size();
        zelm::Palette palette;
        TakePalette(input, palette);
        if (!Judge(dataset.SetPalette(band, palette))) return;
        ZMC_EXPECT(SameRecords(before.stats, after.stats));
        ZMC_EXPECT(SameRecords(before.histograms, after.histograms));
        ZMC_EXPECT(after.HasPalettesOf(before, band));
        ZMC_EXPECT(after.palettes.count(band) == 1 && Same(palette, after.palettes[band]));
    }

    // True where the store is to be looked at.
    bool Judge(bool stored) {
        after.Load(dataset);
        ZMC_EXPECT(stored == (dataset.Writable && dataset.File && (before.readable || !hadText)));
        ZMC_EXPECT(after.readable == (before.readable || stored));
        std::vector<unsigned char> now = Front();
        if (stored) {
            ZMC_EXPECT(now.size() >= front.size());
            // A file that was shorter than its tile data has zeros there now.
            ZMC_EXPECT(std::all_of(now.begin() + static_cast<std::ptrdiff_t>(front.size()),
                                   now.end(), [](unsigned char byte) { return byte == 0; }));
            now.resize(front.size());
        } else {
            ZMC_EXPECT(Tail() == tail && after == before);
        }
        ZMC_EXPECT(now == front);
        return stored;
    }

    std::vector<unsigned char> Front() const {
        return file.Read(0, std::min(kComparedBytes, dataset.MetaDocumentOffset));
    }
    std::vector<unsigned char> Tail() const {
        return file.Read(dataset.MetaDocumentOffset, kComparedBytes);
    }

    zelm::PyramidDataset& dataset;
    const MemoryFile& file;
    bool hadText = false;
    Records<T> before;
    Records<T> after;
    std::vector<unsigned char> front;
    std::vector<unsigned char> tail;
};

}  // namespace zmcfuzz

#endif
