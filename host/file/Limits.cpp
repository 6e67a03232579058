#include "host/file/Limits.h"

#include <algorithm>
#include <iterator>
#include <mutex>
#include <optional>
#include <string_view>

#include "format/DocumentLimits.h"
#include "host/base/Error.h"
#include "host/base/ScaledNumber.h"
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

void Take(Limits& limits, std::string_view entry, const std::string& text) {
    const std::size_t equals = entry.find('=');
    if (equals == entry.npos) Refuse(text);
    const auto value = ParseScaled(entry.substr(equals + 1), "KMG");
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

std::string Limits::Text() const {
    constexpr std::uint64_t kMega = std::uint64_t{1} << 20;
    std::string text;
    for (const Entry& known : kKnown) {
        const std::uint64_t value = this->*known.value;
        const bool isLarge = value >= kMega && value % kMega == 0;
        if (!text.empty()) text += ", ";
        text.append(known.name).append("=");
        text += isLarge ? std::to_string(value / kMega) + 'M' : std::to_string(value);
    }
    return text;
}

std::string Limits::Judge(std::uint64_t Limits::*which, std::uint64_t claimed,
                          const std::string& what) const {
    const std::uint64_t limit = this->*which;
    if (claimed <= limit) return "";
    const auto* const known = std::find_if(std::begin(kKnown), std::end(kKnown),
                                           [&](const Entry& each) { return each.value == which; });
    return what + ", beyond the limit of " + std::to_string(limit) + "; " + kVariable + "=" +
           std::string(known->name) + "=" + std::to_string(claimed) + " raises it";
}

}  // namespace zmchost
