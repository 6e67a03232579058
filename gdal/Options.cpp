#include "gdal/Options.h"

#include <cpl_error.h>

#include <algorithm>
#include <cctype>
#include <charconv>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "host/base/Error.h"
#include "host/base/ScaledNumber.h"
#include "host/base/Threads.h"

namespace zmcgdal {

const char* const kOpenOptionsXml = R"(<OpenOptionList>
  <Option name='INT8_AS' type='string-select' description='How signed bytes are shown, if not as Int8, or as Int16 before GDAL 3.7'>
    <Value>INT16</Value>
    <Value>SIGNEDBYTE</Value>
  </Option>
  <Option name='KEEP_COPIES' type='boolean' default='NO' description='Whether stores of statistics, histograms and color tables keep what was stored before in FILE.zmcmeta until they have reached the disk'/>
  <Option name='MISSING' type='string-select' default='FAIL' description='What reading pixels does that an incomplete file does not have'>
    <Value>FAIL</Value>
    <Value>ZEROS</Value>
  </Option>
  <Option name='STATISTICS' type='boolean' default='NO' description='Whether closing renews the statistics and histograms of bands whose pixels were changed'/>
  <Option name='NUM_THREADS' type='string' default='1' description='Threads that read a large window together: a number or ALL_CPUS. The default is that of the configuration option GDAL_NUM_THREADS, if that is set'/>
  <Option name='OVERVIEW_LEVEL' type='string' description='Number of the overview, from 0, to show in place of the raster; "2 only" without the coarser ones, NONE for the raster without any'/>
  <Option name='REMOTE_CACHE' type='string' default='64M' description='Bytes of a file behind a network that are kept, in bytes or with K, M or G'/>
</OpenOptionList>)";

namespace {

// The methods as values of an option: one list for all who name them.
std::string MethodValues() {
    std::string values;
    for (std::uint32_t method = 0; method < zmchost::kResamplings; ++method) {
        std::string name = zmchost::ResamplingName(static_cast<zmchost::Resampling>(method));
        for (char& c : name) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
        values += "    <Value>" + name + "</Value>\n";
    }
    return values;
}

const std::string kCreationOptions =
    R"(<CreationOptionList>
  <Option name='RESAMPLING' type='string-select' description='How levels are reduced; MODE by default for a raster with a color table, else AVERAGE'>
)" + MethodValues() +
    R"(  </Option>
  <Option name='LEVELS' type='string' default='AUTO' description='Number of the coarsest level, 0 for no reduced level; AUTO goes on until a level fits one tile'/>
  <Option name='ORDERING' type='string-select' default='AUTO' description='Order of the tiles in the file; MORTON for more than eight bands, and only then'>
    <Value>AUTO</Value>
    <Value>SCANLINE</Value>
    <Value>BLOCKED</Value>
    <Value>MORTON</Value>
  </Option>
  <Option name='STATISTICS' type='boolean' default='YES' description='Whether to store statistics and histograms'/>
  <Option name='WEIGHTS' type='string-select' default='AUTO' description='Whether an alpha band and masks weigh the pixels that levels are reduced from; NONE: all count alike'>
    <Value>AUTO</Value>
    <Value>NONE</Value>
  </Option>
  <Option name='BINS' type='int' default='256' description='Bins of a histogram'/>
  <Option name='NUM_THREADS' type='string' default='ALL_CPUS' description='Threads to build with: a number or ALL_CPUS'/>
  <Option name='MEMORY' type='string' default='256M' description='Memory for pixels, in bytes or with K, M or G'/>
  <Option name='EMBED' type='boolean' default='NO' description='Whether georeference, no-data values and further metadata go into the file and not beside it'/>
  <Option name='PIXELTYPE' type='string-select' default='DEFAULT' description='SIGNEDBYTE takes Byte for signed'>
    <Value>DEFAULT</Value>
    <Value>SIGNEDBYTE</Value>
  </Option>
</CreationOptionList>)";

}  // namespace

const char* const kCreationOptionsXml = kCreationOptions.c_str();

