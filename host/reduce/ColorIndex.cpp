#include "host/reduce/ColorIndex.h"

#include <algorithm>

namespace zmchost {
namespace {

constexpr std::uint32_t kLeaf = 8;
constexpr std::uint32_t kKnown = 1u << 14;
constexpr std::uint64_t kUnknown = ~std::uint64_t{0};  // which no index is as long as

std::uint32_t KeyOf(const Rgba& color) {
    return std::uint32_t{color[0]} | std::uint32_t{color[1]} << 8 | std::uint32_t{color[2]} << 16 |
           std::uint32_t{color[3]} << 24;
}

std::uint32_t Square(int difference) { return static_cast<std::uint32_t>(difference * difference); }

std::uint32_t Distance(const Rgba& a, const Rgba& b) {
    std::uint32_t sum = 0;
    for (std::size_t i = 0; i < a.size(); ++i) sum += Square(int{a[i]} - int{b[i]});
    return sum;
}

// From a colour to the nearest point of a box.
std::uint32_t Distance(const Rgba& color, const Rgba& low, const Rgba& high) {
    std::uint32_t sum = 0;
    for (std::size_t i = 0; i < color.size(); ++i)
        sum += Square(std::max({low[i] - color[i], color[i] - high[i], 0}));
    return sum;
}

}  // namespace

ColorIndex::ColorIndex(const zelm::Palette& palette,
                       const std::function<bool(std::uint32_t)>& mayName)
    : known(std::make_unique<std::atomic<std::uint64_t>[]>(kKnown)) {
    for (const auto& [index, color] : palette.colors) {
        if (index >= palette.nextIndex || !color || color->isNull != 0) continue;
        colors.resize(std::size_t{index} + 1);
        present.resize(std::size_t{index} + 1);
        colors[index] = {color->red, color->green, color->blue, color->alpha};
        present[index] = true;
        if (mayName(index)) entries.push_back({colors[index], index});
    }
    std::sort(entries.begin(), entries.end(), [](const Entry& a, const Entry& b) {
        return a.color != b.color ? a.color < b.color : a.index < b.index;
    });
    const auto end = std::unique(entries.begin(), entries.end(),
                                 [](const Entry& a, const Entry& b) { return a.color == b.color; });
    entries.erase(end, entries.end());
    if (!entries.empty()) Grow(0, static_cast<std::uint32_t>(entries.size()));
    for (std::uint32_t i = 0; i < kKnown; ++i) known[i] = kUnknown;
}

ColorIndex::Node ColorIndex::BoxAround(std::uint32_t begin, std::uint32_t end) const {
    Node node{entries[begin].color, entries[begin].color, begin, end, entries[begin].index, 0, 0};
    for (std::uint32_t i = begin; i < end; ++i) {
        for (std::size_t k = 0; k < node.low.size(); ++k) {
            node.low[k] = std::min(node.low[k], entries[i].color[k]);
            node.high[k] = std::max(node.high[k], entries[i].color[k]);
        }
        node.leastIndex = std::min(node.leastIndex, entries[i].index);
    }
    return node;
}

// Halves along the longest side of the box; the tree is as deep as the number of entries has bits.
std::uint32_t ColorIndex::Grow(std::uint32_t begin, std::uint32_t end) {
    const auto place = static_cast<std::uint32_t>(nodes.size());
    nodes.push_back(BoxAround(begin, end));
    if (end - begin <= kLeaf) return place;
    const Node& node = nodes[place];
    std::size_t side = 0;
    for (std::size_t k = 1; k < node.low.size(); ++k)
        if (node.high[k] - node.low[k] > node.high[side] - node.low[side]) side = k;
    const std::uint32_t middle = begin + (end - begin) / 2;
    std::nth_element(
        entries.begin() + begin, entries.begin() + middle, entries.begin() + end,
        [side](const Entry& a, const Entry& b) { return a.color[side] < b.color[side]; });
    const std::uint32_t left = Grow(begin, middle);
    const std::uint32_t right = Grow(middle, end);
    nodes[place].left = left;
    nodes[place].right = right;
    return place;
}

void ColorIndex::Search(std::uint32_t place, const Rgba& color, Best& best) const {
    const Node& node = nodes[place];
    const std::uint32_t nearest = Distance(color, node.low, node.high);
    if (nearest > best.distance || (nearest == best.distance && node.leastIndex > best.index))
        return;
    if (node.right == 0) {
        for (std::uint32_t i = node.begin; i < node.end; ++i) {
            const Entry& entry = entries[i];
            const std::uint32_t distance = Distance(color, entry.color);
            if (distance < best.distance || (distance == best.distance && entry.index < best.index))
                best = {distance, entry.index};
        }
        return;
    }
    const Node& left = nodes[node.left];
    const Node& right = nodes[node.right];
    const bool leftFirst =
        Distance(color, left.low, left.high) <= Distance(color, right.low, right.high);
    Search(leftFirst ? node.left : node.right, color, best);
    Search(leftFirst ? node.right : node.left, color, best);
}

std::optional<std::uint32_t> ColorIndex::Nearest(const Rgba& color) const {
    if (nodes.empty()) return std::nullopt;
    const std::uint32_t key = KeyOf(color);
    std::atomic<std::uint64_t>& slot = known[(key * 2654435761u) >> 18];
    const std::uint64_t answer = slot.load(std::memory_order_relaxed);
    if (answer != kUnknown && answer >> 32 == key) return static_cast<std::uint32_t>(answer);
    Best best{~std::uint32_t{0}, ~std::uint32_t{0}};
    Search(0, color, best);
    slot.store(std::uint64_t{key} << 32 | best.index, std::memory_order_relaxed);
    return best.index;
}

}  // namespace zmchost
