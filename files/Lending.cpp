#include "files/Lending.h"

#include <algorithm>
#include <functional>
#include <map>
#include <mutex>
#include <new>
#include <string>
#include <utility>

#include "platform/ForkHandlers.h"
#include "platform/Random.h"

namespace zelm::files {
namespace {

using WideView = std::basic_string_view<WideChar>;

using Lent = std::map<std::basic_string<WideChar>, std::shared_ptr<ByteSource>, std::less<>>;

// Guards the registry; no code of a source runs under it. It is there before the first name is
// lent, which may be while the process starts, and needs no first use: a copy of the process that
// is made in the middle of one would wait for it for good.
constinit std::mutex registryMutex;

// A copy of the process must not find the lock held by a thread that it does not have.
[[maybe_unused]] const bool unlockedInCopies = [] {
    platform::AtFork([] { registryMutex.lock(); }, [] { registryMutex.unlock(); });
    return true;
}();

// Under the lock. Never destroyed: names may be withdrawn while the process ends.
Lent& Registry() {
    alignas(Lent) static std::byte storage[sizeof(Lent)];
    constinit static Lent* lent = nullptr;
    if (!lent) lent = new (storage) Lent;
    return *lent;
}

// False without memory, and for a name that is taken.
bool Register(const WideChar* name, std::shared_ptr<ByteSource>&& source) noexcept {
    const std::lock_guard lock(registryMutex);
    try {
        return Registry().try_emplace(name, std::move(source)).second;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

// The source goes behind the lock: its end is its own code, which may lend and withdraw.
void Unregister(const WideChar* name) noexcept {
    Lent::node_type gone;
    const std::lock_guard lock(registryMutex);
    const auto found = Registry().find(WideView(name));
    // unreachable: a LentName that has a text is registered under it
    if (found != Registry().end()) gone = Registry().extract(found);
}

char HexDigit(unsigned value) { return "0123456789abcdef"[value & 15]; }

}  // namespace

LentName::LentName(LentName&& other) noexcept { Take(other); }

LentName& LentName::operator=(LentName&& other) noexcept {
    if (this == &other) return *this;
    Withdraw();
    Take(other);
    return *this;
}

LentName::~LentName() { Withdraw(); }

void LentName::Withdraw() noexcept {
    if (!*this) return;
    Unregister(text);
    *text = 0;
    *utf8 = 0;
}

// Leaves the object without a name on false.
bool LentName::Draw() noexcept {
    unsigned char random[kRandomBytes];
    if (!platform::RandomBytes(random, sizeof random)) return false;
    char* end = std::copy(kLentPrefix.begin(), kLentPrefix.end(), utf8);
    for (const unsigned char byte : random) {
        *end++ = HexDigit(byte >> 4);
        *end++ = HexDigit(byte);
    }
    std::copy(std::begin(utf8), std::end(utf8), text);
    return true;
}

void LentName::Take(LentName& other) noexcept {
    std::copy(std::begin(other.text), std::end(other.text), text);
    std::copy(std::begin(other.utf8), std::end(other.utf8), utf8);
    *other.text = 0;
    *other.utf8 = 0;
}

LentName Lend(std::shared_ptr<ByteSource> source) noexcept {
    LentName name;
    if (!source || !name.Draw()) return LentName();
    if (Register(name.text, std::move(source))) return name;
    // Not this object's to withdraw.
    *name.text = 0;
    return LentName();
}

std::shared_ptr<ByteSource> FindLent(const String& name) noexcept {
    if (!LooksLent(name)) return nullptr;
    const std::lock_guard lock(registryMutex);
    const auto found = Registry().find(name.View());
    return found == Registry().end() ? nullptr : found->second;
}

bool LooksLent(const String& name) noexcept {
    const WideView text = name.View();
    return text.size() >= kLentPrefix.size() &&
           std::equal(
               kLentPrefix.begin(), kLentPrefix.end(), text.begin(),
               [](char prefix, WideChar unit) { return static_cast<WideChar>(prefix) == unit; });
}

bool LooksLent(std::string_view utf8Name) noexcept { return utf8Name.starts_with(kLentPrefix); }

}  // namespace zelm::files
