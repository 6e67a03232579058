#include "serve/Compression.h"

#include <libdeflate.h>
#include <zstd.h>

#include <memory>
#include <new>

#include "serve/Negotiation.h"

namespace zmcserve {
namespace {

constexpr std::uint64_t kLeast = 1024;  // bytes that are worth it
// Quick ones: what is sent here is made for one client, at the moment.
constexpr int kGzipLevel = 3;
constexpr int kZstdLevel = 3;
constexpr const char* kSuffixes[] = {"", "-gzip", "-zstd"};

struct FreeCompressor {
    void operator()(libdeflate_compressor* made) const { libdeflate_free_compressor(made); }
};

std::string Gzipped(std::string_view bytes) {
    const std::unique_ptr<libdeflate_compressor, FreeCompressor> compressor(
        libdeflate_alloc_compressor(kGzipLevel));
    if (!compressor) throw std::bad_alloc();
    std::string coded(libdeflate_gzip_compress_bound(compressor.get(), bytes.size()), '\0');
    coded.resize(libdeflate_gzip_compress(compressor.get(), bytes.data(), bytes.size(),
                                          coded.data(), coded.size()));
    return coded;
}

// Empty where that fails.
std::string Zstandard(std::string_view bytes) {
    std::string coded(ZSTD_compressBound(bytes.size()), '\0');
    const std::size_t size =
        ZSTD_compress(coded.data(), coded.size(), bytes.data(), bytes.size(), kZstdLevel);
    coded.resize(ZSTD_isError(size) ? 0 : size);
    return coded;
}

std::string WithSuffix(std::string_view tag, const char* suffix) {
    std::string text(tag.substr(0, tag.size() - 1));
    return text + suffix + '"';
}

// The whole body without a copy, where it is one piece of memory; else read into `held`.
std::string_view BytesOf(const Answer& answer, std::string& held) {
    if (const auto* const text = std::get_if<std::string>(&answer.body)) return *text;
    if (const auto* const bytes = std::get_if<std::vector<unsigned char>>(&answer.body))
        return {reinterpret_cast<const char*>(bytes->data()), bytes->size()};
    return held = answer.Text();
}

}  // namespace

Coding CodingFor(std::string_view accepted) {
    double gzip = -1, zstd = -1, others = 0;
    for (const std::string_view part : Split(accepted, ',')) {
        const std::size_t end = part.find(';');
        const std::string_view name = Trimmed(part.substr(0, end));
        const double weight = end == part.npos ? 1 : WeightOf(part.substr(end + 1));
        if (SameWord(name, "gzip") || SameWord(name, "x-gzip")) gzip = weight;
        if (SameWord(name, "zstd")) zstd = weight;
        if (name == "*") others = weight;
    }
    if (gzip < 0) gzip = others;
    if (zstd < 0) zstd = others;
    if (zstd > 0 && zstd >= gzip) return Coding::Zstd;
    return gzip > 0 ? Coding::Gzip : Coding::None;
}

void Compress(const Request& request, std::uint64_t most, Answer& answer) {
    if (!answer.compressible || (answer.status != 200 && answer.status != 304)) return;
    answer.Set("Vary", "Accept-Encoding");
    const std::uint64_t size = answer.Size();
    if (answer.status != 200 || size < kLeast || size > most) return;
    const Coding coding = CodingFor(request.Header("Accept-Encoding").value_or(""));
    if (coding == Coding::None) return;
    std::string held;
    const std::string_view bytes = BytesOf(answer, held);
    std::string coded = coding == Coding::Gzip ? Gzipped(bytes) : Zstandard(bytes);
    if (coded.empty() || coded.size() > size / 10 * 9) return;
    answer.body = std::move(coded);
    answer.Set("Content-Encoding", coding == Coding::Gzip ? "gzip" : "zstd");
    const std::string tag(answer.Header("ETag"));
    if (!tag.empty()) answer.Set("ETag", WithSuffix(tag, kSuffixes[static_cast<int>(coding)]));
}

std::string WithoutCodings(std::string_view tags) {
    std::string text(tags);
    for (const Coding coding : {Coding::Gzip, Coding::Zstd}) {
        const std::string suffix = kSuffixes[static_cast<int>(coding)];
        for (std::size_t at = 0; (at = text.find(suffix + '"', at)) != text.npos;)
            text.erase(at, suffix.size());
    }
    return text;
}

}  // namespace zmcserve
