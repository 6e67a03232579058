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

struct Registry {
    std::mutex mutex;  // guards what follows; no code of a source runs under it
    std::map<std::basic_string<WideChar>, std::shared_ptr<ByteSource>, std::less<>> lent;
};

Registry* MakeRegistry(void* storage);

// In static storage from its first use on, and never destroyed: names may be lent while the process
// starts, and withdrawn while it ends.
Registry& TheRegistry() {
    alignas(Registry) static std::byte storage[sizeof(Registry)];
    static Registry* const registry = MakeRegistry(storage);
    return *registry;
}

// A copy of the process must not find the lock held by a thread that it does not have.
Registry* MakeRegistry(void* storage) {
    platform::AtFork([] { TheRegistry().mutex.lock(); }, [] { TheRegistry().mutex.unlock(); });
    return new (storage) Registry;
}

// False without memory, and for a name that is taken.
bool Register(const WideChar* name, std::shared_ptr<ByteSource>&& source) noexcept {
    Registry& registry = TheRegistry();
    const std::lock_guard lock(registry.mutex);
    try {
        return registry.lent.try_emplace(name, std::move(source)).second;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

// The source goes behind the lock: its end is its own code, which may lend and withdraw.
void Unregister(const WideChar* name) noexcept {
    Registry& registry = TheRegistry();
    decltype(registry.lent)::node_type gone;
    const std::lock_guard lock(registry.mutex);
    const auto found = registry.lent.find(WideView(name));
    // unreachable: a LentName that has a text is registered under it
    if (found != registry.lent.end()) gone = registry.lent.extract(found);
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
    Registry& registry = TheRegistry();
    const std::lock_guard lock(registry.mutex);
    const auto found = registry.lent.find(name.View());
    return found == registry.lent.end() ? nullptr : found->second;
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
