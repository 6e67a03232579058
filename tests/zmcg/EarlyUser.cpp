// A library that draws codes and looks at the settings while it is loaded. It names zmcg's symbols
// without being linked to it, so that the loader may run its initialiser before those of zmcg.
#include "zmcg/zmcg.h"

namespace {

struct DrawnAtLoad {
    unsigned word = GloballyUniqueObjectTypeCode(zelm::String("Drawn at load"));
    unsigned sameWord = GloballyUniqueObjectTypeCode(zelm::String("Drawn at load"));
    unsigned object = GloballyUniqueObjectTypeCode(zelm::String("Object"));
    unsigned firstError = GloballyUniqueObjectErrorCode();
    unsigned secondError = GloballyUniqueObjectErrorCode();
    std::int32_t formats = gCdfFormatRecordCount;

    DrawnAtLoad() { GetGlobalEnvironmentImpl().settings["Set at load"] = "kept"; }
};

const DrawnAtLoad drawn;

}  // namespace

// The numbers drawn, in the order of the fields.
extern "C" __attribute__((visibility("default"))) void CodesDrawnAtLoad(unsigned out[6]) {
    out[0] = drawn.word;
    out[1] = drawn.sameWord;
    out[2] = drawn.object;
    out[3] = drawn.firstError;
    out[4] = drawn.secondError;
    out[5] = static_cast<unsigned>(drawn.formats);
}
