// The bytes of one input, taken from the front; behind the end everything is 0, so every input is
// a whole one.
#ifndef ZMC_FUZZ_SUPPORT_INPUTBYTES_H
#define ZMC_FUZZ_SUPPORT_INPUTBYTES_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <string>
#include <string_view>

namespace zmcfuzz {

class InputBytes {
public:
    InputBytes(const std::uint8_t* data, std::size_t size)
        : left(reinterpret_cast<const char*>(data), size) {}

    bool AtEnd() const { return left.empty(); }

    std::uint8_t Byte() {
        if (left.empty()) return 0;
        const auto byte = static_cast<std::uint8_t>(left.front());
        left.remove_prefix(1);
        return byte;
    }

    bool Flag() { return (Byte() & 1) != 0; }

    // Little-endian.
    std::uint32_t Word() {
        std::uint32_t word = 0;
        for (int i = 0; i < 4; ++i) word |= std::uint32_t{Byte()} << (8 * i);
        return word;
    }

    // From 0 to `last`, by one byte where that suffices.
    std::uint32_t UpTo(std::uint32_t last) {
        const std::uint32_t raw = last < 256 ? Byte() : Word();
        return last == std::numeric_limits<std::uint32_t>::max() ? raw : raw % (last + 1u);
    }

    template <class T, std::size_t N>
    T OneOf(const T (&values)[N]) {
        return values[UpTo(static_cast<std::uint32_t>(N - 1))];
    }

    std::string Bytes(std::size_t count) {
        const std::string bytes(left.substr(0, count));
        left.remove_prefix(bytes.size());
        return bytes;
    }

    // A text of at most 255 bytes, its length told in front.
    std::string Text() { return Bytes(Byte()); }

    std::string Rest() { return Bytes(left.size()); }

    // Sizes where arithmetic has its edges: around powers of two, and any other.
    std::uint32_t Size() {
        const std::uint8_t kind = Byte();
        if (kind < 96) return kind;
        if (kind < 224) {
            const std::uint32_t power = (kind - 96u) / 4u;
            return (std::uint32_t{1} << power) + (kind & 3u) - 2u;
        }
        return Word();
    }

private:
    std::string_view left;
};

}  // namespace zmcfuzz

#endif
