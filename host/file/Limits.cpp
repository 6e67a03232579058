#include "host/file/Limits.h"

#include <charconv>
#include <mutex>
#include <optional>
#include <string_view>

#include "format/DocumentLimits.h"
#include "host/base/Error.h"
#include "platform/Program.h"

namespace zmchost {
namespace {

static_assert(Limits().document == zelm::kMaxDocumentBytes, "what the format allows");

constexpr const char* kVariable = "ZMC_LIMITS";

struct Entry {
    std::string_view name;
    std::uint64_t Limits::*value;
};
constexpr Entry kKnown[] = {{"bands", &Limits::bands},
                            {"tile", &Limits::tile},
                            {"elements", &Limits::elements},
                            {"header", &Limits::header},
                            {"document", &Limits::document}};

std::mutex mutex;
std::optional<Limits> current;  // once somebody has asked

[[noreturn]] void Refuse(const std::string& text) {
    throw Error(text, "take it for limits",
                "it is no list such as bands=100000,tile=1G,document=64M");
}

std::optional<std::uint64_t> ParseNumber(std::string_view text) {
    constexpr std::string_view kUnits = "KMG";
    unsigned shift = 0;
    if (!text.empty()) {
        const std::size_t unit = kUnits.find(text.back());
        if (unit != kUnits.npos) {
            shift = 10 * (static_cast<unsigned>(unit) + 1);
            text.remove_suffix(1);
        }
    }
    std::uint64_t value = 0;
    const auto parsed = std::from_chars(text.data(), text.data() + text.size(), value);
    if (parsed.ec != std::errc() || parsed.ptr != text.data() + text.size() ||
        value > (UINT64_MAX >> shift))
        return std::nullopt;
    return value << shift;
}

void Take(Limits& limits, std::string_view entry, const std::string& text) {
    const std::size_t equals = entry.find('=');
    if (equals == entry.npos) Refuse(text);
    const auto value = ParseNumber(entry.substr(equals + 1));
    for (const Entry& known : kKnown)
        if (value && known.name == entry.substr(0, equals)) {
            limits.*known.value = *value;
            return;
        }
    Refuse(text);
}

Limits Changed(Limits limits, const std::string& text) {
    std::string_view rest = text;
    while (!rest.empty()) {
        const std::size_t comma = rest.find(',');
        Take(limits, rest.substr(0, comma), text);
        rest.remove_prefix(comma == rest.npos ? rest.size() : comma + 1);
    }
    return limits;
}

// The lock is held.
const Limits& Ours() {
    if (!current) current = Changed(Limits(), platform::EnvironmentValue(kVariable));
    return *current;
}

}  // namespace

Limits Limits::Current() {
    const std::lock_guard lock(mutex);
    return Ours();
}

void Limits::Change(const std::string& text) {
    const std::lock_guard lock(mutex);
    current = Changed(Ours(), text);
}

std::string Limits::Judge(const char* name, std::uint64_t claimed, std::uint64_t limit,
                          const std::string& what) {
    if (claimed <= limit) return "";
    return what + ", beyond the limit of " + std::to_string(limit) + "; " + kVariable + "=" + name +
           "=" + std::to_string(claimed) + " raises it";
}

}  // namespace zmchost
