#include "tests/support/DiskModel.h"

#include <algorithm>

namespace zmctest {
namespace {

using Kind = DiskStep::Kind;

// Of a change the bytes that reach the disk: those of the blocks for which `keep(number)` holds,
// counted from the block that the first byte is in.
template <class Keep>
void Apply(const DiskStep& step, std::size_t block, std::string& file, Keep&& keep) {
    if (step.kind == Kind::Size) {
        if (keep(std::size_t{0})) file.resize(step.offset, '\0');
        return;
    }
    const std::uint64_t first = step.offset / block * block;
    const std::uint64_t end = std::min<std::uint64_t>(step.offset + step.bytes.size(), file.size());
    std::size_t number = 0;
    for (std::uint64_t at = first; at < end; at += block) {
        if (!keep(number++)) continue;
        const std::uint64_t from = std::max(at, step.offset);
        const std::uint64_t to = std::min<std::uint64_t>(at + block, end);
        if (from < to)
            std::copy_n(step.bytes.data() + (from - step.offset), to - from, file.data() + from);
    }
}

std::size_t Blocks(const DiskStep& step, std::size_t block) {
    if (step.kind == Kind::Size) return 1;
    return (step.offset + step.bytes.size() + block - 1) / block - step.offset / block;
}

constexpr std::size_t kSector = 512, kPage = 4096;

}  // namespace

// What the disk surely has at one moment, and what it may have.
class DiskModel::Walk {
public:
    Walk(const DiskEffort& howMuch, const std::function<bool(const DiskState&)>& visitor)
        : effort(howMuch), visit(visitor) {}

    DiskFigures Run(const std::vector<DiskStep>& recorded, std::size_t beginning) {
        for (std::size_t i = 0; i < recorded.size() && goesOn; ++i) {
            const DiskStep& step = recorded[i];
            if (i >= beginning) Count(step);
            if (step.IsFlush() && i >= beginning) Look(false);
            Take(step);
        }
        if (goesOn) Look(true);
        return figures;
    }

private:
    void Count(const DiskStep& step) { ++(step.IsFlush() ? figures.flushes : figures.changes); }

    void Take(const DiskStep& step) {
        if (step.kind == Kind::Names) {
            listings.push_back(&step.names);
        } else if (step.kind == Kind::FlushFolder) {
            listings.erase(listings.begin(), listings.end() - 1);
        } else if (step.kind == Kind::FlushFile) {
            for (const DiskStep* const change : pending)
                if (change->file == step.file) ApplyWhole(*change, sure[step.file]);
            std::erase_if(pending, [&](const DiskStep* each) { return each->file == step.file; });
        } else {
            pending.push_back(&step);
        }
    }

    static void ApplyWhole(const DiskStep& step, std::string& file) {
        Apply(step, kPage, file, [](std::size_t) { return true; });
    }

    // What is seen with these names: changes of files that have none are nobody's.
    void Choose(std::size_t number) {
        names = listings[number];
        changes.clear();
        for (const DiskStep* const change : pending)
            if (std::any_of(names->begin(), names->end(),
                            [&](const auto& entry) { return entry.second == change->file; }))
                changes.push_back(change);
    }

    // keep(change, block) tells what has reached the disk.
    template <class Keep>
    void Make(std::size_t block, Keep&& keep) {
        if (!goesOn) return;
        ++figures.made;
        DiskState state;
        state.atEnd = atEnd;
        state.names = *names;
        for (const auto& [name, number] : state.names) state.files[number] = sure[number];
        for (std::size_t i = 0; i < changes.size(); ++i)
            Apply(*changes[i], block, state.files[changes[i]->file],
                  [&](std::size_t number) { return keep(i, number); });
        if (!known.insert(Digest(state)).second) return;
        ++figures.different;
        goesOn = visit(state);
    }

    static std::size_t Digest(const DiskState& state) {
        std::size_t sum = state.atEnd ? 1 : 0;
        const auto add = [&](std::size_t number) {
            sum = (sum ^ number) * std::size_t{0x9E3779B97F4A7C15};
            sum ^= sum >> 29;
        };
        for (const auto& [name, number] : state.names) {
            add(std::hash<std::string>()(name));
            add(number);
        }
        for (const auto& [number, bytes] : state.files) add(std::hash<std::string>()(bytes));
        return sum;
    }

