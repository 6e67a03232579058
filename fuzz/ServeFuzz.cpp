// A request of a stranger: its target and headers, through the services without a socket.
//
// An input is the target, then lines of headers. Whatever it is, there is an answer of a status
// that makes sense; one that refuses is a line of text, and no answer holds more than the limits
// allow.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <string>

#include "fuzz/support/Expect.h"
#include "fuzz/support/Gdal.h"
#include "fuzz/support/Host.h"
#include "fuzz/support/ScratchFolder.h"
#include "gdal/LazyRaster.h"
#include "host/build/PyramidBuilder.h"
#include "serve/Compression.h"
#include "serve/Service.h"

namespace {

using zmcserve::Answer;
using zmcserve::Request;

class Ramp final : public zmchost::RasterSource {
public:
    explicit Ramp(std::uint32_t bands) {
        props.samples = 90;
        props.lines = 70;
        props.bands = bands;
        props.pixelType = zelm::PixelTypeCode::UInt16;
    }
    std::string Name() const override { return "ramp"; }
    zelm::RasterProps Props() const override { return props; }
    void Read(const zmchost::Window& window, std::span<const std::uint32_t> bands,
              void* pixels) override {
        auto* to = static_cast<std::uint16_t*>(pixels);
        for (std::uint32_t y = window.y; y < window.y + window.height; ++y)
            for (std::uint32_t x = window.x; x < window.x + window.width; ++x)
                for (const std::uint32_t band : bands)
                    *to++ = static_cast<std::uint16_t>(x * 700 + y * 31 + band * 999);
    }

private:
    zelm::RasterProps props;
};

zmcserve::ServiceLimits SmallLimits() {
    zmcserve::ServiceLimits limits;
    limits.pixels = 1u << 16;
    limits.window = 1u << 20;
    return limits;
}

zmcserve::Service& TheService() {
    static const zmcfuzz::ScratchFolder folder;
    static zmcserve::Service* const service = [] {
        zmcfuzz::StartGdal();
        std::filesystem::create_directory(folder / "sub");
        for (const auto& [name, bands] : {std::pair("a.pyr", 3u), std::pair("sub/m.pyr", 9u)}) {
            Ramp source(bands);
            zmchost::PyramidBuilder(zmcgdal::SharedModule()).Build(source, folder / name);
            std::filesystem::last_write_time(
                folder / name,
                std::filesystem::file_time_type::clock::now() - std::chrono::hours(1));
        }
        std::ofstream(folder / "a.pyr.aux.xml")
            << "<PAMDataset><SRS>EPSG:32633</SRS><GeoTransform>400000,1000,0,5000000,0,-1000"
               "</GeoTransform></PAMDataset>";
        std::ofstream(folder / "text.pyr") << "no pyramid";
        return new zmcserve::Service({folder.Path()}, false, zmcgdal::SharedModule(),
                                     SmallLimits());
    }();
    return *service;
}

void TakeHeaders(std::string_view text, Request& request) {
    for (const std::string_view line : zmcserve::Split(text, '\n')) {
        const std::size_t colon = line.find(':');
        if (colon == line.npos || request.headers.size() == Request::kMostHeaders) continue;
        request.headers.emplace_back(line.substr(0, colon),
                                     zmcserve::Trimmed(line.substr(colon + 1)));
    }
}

void CheckAnswer(const Answer& answer) {
    ZMC_EXPECT(answer.status >= 200 && answer.status < 600);
    ZMC_EXPECT(answer.status != 500);
    ZMC_EXPECT(answer.Size() < (4u << 20));
    for (const auto& [name, value] : answer.headers)
        ZMC_EXPECT(value.find_first_of("\r\n") == value.npos);
    if (answer.status < 400) return;
    const std::string text = answer.Text();
    ZMC_EXPECT(!text.empty() && text.find('\n') == text.size() - 1);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view input(reinterpret_cast<const char*>(data), size);
    const std::size_t end = std::min(input.find('\n'), input.size());
    zmcserve::Service& service = TheService();
    Answer answer;
    try {
        Request request = Request::Parse(zmcserve::Method::Get, input.substr(0, end));
        TakeHeaders(input.substr(end), request);
        request.baseUrl = "http://here";
        const auto quick = service.router.HandleQuickly(request, service);
        answer = service.Handle(request);
        if (quick) ZMC_EXPECT(quick->status == answer.status);
        zmcserve::Compress(request, service.limits.compressed, answer);
    } catch (const zmcserve::Refusal& refusal) {
        answer = zmcserve::ToAnswer(refusal);
    }
    CheckAnswer(answer);
    return 0;
}
