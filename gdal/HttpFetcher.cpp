#include "gdal/HttpFetcher.h"

#include <cpl_conv.h>
#include <cpl_error.h>
#include <cpl_http.h>
#include <cpl_string.h>
#include <cpl_vsi.h>

#include <algorithm>
#include <atomic>
#include <charconv>
#include <exception>
#include <memory>
#include <string_view>
#include <system_error>
#include <thread>
#include <utility>

#include "gdal/ErrorCatcher.h"

namespace zmcgdal {
namespace {

constexpr std::size_t kMostConnections = 8;

struct DestroyResult {
    void operator()(CPLHTTPResult* result) const { CPLHTTPDestroyResult(result); }
};
using Result = std::unique_ptr<CPLHTTPResult, DestroyResult>;

std::uint64_t NextNumber() {
    static std::atomic<std::uint64_t> last{0};
    return ++last;
}

// The last one counts: those of answers that led elsewhere stand before it.
std::string HeaderOf(const CPLHTTPResult& result, const std::string& name) {
    const std::string prefix = name + '=';
    std::string found;
    for (char** line = result.papszHeaders; line && *line; ++line)
        if (EQUALN(*line, prefix.c_str(), prefix.size())) found = *line + prefix.size();
    return found;
}

// "bytes 0-16383/1000000"
struct ContentRange {
    ByteRange range;
    std::uint64_t total = 0;
};

bool TakeNumber(std::string_view& text, std::uint64_t& number) {
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc()) return false;
    text.remove_prefix(static_cast<std::size_t>(end - text.data()));
    return true;
}

bool TakeText(std::string_view& text, std::string_view expected) {
    if (!text.starts_with(expected)) return false;
    text.remove_prefix(expected.size());
    return true;
}

bool Parse(std::string_view text, ContentRange& parsed) {
    std::uint64_t last = 0;
    if (!TakeText(text, "bytes ") || !TakeNumber(text, parsed.range.offset) ||
        !TakeText(text, "-") || !TakeNumber(text, last) || !TakeText(text, "/") ||
        !TakeNumber(text, parsed.total) || !text.empty())
        return false;
    if (last < parsed.range.offset || last >= parsed.total) return false;
    parsed.range.size = last - parsed.range.offset + 1;
    return true;
}

std::string ReasonOf(const CPLHTTPResult& result, const std::string& reported) {
    if (result.pszErrBuf && *result.pszErrBuf) return result.pszErrBuf;
    return reported.empty() ? "the server did not answer" : reported;
}

// Where GDAL's settings have several headers, they stand in lines, or between commas.
std::string InLines(std::string headers) {
    if (headers.find_first_of("\r\n") != headers.npos) return headers;
    const CPLStringList parts(CSLTokenizeString2(headers.c_str(), ",", 0));
    std::string lines;
    for (int i = 0; i < parts.Count(); ++i) {
        if (!strchr(parts[i], ':')) return headers;
        if (i != 0) lines += "\r\n";
        lines += parts[i];
    }
    return lines;
}

// Settings of the caller's thread, for another one.
class Settings {
public:
    Settings() : list(CPLGetThreadLocalConfigOptions()) {}
    void Apply() const { CPLSetThreadLocalConfigOptions(list.List()); }

private:
    CPLStringList list;
};

// GDAL's client changes how the process takes a broken pipe for the time of a request, and changes
// it back: of several at once, the last one would put back what another one had made of it.
class BrokenPipesIgnored {
public:
    BrokenPipesIgnored() : before(CPLHTTPIgnoreSigPipe()) {}
    ~BrokenPipesIgnored() { CPLHTTPRestoreSigPipeHandler(before); }
    BrokenPipesIgnored(const BrokenPipesIgnored&) = delete;
    BrokenPipesIgnored& operator=(const BrokenPipesIgnored&) = delete;

private:
    void* const before;
};

// Calls work(index, worker) for all indices below `count`, on this thread and on as many more as
// that takes and there are to be had. The first exception comes out when all have ended.
template <class Work>
void OnThreads(std::size_t count, std::size_t workers, Work&& work) {
    std::atomic<std::size_t> next{0};
    std::vector<std::exception_ptr> thrown(workers);
    const Settings settings;
    const BrokenPipesIgnored meanwhile;
    const auto run = [&](std::size_t worker) {
        try {
            for (std::size_t index = next++; index < count; index = next++) work(index, worker);
        } catch (...) {
            thrown[worker] = std::current_exception();
            next = count;
        }
    };
    std::vector<std::thread> threads;
    threads.reserve(workers);
    try {
        for (std::size_t worker = 1; worker < workers; ++worker)
            threads.emplace_back([&run, &settings, worker] {
                settings.Apply();
                run(worker);
            });
    } catch (const std::exception&) {
        // Neither threads nor memory for more: those that there are do it.
    }
    run(0);
    for (std::thread& thread : threads) thread.join();
    for (const std::exception_ptr& each : thrown)
        if (each) std::rethrow_exception(each);
}

}  // namespace

