// Runs the probe of this folder and finds the engines that it loads.
#ifndef ZMC_TESTS_COORDSYS_PROBERUN_H
#define ZMC_TESTS_COORDSYS_PROBERUN_H

#include <gtest/gtest.h>

#include "tests/support/ChildProcess.h"
#include "tests/support/ScratchDirectory.h"

namespace zelm {

inline zmctest::ChildResult RunProbe(std::vector<std::string> words) {
    words.insert(words.begin(), ZMC_COORDSYS_PROBE);
    zmctest::ChildResult result = zmctest::RunChild(words);
    EXPECT_EQ(result.status, 0) << result.err;
    return result;
}

// Directory of the stand-in engine that lacks that entry point, counted from 1; 0 lacks none, 5
// throws from the first.
inline std::string StubDirectory(int lacks) {
    return ZMC_STUB_DIRECTORY "/stub" + std::to_string(lacks);
}

inline void WriteControlLine(const zmctest::ScratchDirectory& directory, const std::string& line) {
    zmctest::WriteText(directory / "pelog.txt", "# notes\n" + line + "\n");
}

}  // namespace zelm

#endif
