#include "tools/PyramidPlan.h"

#include <algorithm>
#include <cstdlib>
#include <utility>

#include "describe/JsonNumbers.h"
#include "files/FileSource.h"
#include "files/Lending.h"
#include "host/base/Checksum.h"
#include "host/base/Text.h"
#include "host/build/BuildFile.h"
#include "host/build/BuildPlan.h"
#include "host/file/SideFile.h"
#include "platform/FileSystem.h"
#include "store/UploadRanges.h"
#include "tools/Message.h"
#include "tools/MosaicSource.h"
#include "tools/SourceState.h"

namespace zmctools {
namespace {

using zelm::files::FileSource;
using zelm::files::OpenMode;
using zmcdescribe::Json;

constexpr int kPlanVersion = 1;
constexpr const char* kVersionKey = "zmcrasterPlan";
constexpr std::uint64_t kMaxPlanBytes = 1 << 20;
constexpr int kMostDepth = 4;  // of what a plan holds inside each other

Json DocumentOf(const PyramidPlan& plan) {
    Json options = Json::object();
    VisitOptions(plan.words, [&](const char* key, const auto& value) { options[key] = value; });
    Json document{
        {kVersionKey, kPlanVersion},
        {"source", plan.words.source},
        {"sourceState", plan.sourceState},
        {"facts", HexText(plan.facts)},
        {"target", plan.IsInStore() ? plan.words.target : platform::NameOf(plan.words.target)},
        {"targetState", plan.targetState},
        {"pyramid", plan.pyramid},
        {"pyramidNumber", HexText(plan.number)},
        {"durable", plan.durable},
        {"options", options},
        {"width", plan.grid.width},
        {"height", plan.grid.height},
        {"partLevel", plan.grid.level},
        {"partColumns", plan.grid.columns},
        {"partRows", plan.grid.rows},
        {"parts", plan.grid.Count()}};
    if (plan.sceneCount > 0) document["scenes"] = plan.sceneCount;
    if (plan.IsInStore())
        document["upload"] = {
            {"id", plan.upload.id}, {"mark", plan.upload.mark}, {"bounds", plan.upload.bounds}};
    return document;
}

std::uint64_t FromHex(const Json& value) {
    return std::strtoull(value.get_ref<const std::string&>().c_str(), nullptr, 16);
}

// A name in the plan's own folder, which leads nowhere else.
std::string PlainName(const std::string& plan, const Json& value) {
    std::string name = value;
    if (name.empty() || name == "." || name == ".." || name.find('/') != name.npos ||
        name.find('\0') != name.npos)
        throw Failure(plan, "it names a file outside its folder");
    return name;
}

// The sizes of a grid are judged before it is asked for anything.
zmchost::PartGrid GridOf(const std::string& plan, const Json& document) {
    zmchost::PartGrid grid;
    const auto take = [&](const char* key, std::uint32_t& value, std::uint64_t most) {
        const Json& number = document.at(key);
        if (!number.is_number_unsigned() || number.get<std::uint64_t>() > most)
            throw Failure(plan, std::string("its ") + key + " cannot be");
        value = number;
    };
    take("width", grid.width, 0xFFFFFFFF);
    take("height", grid.height, 0xFFFFFFFF);
    take("partLevel", grid.level, 31);
    take("partColumns", grid.columns, 0xFFFFFF);
    take("partRows", grid.rows, 0xFFFFFF);
    if (grid.width == 0 || grid.height == 0 || grid.columns == 0 || grid.rows == 0 ||
        grid.level > zmchost::MaxLevelOf(grid.width, grid.height) ||
        document.at("parts") != grid.Count() || grid.Count() > zmchost::kMostParts)
        throw Failure(plan, "its parts cannot be");
    return grid;
}

PlannedUpload UploadOf(const std::string& plan, const Json& document) {
    PlannedUpload upload{document.at("id"), document.at("mark"), document.at("bounds")};
    if (upload.id.empty() || upload.bounds.size() >= zmcstore::kMostRanges ||
        !std::ranges::is_sorted(upload.bounds))
        throw Failure(plan, "the parts of its upload cannot be");
    return upload;
}

PyramidPlan PlanFrom(const std::string& file, const Json& document) {
    PyramidPlan plan;
    plan.path = file;
    plan.words.source = document.at("source");
    if (zelm::files::LooksLent(plan.words.source))
        throw Failure(file, "names of lent sources are not taken here");
    plan.sourceState = document.at("sourceState");
    if (document.contains("scenes")) plan.sceneCount = document.at("scenes");
    plan.facts = FromHex(document.at("facts"));
    if (document.contains("upload")) {
        plan.upload = UploadOf(file, document.at("upload"));
        plan.words.target = document.at("target");
    } else {
        plan.words.target =
            platform::JoinPath(platform::FolderOf(file), PlainName(file, document.at("target")));
    }
    plan.targetState = document.at("targetState");
    plan.pyramid = PlainName(file, document.at("pyramid"));
    plan.number = FromHex(document.at("pyramidNumber"));
    plan.durable = document.at("durable");
    VisitOptions(plan.words, [&](const char* key, auto& value) {
        value = document.at("options").at(key).get<std::remove_reference_t<decltype(value)>>();
    });
    plan.grid = GridOf(file, document);
    return plan;
}

std::string ReadBounded(const std::string& file) {
    int error = 0;
    if (platform::StatusOf(file).IsSpecial()) throw Failure(file, "it is not a regular file");
    const auto source = FileSource::Open(zmchost::WideFileName(file), OpenMode::Read, &error);
    if (!source) throw Failure(file, "it cannot be read: " + platform::ErrorText(error));
    if (source->Size() > kMaxPlanBytes) throw Failure(file, "it is too large for a plan");
    std::string text(static_cast<std::size_t>(source->Size()), '\0');
    if (source->ReadAt(0, text.data(), text.size(), &error) != text.size())
        throw Failure(file, "it cannot be read: " + platform::ErrorText(error));
    return text;
}

Json ParsePlan(const std::string& file) {
    // What lies a million times inside itself would be written out by as many calls.
    const auto bounded = [&](int depth, Json::parse_event_t, Json&) {
        if (depth > kMostDepth) throw Failure(file, "it is no plan of a build");
        return true;
    };
    Json document = Json::parse(ReadBounded(file), bounded, false);
    if (!document.is_object() || !document.contains(kVersionKey))
        throw Failure(file, "it is no plan of a build");
    const Json& version = document.at(kVersionKey);
    if (version != kPlanVersion)
        throw Failure(file, "it is a plan of version " + version.dump(-1, ' ', true) +
                                ", and this program knows version " + std::to_string(kPlanVersion));
    return document;
}

}  // namespace

std::string PyramidPlan::PyramidPath() const {
    return zmchost::BuildFile::PlannedPath(LocalName(), pyramid);
}

zmchost::PartFolder PyramidPlan::Records() const {
    return {PyramidPath() + zmchost::BuildFile::kPartsEnding, checksum, durable};
}

bool PyramidPlan::HasFile() const {
    const platform::FileStatus status = platform::StatusOf(PyramidPath());
    return status.isRegular && status.number == number;
}

void PyramidPlan::CheckFile() const {
    if (HasFile()) return;
    throw Failure(path, IsFinished() ? "it is finished"
                                     : "the file that was laid out for it is gone, or another one");
}

bool PyramidPlan::IsFinished() const {
    if (IsInStore()) return false;
    const platform::FileStatus status = platform::StatusOf(words.target);
    return !HasFile() && status.isRegular && status.number == number;
}

void PyramidPlan::Write() {
    Json document = DocumentOf(*this);
    std::string text;
    try {
        checksum = zmchost::Checksum(document.dump());
        document["checksum"] = HexText(checksum);
        text = document.dump(2) + '\n';
    } catch (const Json::exception&) {
        throw Failure(path, "a plan keeps no name that is not UTF-8");
    }
    Records().Make();
    if (sceneCount > 0) Records().KeepScenes(scenes);
    const std::string made = PyramidPath() + zmchost::BuildFile::kNewPlanEnding;
    int error = 0;
    const auto file = FileSource::Open(zmchost::WideFileName(made), OpenMode::Create, &error);
    bool done = file && file->WriteAt(0, text.data(), text.size(), &error) == text.size();
    std::string reason = platform::ErrorText(error);
    if (done && !(platform::SyncFile(made) && platform::RenameToNewName(made, path))) {
        done = false;
        reason = platform::LastErrorText();
    }
    if (done) return;
    platform::RemoveEntry(made);
    Records().Remove();
    throw Failure(path, "it cannot be written: " + reason);
}

PyramidPlan PyramidPlan::Read(const std::string& file) {
    Json document = ParsePlan(file);
    try {
        PyramidPlan plan = PlanFrom(file, document);
        plan.checksum = FromHex(document.at("checksum"));
        document.erase("checksum");
        if (plan.checksum != zmchost::Checksum(document.dump()))
            throw Failure(file, "it was changed since it was made");
        return plan;
    } catch (const Json::exception&) {
        throw Failure(file, "it is no plan of a build, or a damaged one");
    }
}

DatasetPtr PyramidPlan::OpenSource() const {
    if (sceneCount == 0) return words.OpenSource();
    const std::string kept = Records().Scenes();
    if (HexText(zmchost::Checksum(kept)) != sourceState)
        throw Failure(path, "what it knows of the scenes of its source is damaged or gone");
    auto layout = zmcgdal::MosaicLayout::Unpack(kept);
    if (!layout || layout->scenes.size() != sceneCount)
        throw Failure(path, "what it knows of the scenes of its source cannot be");
    return OpenMosaic(words.source, std::move(*layout));
}

std::string PyramidPlan::ScratchBase(const std::string& folder) const {
    return platform::JoinPath(folder.empty() ? platform::FolderOf(PyramidPath()) : folder,
                              platform::NameOf(path));
}

void PyramidPlan::Discard() const {
    Records().Remove();
    // Of workers that were killed; those at work have theirs locked.
    if (IsInStore()) zmchost::SideFile::RemoveStale(ScratchBase(""), kScratchKind);
    if (HasFile()) platform::RemoveEntry(PyramidPath());
    if (!platform::RemoveEntry(path))
        throw Failure(path, "it cannot be removed: " + platform::LastErrorText());
}

}  // namespace zmctools
