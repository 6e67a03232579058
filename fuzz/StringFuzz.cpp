// String conversions: text of any bytes through every form and back.
#include <cstddef>
#include <cstdint>
#include <string>

#include "core/String.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string bytes(reinterpret_cast<const char*>(data), size);
    const zelm::String text(bytes.c_str());
    const zelm::String again(text.GetUtf8());
    if (text.wide && again.Compare(text) != 0) __builtin_trap();
    return 0;
}
