#include "serve/ServedFile.h"

#include <cerrno>
#include <chrono>
#include <cstdio>

#include "serve/Answer.h"

namespace zmcserve {
namespace {

using zelm::files::Transfer;

// Some ticks of the slowest clocks of file systems.
constexpr std::chrono::nanoseconds kTick = std::chrono::milliseconds(50);

class OpenFileSource final : public zelm::files::ByteSource {
public:
    explicit OpenFileSource(std::shared_ptr<platform::File> opened) : file(std::move(opened)) {}

protected:
    Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override {
        Transfer done;
        done.bytes = file->ReadAt(offset, buffer, size, &done.error);
        done.end = done.error == 0 && done.bytes < size;
        return done;
    }
    int DoTellSize(std::uint64_t& size) const override {
        int error = 0;
        return file->TellSize(size, &error) ? 0 : error;
    }
    zelm::files::Identity DoIdentify() const override {
        platform::FileIdentity now;
        if (!file->TellIdentity(now)) return {};
        return {true, now.device, now.number, now.size, now.modified, now.changed};
    }

private:
    std::shared_ptr<platform::File> file;
};

std::uint64_t Mixed(std::uint64_t state, std::uint64_t number) {
    state ^= number + 0x9E3779B97F4A7C15u + (state << 6) + (state >> 2);
    state = (state ^ (state >> 30)) * 0xBF58476D1CE4E5B9u;
    state = (state ^ (state >> 27)) * 0x94D049BB133111EBu;
    return state ^ (state >> 31);
}

// Size and time stand as they are; which file it is, which is nobody's business, is mixed.
std::string VersionOf(const platform::FileIdentity& identity) {
    std::uint64_t which = Mixed(identity.device, identity.number);
    which = Mixed(which, static_cast<std::uint64_t>(identity.changed));
    char text[64];
    static_cast<void>(std::snprintf(text, sizeof text, "%llx-%llx-%llx",
                                    static_cast<unsigned long long>(identity.size),
                                    static_cast<unsigned long long>(identity.modified),
                                    static_cast<unsigned long long>(which)));
    return text;
}

bool WasWrittenJustNow(const platform::FileIdentity& identity) {
    const auto now = std::chrono::system_clock::now().time_since_epoch();
    const auto age = now - std::chrono::nanoseconds(identity.modified);
    return age < kTick && age > -kTick;
}

}  // namespace

ServedFile::ServedFile(std::unique_ptr<platform::File> opened, std::string fileName)
    : file(std::move(opened)),
      name(std::move(fileName)),
      source(std::make_shared<OpenFileSource>(file)) {
    if (!file->TellIdentity(identity)) throw Refusal(500, "the system tells nothing of the file");
    version = VersionOf(identity);
    settled = !WasWrittenJustNow(identity);
}

std::string ServedFile::ETag(std::string_view variant) const {
    if (!settled) return {};
    std::string tag = '"' + version;
    if (!variant.empty()) tag.append("-").append(variant);
    return tag + '"';
}

void ServedFile::CheckUnchanged() const {
    platform::FileIdentity now;
    if (file->TellIdentity(now) && now.size == identity.size && now.modified == identity.modified)
        return;
    throw Refusal::Busy("the file was written to while it was read");
}

std::size_t ServedFile::ReadAt(std::uint64_t offset, void* buffer, std::size_t size) const {
    return file->ReadAt(offset, buffer, size);
}

}  // namespace zmcserve
