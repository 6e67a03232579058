// HttpFetcher: the fetcher for a plain URL. Each answer is judged by its own headers, so that a
// change of the file costs no request to notice. Requests of one group run on several threads, with
// GDAL's HTTP client and its settings (GDAL_HTTP_...) of the caller's thread.
#ifndef ZMC_GDAL_HTTPFETCHER_H
#define ZMC_GDAL_HTTPFETCHER_H

#include <string>
#include <vector>

#include "gdal/Fetcher.h"

namespace zmcgdal {

class HttpFetcher final : public Fetcher {
public:
    // `vsiName` is what GDAL knows the URL by, for settings that belong to a path.
    HttpFetcher(std::string fileUrl, std::string vsiName);
    ~HttpFetcher() override;

    // Throws NoRanges as well.
    Bytes FetchFront() override;
    std::uint64_t Size() const override { return total; }
    std::vector<Bytes> Fetch(std::span<const ByteRange> ranges) override;

private:
    struct Answer {
        Bytes bytes;
        std::uint64_t total = 0;  // bytes of the whole file
        ServerState state;
    };

    Answer Ask(const ByteRange& range, std::size_t slot) const;
    Bytes AskSame(const ByteRange& range, std::size_t slot) const;
    std::string ConnectionName(std::size_t slot) const;
    std::string HeadersFor(const ByteRange& range) const;

    const std::string url;
    const std::string name;
    const std::uint64_t number;  // of this object in the process
    std::uint64_t total = 0;     // bytes of the file
    ServerState told;
    std::size_t slots = 1;  // connections that were used
};

}  // namespace zmcgdal

#endif
