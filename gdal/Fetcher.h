// Fetcher: ranges of a file that lies behind a network, in as few requests as they are ranges.
//
// A fetcher stands for the file as it was when the fetcher was made, by what its server tells of it
// (ETag, Last-Modified, size). What comes from another state of the file is not given out: the
// fetch fails. Where a server tells nothing but a size, that is all that is looked at.
//
// One thread at a time.
#ifndef ZMC_GDAL_FETCHER_H
#define ZMC_GDAL_FETCHER_H

#include <cstdint>
#include <memory>
#include <span>
#include <stdexcept>
#include <string>
#include <vector>

#include "gdal/RangeStore.h"

namespace zmcgdal {

// Why nothing came, in words that stand behind "cannot read it:".
class FetchError : public std::runtime_error {
public:
    explicit FetchError(const std::string& reason) : std::runtime_error(reason) {}
};

// The server answers with the whole file whatever is asked for.
class NoRanges : public FetchError {
public:
    NoRanges() : FetchError("its server does not give parts of files") {}
};

// Another state of the file than the one that the fetcher stands for.
class FileChanged : public FetchError {
public:
    FileChanged() : FetchError("it has changed on its server since it was opened") {}
};

// What a server tells of the state of a file; texts are empty where it does not.
struct ServerState {
    std::string size;
    std::string tag;
    std::string date;

    // What only one of the two tells is no sign of a change.
    bool DiffersFrom(const ServerState& other) const;
};

class Fetcher {
public:
    // Bytes that are asked for first: a header, and as a rule the coarsest levels.
    static constexpr std::uint64_t kFrontBytes = 16384;

    virtual ~Fetcher() = default;
    Fetcher() = default;
    Fetcher(const Fetcher&) = delete;
    Fetcher& operator=(const Fetcher&) = delete;

    // The first bytes, kFrontBytes or all that there are. Called once, and before anything else.
    // Throws FetchError.
    virtual Bytes FetchFront() = 0;
    // Of the whole file, in bytes.
    virtual std::uint64_t Size() const = 0;
    // The bytes of each range, which lies inside the file, at once where that can be. Throws
    // FetchError, and gives nothing then, or std::bad_alloc.
    virtual std::vector<Bytes> Fetch(std::span<const ByteRange> ranges) = 0;
};

// The place of a network within a name of GDAL's file systems: "/vsicurl/http://host/a.zip" for
// "/vsizip//vsicurl/http://host/a.zip/b.pyr". Empty if the name has no such part; where the end of
// that part cannot be told, it is the rest of the name.
std::string NetworkPart(const std::string& name);

// What GDAL's file systems call a URL of the web; any other name as it is.
std::string NameOfUrl(const std::string& name);

// A fetcher for a name that has such a part. Nothing is asked for yet.
std::unique_ptr<Fetcher> MakeFetcher(const std::string& name);
// One that reads by GDAL's own file systems alone, with a further request before the first range
// and behind each group of them, by which a change is noticed.
std::unique_ptr<Fetcher> MakeVsiFetcher(const std::string& name);

}  // namespace zmcgdal

#endif
