#include "tools/UpdateNote.h"

#include <nlohmann/json.hpp>
#include <utility>

#include "files/Lending.h"
#include "gdal/Dataset.h"
#include "host/build/PyramidUpdate.h"
#include "platform/Interrupts.h"
#include "tools/Interrupt.h"
#include "tools/Message.h"
#include "tools/SceneNames.h"

namespace zmctools {
namespace {

using Json = nlohmann::ordered_json;

constexpr const char* kVersionKey = "zmcrasterRecords";
constexpr int kNoteVersion = 1;

}  // namespace

std::string NoteOf(const BuildWords& words) {
    Json options = Json::object();
    VisitOptions(words, [&](const char* key, const auto& value) { options[key] = value; });
    try {
        return Json{{kVersionKey, kNoteVersion},
                    {"source", FromAnywhere(words.source)},
                    {"options", options}}
            .dump();
    } catch (const Json::exception&) {
        throw Failure(words.target, "records keep no name that is not UTF-8");
    }
}

BuildWords WordsOfNote(const std::string& target, const std::string& note) {
    constexpr std::size_t kMostBytes = 1 << 20;
    const char* const strange = "its records do not tell what it was built from";
    if (note.size() > kMostBytes) throw Failure(target, strange);
    try {
        const Json document = Json::parse(note);
        if (document.at(kVersionKey) != kNoteVersion) throw Failure(target, strange);
        BuildWords words;
        words.target = target;
        words.source = document.at("source");
        VisitOptions(words, [&](const char* key, auto& value) {
            value = document.at("options").at(key).get<std::remove_reference_t<decltype(value)>>();
        });
        if (zelm::files::LooksLent(words.source))
            throw Failure(target, "names of lent sources are not taken here");
        return words;
    } catch (const Json::exception&) {
        throw Failure(target, strange);
    }
}

void KeepRecords(const BuildWords& words, zmcgdal::GdalRasterSource& pixels,
                 zmchost::BuildOptions options) {
    options.progress = [](const zmchost::BuildProgress&) { return !platform::IsInterrupted(); };
    try {
        zmchost::PyramidUpdate(zmcgdal::SharedModule(), pixels, words.target, std::move(options))
            .KeepRecords(NoteOf(words));
    } catch (const zmchost::Cancelled&) {
        throw Interruption(words.target);
    }
}

}  // namespace zmctools
