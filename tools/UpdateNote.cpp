#include "tools/UpdateNote.h"

#include <algorithm>
#include <cstddef>
#include <nlohmann/json.hpp>
#include <utility>

#include "files/Lending.h"
#include "gdal/Dataset.h"
#include "host/build/PyramidUpdate.h"
#include "platform/Interrupts.h"
#include "tools/Interrupt.h"
#include "tools/Message.h"
#include "tools/MosaicSource.h"
#include "tools/SceneNames.h"

namespace zmctools {
namespace {

using Json = nlohmann::ordered_json;

constexpr const char* kVersionKey = "zmcrasterRecords";
constexpr int kNoteVersion = 1;
constexpr char kBehindWords = '\n';  // which no word of the document has as it stands
constexpr std::size_t kMostSceneBytes = std::size_t{48} << 20;

}  // namespace

std::string NoteOf(const BuildWords& words, const GDALDataset& source) {
    Json options = Json::object();
    VisitOptions(words, [&](const char* key, const auto& value) { options[key] = value; });
    std::string scenes = KnownScenes(source);
    // Without them the next update looks at all.
    if (scenes.size() > kMostSceneBytes) scenes.clear();
    try {
        return Json{{kVersionKey, kNoteVersion},
                    {"source", FromAnywhere(words.source)},
                    {"options", options}}
                   .dump() +
               kBehindWords + scenes;
    } catch (const Json::exception&) {
        throw Failure(words.target, "records keep no name that is not UTF-8");
    }
}

Noted ReadNote(const std::string& target, const std::string& note) {
    constexpr std::size_t kMostBytes = 1 << 20;
    const char* const strange = "its records do not tell what it was built from";
    const std::size_t size = std::min(note.find(kBehindWords), note.size());
    if (size > kMostBytes) throw Failure(target, strange);
    try {
        const Json document = Json::parse(note.begin(), note.begin() + std::ptrdiff_t(size));
        if (document.at(kVersionKey) != kNoteVersion) throw Failure(target, strange);
        Noted noted;
        noted.scenes = note.substr(std::min(size + 1, note.size()));
        BuildWords& words = noted.words;
        words.target = target;
        words.source = document.at("source");
        VisitOptions(words, [&](const char* key, auto& value) {
            value = document.at("options").at(key).get<std::remove_reference_t<decltype(value)>>();
        });
        if (zelm::files::LooksLent(words.source))
            throw Failure(target, "names of lent sources are not taken here");
        return noted;
    } catch (const Json::exception&) {
        throw Failure(target, strange);
    }
}

void KeepRecords(const BuildWords& words, const GDALDataset& source,
                 zmcgdal::GdalRasterSource& pixels, zmchost::BuildOptions options) {
    options.progress = [](const zmchost::BuildProgress&) { return !platform::IsInterrupted(); };
    try {
        zmchost::PyramidUpdate update(zmcgdal::SharedModule(), pixels, words.target, options);
        update.KeepRecords(NoteOf(words, source));
    } catch (const zmchost::Cancelled&) {
        throw Interruption(words.target);
    }
}

}  // namespace zmctools