    void Look(bool behindAll) {
        atEnd = behindAll;
        for (std::size_t listing = 0; listing < listings.size(); ++listing) {
            Choose(listing);
            changes.size() <= effort.exhaustive ? AllSubsets() : SomeSubsets();
            if (listing != 0 && listing + 1 != listings.size()) continue;
            for (std::size_t change = 0; change < changes.size(); ++change)
                for (const std::size_t block : {kSector, kPage}) TearOne(change, block);
        }
        for (std::size_t i = 0; i < effort.random; ++i) {
            Choose(random() % listings.size());
            AnySubset(i % 2 == 0 ? kSector : kPage);
        }
    }

    void AllSubsets() {
        for (std::size_t set = 0; set < std::size_t{1} << changes.size(); ++set)
            Make(kPage, [&](std::size_t i, std::size_t) { return (set >> i & 1) != 0; });
    }

    void SomeSubsets() {
        for (std::size_t n = 0; n <= changes.size(); ++n) {
            Make(kPage, [&](std::size_t i, std::size_t) { return i < n; });
            Make(kPage, [&](std::size_t i, std::size_t) { return i != n; });
            Make(kPage, [&](std::size_t i, std::size_t) { return i == n; });
        }
    }

    // Those before it are there, those behind it are not.
    void TearOne(std::size_t change, std::size_t block) {
        const std::size_t blocks = Blocks(*changes[change], block);
        if (blocks < 2) return;
        const std::function<bool(std::size_t)> parts[] = {
            [](std::size_t b) { return b == 0; },
            [](std::size_t b) { return b != 0; },
            [&](std::size_t b) { return b == blocks - 1; },
            [&](std::size_t b) { return b != blocks - 1; },
            [&](std::size_t b) { return b < blocks / 2; },
            [](std::size_t b) { return b % 2 == 0; },
        };
        for (const auto& part : parts)
            Make(block, [&](std::size_t i, std::size_t b) {
                return i < change || (i == change && part(b));
            });
    }

    void AnySubset(std::size_t block) {
        const std::size_t share = std::size_t{1} + random() % 9;
        Make(block, [&](std::size_t, std::size_t) { return random() % 10 < share; });
    }

    const DiskEffort effort;
    const std::function<bool(const DiskState&)>& visit;
    DiskFigures figures;
    std::map<std::uint64_t, std::string> sure;
    std::vector<const DiskStep*> pending;                               // in their order
    std::vector<const std::map<std::string, std::uint64_t>*> listings;  // the first one is sure
    const std::map<std::string, std::uint64_t>* names = nullptr;        // one of them
    std::vector<const DiskStep*> changes;                               // pending ones under these
    std::unordered_set<std::size_t> known;
    std::mt19937_64 random{1};
    bool atEnd = false;
    bool goesOn = true;
};

DiskFigures DiskModel::Visit(const DiskEffort& effort,
                             const std::function<bool(const DiskState&)>& visit) const {
    return Walk(effort, visit).Run(steps, Beginning());
}

std::size_t DiskModel::Beginning() const {
    const auto flush = std::find_if(steps.begin(), steps.end(), [](const DiskStep& step) {
        return step.kind == Kind::FlushFolder;
    });
    return static_cast<std::size_t>(flush - steps.begin()) + (flush == steps.end() ? 0 : 1);
}

std::vector<std::size_t> DiskModel::Flushes() const {
    std::vector<std::size_t> places;
    for (std::size_t i = Beginning(); i < steps.size(); ++i)
        if (steps[i].IsFlush()) places.push_back(i);
    return places;
}

DiskModel DiskModel::Without(const std::vector<std::size_t>& places) const {
    std::vector<DiskStep> kept;
    for (std::size_t i = 0; i < steps.size(); ++i)
        if (std::find(places.begin(), places.end(), i) == places.end()) kept.push_back(steps[i]);
    return DiskModel(std::move(kept));
}

}  // namespace zmctest
