// A module that a program loads while it runs, and that shares the registry of the process with it.
#include <algorithm>
#include <cstddef>
#include <cstring>
#include <memory>

#include "files/Lending.h"
#include "files/MemorySource.h"
#include "files/OpenSource.h"

namespace {

using namespace zelm::files;

LentName lent;

}  // namespace

#define ZMC_EXPORT extern "C" __attribute__((visibility("default")))

// Opens the name for reading and reads from its start; the bytes that came.
ZMC_EXPORT std::size_t BorrowAndRead(const char16_t* name, char* buffer, std::size_t size) {
    const auto source = OpenSource(name, OpenMode::Read);
    return source ? source->ReadAt(0, buffer, size) : 0;
}

// Lends a text until it is withdrawn.
ZMC_EXPORT const char* LendText(const char* text) {
    lent =
        Lend(std::make_shared<MemorySource>(MemorySource::Bytes(text, text + std::strlen(text))));
    return lent.Utf8();
}

ZMC_EXPORT void WithdrawText() { lent.Withdraw(); }
