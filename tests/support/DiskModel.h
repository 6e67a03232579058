// DiskModel: what a disk may hold when the power fails while a recording (DiskRecorder.h) is made.
//
// The system keeps what is written in memory and brings it to the disk when it likes, in any order.
// It promises no more than that what stood before a flush of a file, or of a folder, is there
// behind it. So behind any step the disk has, of each file, what it had at its last flush, and of
// the changes since then any part: each of them or not, and of bytes any sectors of 512 or pages of
// 4096. The order in which they get there makes no further states: where two of them overlap, the
// later one wins or is missing. The size of a file is a change of its own, and bytes beyond the
// size that the disk knows are not seen. Names of the folder change in their order, as in a file
// system that keeps a journal of them, and any number of the last ones is missing.
//
// Between two flushes the changes only grow in number, so it is enough to look right before each
// flush, and at the end.
#ifndef ZMC_TESTS_SUPPORT_DISKMODEL_H
#define ZMC_TESTS_SUPPORT_DISKMODEL_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <random>
#include <string>
#include <unordered_set>
#include <vector>

#include "tests/support/DiskRecorder.h"

namespace zmctest {

struct DiskState {
    std::map<std::string, std::uint64_t> names;
    std::map<std::uint64_t, std::string> files;  // by number, those that have a name
    bool atEnd = false;                          // all steps were made before the power failed
};

// Which states are made. With up to `exhaustive` changes between flushes every subset of whole ones
// is; with more the first n, all but one, and one alone, for every n and every one. Those each with
// every number of missing names. Of every change of more than a sector: its first and last, all but
// these, its first half, and each second sector; and the same of pages. And `random` subsets of
// sectors or pages before each flush, by a fixed seed.
struct DiskEffort {
    std::size_t exhaustive = 8;
    std::size_t random = 20;
};

struct DiskFigures {
    std::size_t changes = 0, flushes = 0;  // in the recording
    std::size_t made = 0;                  // states
    std::size_t different = 0;             // of them
};

class DiskModel {
public:
    explicit DiskModel(std::vector<DiskStep> recorded) : steps(std::move(recorded)) {}

    // Calls visit(state) once for each different state, until it answers false.
    DiskFigures Visit(const DiskEffort& effort,
                      const std::function<bool(const DiskState&)>& visit) const;

    // Places of the flushes in the recording, but for those of what was there at the beginning.
    std::vector<std::size_t> Flushes() const;
    // The same recording without those steps: what would stand if nobody had waited for the disk.
    DiskModel Without(const std::vector<std::size_t>& places) const;

private:
    class Walk;
    // Steps that tell what was there at the beginning.
    std::size_t Beginning() const;

    std::vector<DiskStep> steps;
};

}  // namespace zmctest

#endif
