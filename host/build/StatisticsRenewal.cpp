#include "host/build/StatisticsRenewal.h"

#include <algorithm>
#include <optional>
#include <set>
#include <span>
#include <string_view>
#include <utility>

#include "core/PixelVocabulary.h"
#include "files/FileSource.h"
#include "format/DocumentLimits.h"
#include "host/base/Error.h"
#include "host/build/SampleGathering.h"
#include "host/file/MetadataDocument.h"
#include "host/file/StoredRecords.h"
#include "host/journal/MetadataJournal.h"
#include "host/raster/ArrayOf.h"
#include "host/raster/Raster.h"
#include "host/statistics/BandStatistics.h"
#include "host/statistics/Histogram.h"
#include "host/statistics/ValueCounter.h"
#include "platform/FileSystem.h"

namespace zmchost {
namespace {

constexpr const char* kRenew = "renew its statistics";

// Exact sums and tables of values are large.
constexpr std::size_t kBandsAtOnce = 128;

template <class T>
class Renewal {
public:
    Renewal(Raster& pyramid, const RenewalRequest& what) : raster(pyramid), request(what) {
        wanted = request.bands.empty() ? raster.AllBands() : request.bands;
        const auto groups = (wanted.size() + kBandsAtOnce - 1) / kBandsAtOnce;
        walks = groups * (kCountsEveryValue<T> ? 1 : 2);
    }

    std::vector<FullStatistics> Compute() {
        const std::span<const std::uint32_t> all(wanted);
        for (std::size_t done = 0; done < all.size(); done += kBandsAtOnce)
            ComputeGroup(all.subspan(done, std::min(kBandsAtOnce, all.size() - done)));
        std::vector<FullStatistics> full;
        for (const auto& record : statistics) full.push_back(FullStatistics::Of(record));
        return full;
    }

    // Those of the bands that were left out as they are.
    void TakeOthers() {
        const std::set<std::uint32_t> renewed(wanted.begin(), wanted.end());
        const auto records = raster.Records<T>();
        for (std::uint32_t band = 0; band < raster.Bands(); ++band) {
            const auto* const other = records->NewestStatistics(band);
            if (other && renewed.count(band) == 0) statistics.push_back(*other);
        }
        std::sort(statistics.begin(), statistics.end(),
                  [](const auto& a, const auto& b) { return a.band < b.band; });
        std::vector<zelm::RasterBandHistogram<T>> others;
        for (const auto& histogram : records->Histograms())
            if (renewed.count(histogram.band) == 0) others.push_back(histogram);
        histograms.insert(histograms.begin(), others.begin(), others.end());
    }

    void Store(Raster& stripped) const {
        stripped.Store([&] {
            bool taken = false;
            stripped.Visit([&]<class U>(zelm::RasterReader<U>& reader) {
                if constexpr (std::is_same_v<T, U>)
                    taken = reader.SetBandStats(ArrayOf(statistics)) &&
                            reader.SetHistograms(ArrayOf(histograms));
            });
            stripped.CheckDisk(kRenew);
            if (!taken) throw Error(stripped.Name(), kRenew, "the module did not store them");
        });
        const auto stored = stripped.Records<T>();
        if (!stored || stored->Statistics().size() != statistics.size() ||
            stored->Histograms().size() != histograms.size())
            throw Error(stripped.Name(), kRenew, "the module did not store them");
    }

private:
    Raster& raster;
    const RenewalRequest& request;
    std::vector<std::uint32_t> wanted;
    std::vector<zelm::RasterBandStats<T>> statistics;
    std::vector<zelm::RasterBandHistogram<T>> histograms;
    std::size_t walks = 1;
    std::size_t walk = 0;  // that is under way

