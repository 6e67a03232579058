#include <turbojpeg.h>

#include <memory>
#include <new>
#include <stdexcept>

#include "render/Codecs.h"

namespace zmcrender {
namespace {

constexpr int kFullColour = 90;  // from this quality on colours are as fine as brightness

struct Destroy {
    void operator()(void* handle) const { tjDestroy(handle); }
};

// Of the thread: its buffers are made once.
tjhandle Compressor() {
    thread_local const std::unique_ptr<void, Destroy> handle(tjInitCompress());
    if (!handle) throw std::bad_alloc();
    return handle.get();
}

}  // namespace

std::vector<unsigned char> EncodeJpeg(const Picture& picture, int quality) {
    const int width = static_cast<int>(picture.width), height = static_cast<int>(picture.height);
    const int sampling =
        picture.channels == 1 ? TJSAMP_GRAY : (quality < kFullColour ? TJSAMP_420 : TJSAMP_444);
    const int format = picture.channels == 1 ? TJPF_GRAY : TJPF_RGB;
    thread_local std::vector<unsigned char> room;
    const unsigned long most = tjBufSize(width, height, sampling);
    if (most == static_cast<unsigned long>(-1)) throw std::runtime_error("JPEG: too large");
    if (room.size() < most) room.resize(most);
    unsigned char* to = room.data();
    unsigned long size = most;
    if (tjCompress2(Compressor(), picture.bytes.data(), width,
                    static_cast<int>(picture.LineBytes()), height, format, &to, &size, sampling,
                    quality, TJFLAG_NOREALLOC) != 0)
        throw std::runtime_error(std::string("JPEG: ") + tjGetErrorStr2(Compressor()));
    std::vector<unsigned char> file(to, to + size);
    // A large picture's room is not kept.
    constexpr std::size_t kKept = std::size_t{1} << 20;
    if (room.size() > kKept) std::vector<unsigned char>().swap(room);
    return file;
}

}  // namespace zmcrender
