#include "serve/Catalog.h"

#include <algorithm>
#include <new>

#include "files/Lending.h"
#include "gdal/VsiSource.h"
#include "host/base/Error.h"
#include "host/file/PyramidFileInfo.h"
#include "platform/FileSystem.h"
#include "serve/Answer.h"

namespace zmcserve {
namespace {

constexpr const char* kNothing = "there is no pyramid of that name";
// What the driver may look at beside a raster.
constexpr const char* kCompanions[] = {kSidecar, ".msk"};

bool IsPlainPart(std::string_view part) { return !part.empty() && part[0] != '.'; }

Refusal RefusalOf(int error) {
    if (error == ENOMEM) throw std::bad_alloc();
    if (platform::IsNothingThere(error)) return Refusal(404, kNothing);
    if (platform::IsRefusedLink(error))
        return Refusal(403, "a link of that name leads out of what is served");
    if (error == EMFILE || error == ENFILE) return Refusal::Busy("there are too many open files");
    if (error == EACCES || error == EPERM) return Refusal(403, "it may not be read");
    return Refusal(500, platform::ErrorText(error));
}

bool LooksLikePyramid(platform::File& file) {
    char start[64] = {};
    const std::size_t size = file.ReadAt(0, start, sizeof start);
    return zmchost::LooksLikePyramid({start, size});
}

std::string Joined(const std::string& folder, const std::string& name) {
    return folder.empty() ? name : folder + '/' + name;
}

Companions CompanionsOf(const std::string& folder, const std::string& below,
                        platform::Links links) {
    Companions found;
    found.path = platform::JoinPath(folder, below);
    const std::string own = platform::NameOf(below);
    found.siblings.push_back(own);
    for (const char* const ending : kCompanions) {
        platform::FileIdentity identity;
        if (!platform::TellIdentityBeneath(folder, below + ending, links, identity)) continue;
        found.siblings.push_back(own + ending);
        found.version += '-' + std::to_string(identity.number) + '.' +
                         std::to_string(identity.size) + '.' + std::to_string(identity.modified);
    }
    return found;
}

}  // namespace

bool IsPlainName(std::string_view name) {
    if (name.find('\0') != name.npos) return false;
    const auto parts = Split(name, '/');
    return parts.size() <= Catalog::kMostDeep &&
           std::all_of(parts.begin(), parts.end(), IsPlainPart);
}

Catalog::Catalog(const std::vector<std::string>& named, bool followLinks, zmchost::ModulePtr loaded)
    : module(std::move(loaded)) {
    const auto fail = [](const std::string& name, const char* reason) {
        throw zmchost::Error(name, "serve it", reason);
    };
    for (const std::string& name : named) {
        if (zmcgdal::IsVirtualName(name) || zelm::files::LooksLent(zelm::String(name.c_str())))
            fail(name, "only files and folders of the file system are served");
        const platform::FileStatus status = platform::StatusOf(name);
        if (!status.exists) fail(name, "there is no such file or folder");
        if (status.IsSpecial()) fail(name, "it is neither a file nor a folder");
        const auto links = followLinks ? platform::Links::Followed : platform::Links::Within;
        if (status.isFolder) {
            roots.push_back({name, "", links});
            continue;
        }
        const std::string file = platform::NameOf(name);
        if (!IsPlainName(file)) fail(name, "files whose names begin with a dot are not served");
        for (const Root& root : roots)
            if (root.file == file) fail(name, "another file of that name is served already");
        // A link that somebody names is meant.
        roots.push_back({platform::FolderOf(name), file, platform::Links::Followed});
    }
}

Catalog::Found Catalog::Find(std::string_view name) const {
    if (!IsPlainName(name)) throw Refusal(400, Quoted(name) + " can be no name of a raster");
    int worst = ENOENT;
    for (const Root& root : roots) {
        if (!root.file.empty() && root.file != name) continue;
        Found found{&root, std::string(name), {}};
        int error = 0;
        if (platform::TellIdentityBeneath(root.folder, found.below, root.links, found.identity,
                                          &error))
            return found;
        if (!platform::IsNothingThere(error)) worst = error;
    }
    throw RefusalOf(worst);
}

ServedFilePtr Catalog::Open(const Found& found, std::string_view name) const {
    int error = 0;
    auto file = platform::OpenBeneath(found.root->folder, found.below, found.root->links, &error);
    if (!file) throw RefusalOf(error);
    if (!LooksLikePyramid(*file)) throw Refusal(404, kNothing);
    return std::make_shared<const ServedFile>(std::move(file), std::string(name));
}

ServedRasterPtr Catalog::TakeHeld(std::string_view name, const Found& found) {
    const std::lock_guard lock(mutex);
    const auto at = held.find(std::string(name));
    if (at == held.end() || at->second.raster->File().Identity() != found.identity) return nullptr;
    order.splice(order.begin(), order, at->second.place);
    return at->second.raster;
}

void Catalog::Hold(const std::string& name, ServedRasterPtr raster) {
    std::vector<ServedRasterPtr> dropped;  // closed without the lock
    const std::lock_guard lock(mutex);
    if (const auto at = held.find(name); at != held.end()) {
        dropped.push_back(std::exchange(at->second.raster, std::move(raster)));
        order.splice(order.begin(), order, at->second.place);
        return;
    }
    order.push_front(name);
    held.emplace(name, Held{std::move(raster), order.begin()});
    while (held.size() > kMostHeld) {
        dropped.push_back(std::move(held.find(order.back())->second.raster));
        held.erase(order.back());
        order.pop_back();
    }
}

ServedFilePtr Catalog::File(std::string_view name) { return FileOf(Find(name), name); }

ServedFilePtr Catalog::FileOf(const Found& found, std::string_view name) {
    if (const ServedRasterPtr raster = TakeHeld(name, found)) return raster->FilePtr();
    return Open(found, name);
}

std::optional<ServedFilePtr> Catalog::Sidecar(std::string_view name) try {
    const Found found = Find(name);
    static_cast<void>(FileOf(found, name));  // of what is no pyramid nothing is told
    auto file =
        platform::OpenBeneath(found.root->folder, found.below + kSidecar, found.root->links);
    if (!file) return ServedFilePtr();
    return std::make_shared<const ServedFile>(std::move(file), std::string(name) + kSidecar);
} catch (const Refusal& refusal) {
    if (refusal.Status() != 404) throw;
    return std::nullopt;
}

ServedRasterPtr Catalog::RasterIfOpen(std::string_view name) { return TakeHeld(name, Find(name)); }

ServedRasterPtr Catalog::TakeCurrent(std::string_view name, const Found& found,
                                     const Companions& beside) {
    ServedRasterPtr raster = TakeHeld(name, found);
    return raster && raster->Beside() == beside ? raster : nullptr;
}

ServedRasterPtr Catalog::RasterIfCurrent(std::string_view name) {
    const Found found = Find(name);
    return TakeCurrent(name, found,
                       CompanionsOf(found.root->folder, found.below, found.root->links));
}

ServedRasterPtr Catalog::Raster(std::string_view name) {
    const Found found = Find(name);
    Companions beside = CompanionsOf(found.root->folder, found.below, found.root->links);
    ServedRasterPtr raster = TakeCurrent(name, found, beside);
    if (raster) return raster;
    raster = std::make_shared<ServedRaster>(Open(found, name), std::move(beside), module);
    if (raster->File().IsSettled()) Hold(std::string(name), raster);
    return raster;
}

void Catalog::ListBelow(const Root& root, const std::string& folder, std::size_t depth,
                        std::size_t& looked, Listing& listing) const {
    if (depth > kMostDeep) {
        listing.complete = false;
        return;
    }
    bool complete = true;
    const auto entries =
        platform::ListBeneath(root.folder, folder, root.links, kMostListed - looked, complete);
    listing.complete = listing.complete && complete;
    looked += entries.size();
    for (const platform::FolderEntry& entry : entries) {
        if (!IsPlainPart(entry.name)) continue;
        const std::string name = Joined(folder, entry.name);
        if (entry.isFolder) ListBelow(root, name, depth + 1, looked, listing);
        if (!entry.isRegular) continue;
        const auto file = platform::OpenBeneath(root.folder, name, root.links);
        if (file && LooksLikePyramid(*file)) listing.names.push_back(name);
    }
}

Catalog::Listing Catalog::List() {
    Listing listing;
    std::size_t looked = 0;
    for (const Root& root : roots) {
        if (root.file.empty())
            ListBelow(root, "", 1, looked, listing);
        else if (const auto file = platform::OpenBeneath(root.folder, root.file, root.links);
                 file && LooksLikePyramid(*file))
            listing.names.push_back(root.file);
    }
    std::sort(listing.names.begin(), listing.names.end());
    const auto end = std::unique(listing.names.begin(), listing.names.end());
    listing.names.erase(end, listing.names.end());
    return listing;
}

}  // namespace zmcserve