    void ComputeGroup(std::span<const std::uint32_t> bands) {
        if constexpr (kCountsEveryValue<T>) {
            std::vector<ValueCounter<T>> counters(bands.size());
            Walk(bands, ValueCounter<T>::kBytes, counters);
            for (std::size_t i = 0; i < bands.size(); ++i) {
                statistics.push_back(counters[i].Statistics().Stats(bands[i]));
                histograms.push_back(counters[i].Histogram(request.bins).Histogram(bands[i]));
            }
        } else {
            std::vector<BandAccumulator<T>> sums(bands.size());
            Walk(bands, BandAccumulator<T>::kBytes, sums);
            std::vector<HistogramAccumulator<T>> counts;
            for (std::size_t i = 0; i < bands.size(); ++i) {
                statistics.push_back(sums[i].Stats(bands[i]));
                const auto& found = statistics.back();
                counts.emplace_back(
                    HistogramBins<T>::ForBand(found.minimum, found.maximum, request.bins));
            }
            Walk(bands, request.bins * sizeof(std::uint64_t), counts);
            for (std::size_t i = 0; i < bands.size(); ++i)
                histograms.push_back(counts[i].Histogram(bands[i]));
        }
    }

    // Lets each of `gatherers`, which take so many bytes each, have its band of level 0.
    template <class Gatherer>
    void Walk(std::span<const std::uint32_t> bands, std::size_t bytes,
              std::vector<Gatherer>& gatherers) {
        const std::uint32_t level = raster.MinLevel();
        const double pixels = static_cast<double>(raster.Width(level)) * raster.Height(level);
        double done = 0;
        GatherSamples<T>(
            raster, request.threads, bands.size() * bytes, bands, gatherers,
            [&](std::uint64_t further) {
                done += static_cast<double>(further);
                Advance((static_cast<double>(walk) + done / pixels) / static_cast<double>(walks));
            });
        ++walk;
    }

    void Advance(double share) const {
        if (request.progress && !request.progress(share)) throw Cancelled(raster.Name(), kRenew);
    }
};

// --- the document ---

// One after the other the marks of a well-formed text: tags, comments and the like.
class MarkupWalk {
public:
    explicit MarkupWalk(std::string_view document) : text(document) {}

    bool Next() {
        begin = text.find('<', end);
        if (begin == text.npos) return false;
        if (Begins("<!--"))
            end = Behind("-->");
        else if (Begins("<![CDATA["))
            end = Behind("]]>");
        else if (Begins("<?"))
            end = Behind("?>");
        else
            end = BehindTag();
        return true;
    }

    bool IsElement() const { return !Begins("<!") && !Begins("<?"); }
    bool Opens() const { return IsElement() && !Begins("</"); }
    bool Closes() const { return Begins("</") || (IsElement() && text[end - 2] == '/'); }
    std::string_view Name() const {
        const std::size_t first = begin + (Begins("</") ? 2 : 1);
        return text.substr(first, text.find_first_of(" \t\r\n/>", first) - first);
    }

    std::size_t begin = 0;
    std::size_t end = 0;

private:
    std::string_view text;

