// PackedNumbers: a row of numbers as few bytes, seven bits of a number in each, the lowest first;
// the upper bit tells that more follow. Stands in files, and is the same on every machine.
#ifndef ZMC_HOST_BASE_PACKEDNUMBERS_H
#define ZMC_HOST_BASE_PACKEDNUMBERS_H

#include <cstdint>
#include <string>
#include <string_view>

#include "host/base/Int128.h"

namespace zmchost {

class NumberPacker {
public:
    void Put(std::uint64_t number) {
        for (; number >= 0x80; number >>= 7) bytes += static_cast<char>(number | 0x80);
        bytes += static_cast<char>(number);
    }
    void Put(UInt128 number) {
        Put(static_cast<std::uint64_t>(number));
        Put(static_cast<std::uint64_t>(number >> 64));
    }
    // Adds bytes as they are.
    void PutText(std::string_view text) { bytes += text; }
    const std::string& Bytes() const { return bytes; }

private:
    std::string bytes;
};

// Takes them off again. What is not there, or does not fit its type, is 0 and ends all goodness.
class NumberUnpacker {
public:
    explicit NumberUnpacker(std::string_view packed) : rest(packed) {}

    std::uint64_t Take() {
        std::uint64_t number = 0;
        for (unsigned shift = 0; good; shift += 7) {
            const auto byte = static_cast<unsigned char>(rest.empty() ? 0 : rest.front());
            const std::uint64_t bits = byte & 0x7Fu;
            good = !rest.empty() && shift < 64 && bits << shift >> shift == bits;
            if (!good) break;
            rest.remove_prefix(1);
            number |= bits << shift;
            if (byte < 0x80) return number;
        }
        return 0;
    }
    UInt128 TakeLong() {
        const UInt128 low = Take();
        return UInt128{Take()} << 64 | low;
    }

    // Whether all that was asked for was there.
    bool Good() const { return good; }
    void Refuse() { good = false; }
    // What was not taken yet.
    std::string_view Rest() const { return rest; }

private:
    std::string_view rest;
    bool good = true;
};

}  // namespace zmchost

#endif
