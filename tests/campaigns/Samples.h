// The files that campaigns damage: one for each ordering, small, with edge tiles, several levels
// and bands, and a document with all kinds of records. They are made by hand, not by the module.
#ifndef ZMC_TESTS_CAMPAIGNS_SAMPLES_H
#define ZMC_TESTS_CAMPAIGNS_SAMPLES_H

#include <string>
#include <vector>

#include "tests/support/PyramidModel.h"

namespace zmctest {

struct Sample {
    std::string name;
    zmctest::PyramidModel model;

    zmctest::Bytes File() const { return model.file; }
    // Without its document.
    zmctest::Bytes Tiles() const {
        return {model.file.begin(),
                model.file.begin() + static_cast<std::ptrdiff_t>(model.tileDataEnd)};
    }
};

inline std::string SampleDocument() {
    return "<?xml version=\"1.0\" encoding=\"UTF-8\" standalone=\"no\" ?>\n<DATASET>\n\n"
           "  <BANDSTATISTICS>\n    <RSTC_BAND>0</RSTC_BAND>\n    <RSTC_LEVEL>0</RSTC_LEVEL>\n"
           "    <RSTC_MINIMUM>3</RSTC_MINIMUM>\n    <RSTC_MAXIMUM>99</RSTC_MAXIMUM>\n"
           "    <RSTC_MEAN>41.25</RSTC_MEAN>\n"
           "    <RSTC_STANDARDDEVIATION>12.5</RSTC_STANDARDDEVIATION>\n"
           "    <RSTC_SUM>1234567.5</RSTC_SUM>\n    <RSTC_SUM2>1.5e+20</RSTC_SUM2>\n"
           "    <RSTC_RMS>43</RSTC_RMS>\n  </BANDSTATISTICS>\n\n"
           "  <BANDSTATISTICS>\n    <RSTC_BAND>1</RSTC_BAND>\n    <RSTC_LEVEL>0</RSTC_LEVEL>\n"
           "    <RSTC_MEAN>-7</RSTC_MEAN>\n  </BANDSTATISTICS>\n\n"
           "  <HISTOGRAMS>\n    <HIST_BAND>0</HIST_BAND>\n    <HIST_LEVEL>1</HIST_LEVEL>\n"
           "    <HIST_SOURCE>ORVA</HIST_SOURCE>\n    <HIST_BINCOUNT>4</HIST_BINCOUNT>\n"
           "    <HIST_BINSIZE>25</HIST_BINSIZE>\n    <HIST_MIN>0</HIST_MIN>\n"
           "    <HIST_MAX>99</HIST_MAX>\n    <HIST_COUNTS>120|4000|5120|16</HIST_COUNTS>\n"
           "  </HISTOGRAMS>\n\n"
           "  <PALETTE>\n    <PALETTE_BAND>0</PALETTE_BAND>\n    <PALETTE_COUNT>2</PALETTE_COUNT>\n"
           "    <PALETTE_RGBA>0|10|20|255</PALETTE_RGBA>\n"
           "    <PALETTE_RGBA>255|128|1|0</PALETTE_RGBA>\n  </PALETTE>\n\n</DATASET>\n";
}

inline Sample MakeSample(const std::string& name, std::uint32_t ordering, std::uint32_t type,
                         std::uint32_t width, std::uint32_t height, std::uint32_t bands) {
    zmctest::PyramidDescription d;
    d.samples = width;
    d.lines = height;
    d.bands = bands;
    d.tile = 16;
    d.levelMax = 2;
    d.type = type;
    d.ordering = ordering;
    Sample sample{name, zmctest::PyramidModel(d)};
    sample.model.StoreAllImages();
    const std::string document = SampleDocument();
    sample.model.Write(sample.model.tileDataEnd,
                       reinterpret_cast<const unsigned char*>(document.data()), document.size());
    return sample;
}

inline std::vector<Sample> Samples() {
    return {MakeSample("Scanline", 0, 12, 37, 26, 2), MakeSample("Blocked", 1, 4, 26, 37, 2),
            MakeSample("Morton", 2, 1, 45, 37, 3)};
}

}  // namespace zmctest

#endif