    bool Begins(std::string_view mark) const { return text.substr(begin).starts_with(mark); }
    std::size_t Behind(std::string_view mark) const {
        const std::size_t found = text.find(mark, begin);
        return found == text.npos ? text.size() : found + mark.size();
    }
    // A value in quotes may hold the sign that ends a tag.
    std::size_t BehindTag() const {
        char quote = 0;
        for (std::size_t i = begin; i < text.size(); ++i) {
            const char c = text[i];
            if (quote != 0)
                quote = c == quote ? '\0' : quote;
            else if (c == '"' || c == '\'')
                quote = c;
            else if (c == '>')
                return i + 1;
        }
        return text.size();
    }
};

bool IsRecord(std::string_view name) { return name == "BANDSTATISTICS" || name == "HISTOGRAMS"; }

// The order of steps is that of every store: a mark that no parser takes for a document, the rest,
// and the first byte.
void ReplaceDocument(zelm::files::ByteSource& source, const std::string& name, std::uint64_t offset,
                     std::string_view text) {
    int error = 0;
    const auto write = [&](std::uint64_t at, std::string_view bytes) {
        if (source.WriteAt(at, bytes.data(), bytes.size(), &error) != bytes.size())
            throw Error(name, kRenew, platform::ErrorText(error));
    };
    if (!text.empty()) {
        const char mark = zelm::kUnfinishedDocument;
        write(offset, {&mark, 1});
        write(offset + 1, text.substr(1));
    }
    if (!source.Truncate(offset + text.size(), &error))
        throw Error(name, kRenew, platform::ErrorText(error));
    if (!text.empty()) write(offset, text.substr(0, 1));
}

void StripRecords(zelm::files::ByteSource& source, const std::string& name,
                  const PyramidHeader& header, const std::string& text) {
    if (text.empty()) return;
    // A byte order mark of UTF-8 may come first, and no other.
    constexpr std::string_view kFirst = "< \t\r\n\xEF";
    if (kFirst.find(text.front()) == kFirst.npos)
        throw Error(name, kRenew,
                    "its metadata document is in an encoding that is not taken apart");
    const std::string stripped = WithoutRecords(text);
    if (!stripped.empty())
        if (const std::string wrong = JudgeMetadataText(stripped); !wrong.empty())
            throw Error(name, kRenew, wrong);
    ReplaceDocument(source, name, header.tileDataEnd, stripped);
}

// Whatever is thrown while an object of this class lives, the document is again what it was.
class OldDocument {
public:
    OldDocument(zelm::files::ByteSource& file, std::string fileName, std::uint64_t place)
        : source(file), name(std::move(fileName)), offset(place) {}
    ~OldDocument() {
        if (!settled) try {
                ReplaceDocument(source, name, offset, text);
            } catch (...) {
                // What could not be written cannot be told by anyone but who reads it.
            }
    }
    OldDocument(const OldDocument&) = delete;
    OldDocument& operator=(const OldDocument&) = delete;
    void Settle() { settled = true; }

    std::string text;

private:
    zelm::files::ByteSource& source;
    std::string name;
    std::uint64_t offset;
    bool settled = false;
};

}  // namespace

std::string WithoutRecords(const std::string& text) {
    std::string kept;
    MarkupWalk walk(text);
    std::size_t taken = 0;  // up to where `text` has been dealt with
    int depth = 0;
    bool inRecord = false, anything = false;
    while (walk.Next()) {
        if (walk.Opens()) {
            if (depth == 1 && IsRecord(walk.Name())) {
                kept.append(text, taken, walk.begin - taken);
                inRecord = true;
            } else if (depth == 1) {
                anything = true;
            }
            ++depth;
        }
        if (walk.Closes() && --depth == 1 && inRecord) {
            inRecord = false;
            taken = walk.end;
        }
        if (depth == 1 && !walk.IsElement()) anything = true;
    }
    kept.append(text, taken, text.npos);
    return anything ? kept : "";
}

std::vector<FullStatistics> RenewStatistics(const ModulePtr& module,
                                            const std::shared_ptr<zelm::files::ByteSource>& source,
                                            const std::string& name,
                                            const RenewalRequest& request) {
    Raster raster = Raster::Open(module, source, name);
    raster.CheckComplete(kRenew);
    if (!raster.IsWritable()) throw Error(name, kRenew, "the file is read-only");
    if (const std::string wrong = raster.DocumentFault(); !wrong.empty())
        throw Error(name, kRenew, wrong);
    raster.SetNoDataValues(request.noDataValues);
    std::vector<FullStatistics> full;
    zelm::VisitElementType(raster.PixelType(), [&]<class T>(std::type_identity<T>) {
        if constexpr (zelm::kIsComplex<T>) {
            throw Error(name, kRenew, "complex samples have no order");
        } else {
            Renewal<T> renewal(raster, request);
            full = renewal.Compute();
            renewal.TakeOthers();
            if (const std::string change = raster.Change(); !change.empty())
                throw Error(name, kRenew, change);
            std::optional<MetadataJournal> copy;
            if (dynamic_cast<zelm::files::FileSource*>(source.get())) copy.emplace(name);
            OldDocument old(*source, name, raster.Header().tileDataEnd);
            old.text = ReadMetadataText(*source, name, raster.Header());
            StripRecords(*source, name, raster.Header(), old.text);
            Raster stripped = Raster::Open(module, source, name);
            renewal.Store(stripped);
            old.Settle();
            if (copy) copy->Finish();
        }
    });
    return full;
}

}  // namespace zmchost