HttpFetcher::HttpFetcher(std::string fileUrl, std::string vsiName)
    : url(std::move(fileUrl)), name(std::move(vsiName)), number(NextNumber()) {}

HttpFetcher::~HttpFetcher() {
    for (std::size_t slot = 0; slot < slots; ++slot) {
        CPLStringList options;
        options.SetNameValue("CLOSE_PERSISTENT", ConnectionName(slot).c_str());
        CPLHTTPFetch(url.c_str(), options.List());
    }
}

// GDAL must not be asked for one from two threads at once.
std::string HttpFetcher::ConnectionName(std::size_t slot) const {
    return "zmcraster-" + std::to_string(number) + '-' + std::to_string(slot);
}

// Compressed answers would have no ranges of the file.
std::string HttpFetcher::HeadersFor(const ByteRange& range) const {
    std::string headers = "Range: bytes=" + std::to_string(range.offset) + '-' +
                          std::to_string(range.End() - 1) + "\r\nAccept-Encoding: identity";
    const std::string own = VSIGetPathSpecificOption(name.c_str(), "GDAL_HTTP_HEADERS",
                                                     CPLGetConfigOption("GDAL_HTTP_HEADERS", ""));
    if (!own.empty()) headers += "\r\n" + InLines(own);
    return headers;
}

HttpFetcher::Answer HttpFetcher::Ask(const ByteRange& range, std::size_t slot) const {
    CPLStringList options;
    options.SetNameValue("PERSISTENT", ConnectionName(slot).c_str());
    options.SetNameValue("HEADERS", HeadersFor(range).c_str());
    options.SetNameValue("MAX_FILE_SIZE", std::to_string(range.size).c_str());
    const CPLErrorStateBackuper before;
    const ErrorCatcher errors(CE_Failure);
    const Result result(CPLHTTPFetch(url.c_str(), options.List()));
    if (!result) throw FetchError(ReasonOf({}, errors.Text()));
    ContentRange came;
    const std::string described = HeaderOf(*result, "Content-Range");
    const bool failed = result->nStatus != 0 || (result->pszErrBuf && *result->pszErrBuf);
    const bool tooMuch = errors.Text().find("aximum file size") != std::string::npos;
    if (described.empty() && (!failed || tooMuch)) throw NoRanges();
    if (failed) throw FetchError(ReasonOf(*result, errors.Text()));
    if (!Parse(described, came) || came.range.offset != range.offset ||
        came.range.size != std::min(range.size, came.total - range.offset))
        throw FetchError("its server answers another range than was asked for");
    if (static_cast<std::uint64_t>(result->nDataLen) != came.range.size)
        throw FetchError("its server answers less than it says");
    return {Bytes(result->pabyData, result->pabyData + result->nDataLen),
            came.total,
            {std::to_string(came.total), HeaderOf(*result, "ETag"),
             HeaderOf(*result, "Last-Modified")}};
}

Bytes HttpFetcher::FetchFront() {
    Answer answer = Ask({0, kFrontBytes}, 0);
    total = answer.total;
    told = std::move(answer.state);
    return std::move(answer.bytes);
}

Bytes HttpFetcher::AskSame(const ByteRange& range, std::size_t slot) const {
    Answer answer = Ask(range, slot);
    if (answer.state.DiffersFrom(told)) throw FileChanged();
    return std::move(answer.bytes);
}

std::vector<Bytes> HttpFetcher::Fetch(std::span<const ByteRange> ranges) {
    std::vector<Bytes> fetched(ranges.size());
    const std::size_t workers = std::clamp<std::size_t>(ranges.size(), 1, kMostConnections);
    slots = std::max(slots, workers);
    OnThreads(ranges.size(), workers, [&](std::size_t index, std::size_t worker) {
        fetched[index] = AskSame(ranges[index], worker);
    });
    return fetched;
}

}  // namespace zmcgdal