namespace {

constexpr std::size_t kMaxDigits = 18;

std::optional<std::uint64_t> ParseCount(const std::string& text) {
    if (text.empty() ||
        !std::all_of(text.begin(), text.end(),
                     [](unsigned char c) { return std::isdigit(c) != 0; }) ||
        text.size() > kMaxDigits)
        return std::nullopt;
    return std::strtoull(text.c_str(), nullptr, 10);
}

std::optional<std::uint64_t> ParseSize(std::string text) {
    if (!text.empty() && (text.back() == 'B' || text.back() == 'b')) text.pop_back();
    const auto digits = std::count_if(text.begin(), text.end(),
                                      [](unsigned char c) { return std::isdigit(c) != 0; });
    if (static_cast<std::size_t>(digits) > kMaxDigits) return std::nullopt;
    return zmchost::ParseScaled(text, "KMGkmg");
}

std::optional<zmchost::Ordering> ParseOrdering(const char* word) {
    using zmchost::Ordering;
    if (EQUAL(word, "AUTO")) return Ordering::Auto;
    if (EQUAL(word, "SCANLINE")) return Ordering::Scanline;
    if (EQUAL(word, "BLOCKED")) return Ordering::Blocked;
    if (EQUAL(word, "MORTON")) return Ordering::Morton;
    return std::nullopt;
}

bool Report(const char* name, const char* value) {
    CPLError(CE_Failure, CPLE_IllegalArg, "%s=%s is not understood", name, value);
    return false;
}

// Whether a numeric option is absent or good; `out` is set only where it is given.
template <class Number>
bool TakeCount(CSLConstList options, const char* name, const char* automatic, Number& out) {
    const char* const value = CSLFetchNameValue(options, name);
    if (!value || (automatic && EQUAL(value, automatic))) return true;
    const auto count = ParseCount(value);
    if (!count || *count > INT32_MAX) return Report(name, value);
    out = static_cast<std::uint32_t>(*count);
    return true;
}

std::uint32_t ThreadsFrom(CSLConstList options) {
    const char* const value =
        CSLFetchNameValueDef(options, "NUM_THREADS", CPLGetConfigOption("GDAL_NUM_THREADS", "1"));
    const auto count = EQUAL(value, "ALL_CPUS") ? zmchost::AvailableThreads() : ParseCount(value);
    if (!count) CPLError(CE_Warning, CPLE_IllegalArg, "Invalid value for NUM_THREADS: %s", value);
    return static_cast<std::uint32_t>(
        std::clamp<std::uint64_t>(count.value_or(1), 1, zmchost::kMaxThreads));
}

// Words of GDAL's own: "2", "2 only", "NONE" for the raster without overviews.
void TakeOverview(const std::string& word, OpenOptions& parsed) {
    int number = 0;
    if (std::from_chars(word.data(), word.data() + word.size(), number).ec == std::errc() &&
        number >= 0)
        parsed.overview = number;
    parsed.alone = EQUAL(word.c_str(), "NONE") || CPLString(word).ifind("only") != word.npos;
}

}  // namespace

OpenOptions OpenOptionsFrom(CSLConstList options) {
    OpenOptions parsed;
    const char* const signedByteAs = CSLFetchNameValueDef(options, "INT8_AS", "");
    if (EQUAL(signedByteAs, "INT16")) parsed.signedByteAs = SignedByteAs::Int16;
    if (EQUAL(signedByteAs, "SIGNEDBYTE")) parsed.signedByteAs = SignedByteAs::FlaggedByte;
    parsed.keepCopies = CPLFetchBool(options, "KEEP_COPIES", false);
    parsed.missingAsZeros = EQUAL(CSLFetchNameValueDef(options, "MISSING", "FAIL"), "ZEROS") != 0;
    parsed.statistics = CPLFetchBool(options, "STATISTICS", false);
    parsed.threads = ThreadsFrom(options);
    TakeOverview(CSLFetchNameValueDef(options, "OVERVIEW_LEVEL", ""), parsed);
    if (const char* const cache = CSLFetchNameValue(options, "REMOTE_CACHE")) {
        const auto size = ParseSize(cache);
        if (!size)
            throw zmchost::Error("REMOTE_CACHE", "take " + std::string(cache), "it is no size");
        parsed.remoteBytes = *size;
    }
    return parsed;
}

std::optional<zmchost::Resampling> ResamplingFrom(const char* word) {
    std::string lower(word);
    for (char& c : lower) c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    if (lower == "near") lower = "nearest";
    return zmchost::ParseResampling(lower);
}

std::optional<CreationOptions> ParseCreationOptions(CSLConstList options) {
    CreationOptions parsed;
    parsed.build.overwrite = true;
    if (const char* const word = CSLFetchNameValue(options, "RESAMPLING")) {
        parsed.build.resampling = ResamplingFrom(word);
        if (!parsed.build.resampling && !Report("RESAMPLING", word)) return std::nullopt;
    }
    const char* const ordering = CSLFetchNameValueDef(options, "ORDERING", "AUTO");
    const auto order = ParseOrdering(ordering);
    if (!order && !Report("ORDERING", ordering)) return std::nullopt;
    parsed.build.ordering = *order;
    if (const char* const memory = CSLFetchNameValue(options, "MEMORY")) {
        const auto size = ParseSize(memory);
        if (!size && !Report("MEMORY", memory)) return std::nullopt;
        parsed.build.memory = *size;
    }
    const char* const weights = CSLFetchNameValueDef(options, "WEIGHTS", "AUTO");
    parsed.build.weights = EQUAL(weights, "AUTO");
    if (!parsed.build.weights && !EQUAL(weights, "NONE") && !Report("WEIGHTS", weights))
        return std::nullopt;
    parsed.build.statistics = CPLFetchBool(options, "STATISTICS", true);
    parsed.embed = CPLFetchBool(options, "EMBED", false);
    parsed.signedByte =
        EQUAL(CSLFetchNameValueDef(options, "PIXELTYPE", "DEFAULT"), "SIGNEDBYTE") != 0;
    if (!TakeCount(options, "LEVELS", "AUTO", parsed.build.levels) ||
        !TakeCount(options, "BINS", nullptr, parsed.build.bins) ||
        !TakeCount(options, "NUM_THREADS", "ALL_CPUS", parsed.build.threads))
        return std::nullopt;
    return parsed;
}

}  // namespace zmcgdal
