#include "gdal/Fetcher.h"

#include <cpl_conv.h>
#include <cpl_error.h>
#include <cpl_string.h>
#include <cpl_vsi.h>

#include <algorithm>
#include <string_view>
#include <utility>

#include "gdal/ErrorCatcher.h"
#include "gdal/HttpFetcher.h"
#include "gdal/VsiSource.h"

namespace zmcgdal {
namespace {

using zelm::files::OpenMode;
using zelm::files::Range;

constexpr std::string_view kNetworks[] = {
    "/vsicurl/",          "/vsicurl?",         "/vsicurl_streaming/", "/vsis3/",
    "/vsis3_streaming/",  "/vsigs/",           "/vsigs_streaming/",   "/vsiaz/",
    "/vsioss/",           "/vsiaz_streaming/", "/vsiswift/",          "/vsiadls/",
    "/vsioss_streaming/", "/vsihdfs/",         "/vsiwebhdfs/",        "/vsiswift_streaming/"};
constexpr std::string_view kArchives[] = {".zip/", ".kmz/", ".tar/", ".tgz/", ".tar.gz/"};
constexpr std::string_view kStreaming = "_streaming";
constexpr std::string_view kCurl = "/vsicurl/";

std::size_t FirstNetwork(const std::string& name) {
    std::size_t first = name.npos;
    for (const std::string_view network : kNetworks) first = std::min(first, name.find(network));
    return first;
}

// Where the archive ends whose entry a name tells; the whole rest where that is not seen.
std::size_t EndOfArchive(const std::string& rest) {
    std::size_t end = rest.find('}');
    for (const std::string_view ending : kArchives) {
        const std::size_t found = rest.find(ending);
        if (found != rest.npos) end = std::min(end, found + ending.size() - 1);
    }
    return std::min(end, rest.size());
}

bool IsHttp(std::string_view url) {
    return url.starts_with("http://") || url.starts_with("https://");
}

std::string Item(const CPLStringList& headers, const char* name) {
    const char* const value = headers.FetchNameValue(name);
    return value ? value : "";
}

// It is asked anew each time.
ServerState AskServer(const std::string& watched) {
    const CPLErrorStateBackuper before;
    const ErrorCatcher quiet(CE_Failure);
    const CPLStringList headers(VSIGetFileMetadata(watched.c_str(), "HEADERS", nullptr));
    return {Item(headers, "Content-Length"), Item(headers, "ETag"), Item(headers, "Last-Modified")};
}

class VsiFetcher final : public Fetcher {
public:
    explicit VsiFetcher(const std::string& fileName)
        : name(fileName), watched(WatchedPart(fileName)) {}

    Bytes FetchFront() override {
        // Blocks of an earlier state, which GDAL reads again, would be mixed with those of now.
        VSICurlPartialClearCache(watched.c_str());
        // GDAL keeps what this tells of the size, and opens without asking again.
        told = AskServer(watched);
        const CPLErrorStateBackuper before;
        const ErrorCatcher errors(CE_Failure);
        opened = VsiSource::Open(name, OpenMode::Read);
        if (!opened || !opened->TellSize(size))
            throw FetchError(errors.Text().empty() ? "GDAL does not open it" : errors.Text());
        return std::move(FetchUnwatched({{{0, std::min(size, kFrontBytes)}}}).front());
    }
    std::uint64_t Size() const override { return size; }
    std::vector<Bytes> Fetch(std::span<const ByteRange> ranges) override {
        std::vector<Bytes> fetched = FetchUnwatched({ranges.begin(), ranges.end()});
        if (AskServer(watched).DiffersFrom(told)) throw FileChanged();
        return fetched;
    }

private:
    static std::string WatchedPart(const std::string& fileName) {
        std::string part = NetworkPart(fileName);
        const std::size_t streaming = part.find(kStreaming);
        if (streaming != part.npos) part.erase(streaming, kStreaming.size());
        return part;
    }

    std::vector<Bytes> FetchUnwatched(const std::vector<ByteRange>& ranges) {
        std::vector<Bytes> fetched;
        std::vector<Range> asked;
        for (const ByteRange& range : ranges) {
            fetched.emplace_back(static_cast<std::size_t>(range.size));
            asked.push_back({range.offset, fetched.back().data(), fetched.back().size(), {}});
        }
        const CPLErrorStateBackuper before;
        const ErrorCatcher errors(CE_Failure);
        if (!opened->ReadMany(asked))
            throw FetchError(errors.Text().empty() ? "less came than was asked for"
                                                   : errors.Text());
        return fetched;
    }

    const std::string name;
    const std::string watched;
    std::shared_ptr<VsiSource> opened;
    std::uint64_t size = 0;
    ServerState told;
};

}  // namespace

bool ServerState::DiffersFrom(const ServerState& other) const {
    const auto differ = [](const std::string& a, const std::string& b) {
        return !a.empty() && !b.empty() && a != b;
    };
    return differ(size, other.size) || differ(tag, other.tag) || differ(date, other.date);
}

std::string NetworkPart(const std::string& name) {
    const std::size_t first = FirstNetwork(name);
    if (first == name.npos) return "";
    std::string rest = name.substr(first);
    const std::string_view before = std::string_view(name).substr(0, first);
    const bool inArchive = before.find("/vsizip") != before.npos ||
                           before.find("/vsitar") != before.npos ||
                           before.find("/vsi7z") != before.npos;
    return inArchive ? rest.substr(0, EndOfArchive(rest)) : rest;
}

std::string NameOfUrl(const std::string& name) {
    return IsHttp(name) ? std::string(kCurl) + name : name;
}

std::unique_ptr<Fetcher> MakeFetcher(const std::string& name) {
    const bool plain =
        name.starts_with(kCurl) && IsHttp(std::string_view(name).substr(kCurl.size()));
    if (plain) return std::make_unique<HttpFetcher>(name.substr(kCurl.size()), name);
    return MakeVsiFetcher(name);
}

std::unique_ptr<Fetcher> MakeVsiFetcher(const std::string& name) {
    return std::make_unique<VsiFetcher>(name);
}

}  // namespace zmcgdal
