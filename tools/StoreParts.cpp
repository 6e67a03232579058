#include "tools/StoreParts.h"

#include <algorithm>
#include <span>
#include <utility>

#include "files/FileSource.h"
#include "host/base/Checksum.h"
#include "host/base/Error.h"
#include "host/base/PackedNumbers.h"
#include "host/base/Text.h"
#include "host/build/BuildFile.h"
#include "host/file/SideFile.h"
#include "platform/FileSystem.h"
#include "tools/Message.h"
#include "tools/StoreTarget.h"

namespace zmctools {
namespace {

using zelm::files::ByteSource;
using zelm::files::FileSource;
using zelm::files::OpenMode;
using zmchost::Extent;
using zmcstore::UploadedPart;
using Kind = zmchost::PartFolder::Kind;

constexpr std::size_t kBlock = std::size_t{256} << 10;

std::shared_ptr<FileSource> Open(const std::string& path, OpenMode mode) {
    int error = 0;
    auto source = FileSource::Open(zmchost::WideFileName(path), mode, &error);
    if (!source) throw Failure(path, "it cannot be opened: " + platform::ErrorText(error));
    return source;
}

// Calls move(offset, size) for blocks of extents, one behind the other.
template <class Move>
bool InBlocks(std::span<const Extent> extents, const Move& move) {
    for (const Extent& extent : extents)
        for (std::uint64_t at = extent.begin; at < extent.end; at += kBlock)
            if (!move(at,
                      static_cast<std::size_t>(std::min<std::uint64_t>(kBlock, extent.end - at))))
                return false;
    return true;
}

// What a record of kind Store holds.
struct Sent {
    std::uint64_t pieces = 0;  // a sum over them
    std::vector<UploadedPart> parts;

    std::string Packed() const {
        zmchost::NumberPacker packer;
        packer.Put(pieces);
        packer.Put(std::uint64_t{parts.size()});
        for (const UploadedPart& part : parts) {
            packer.Put(std::uint64_t{part.number});
            packer.Put(std::uint64_t{part.tag.size()});
            for (const char c : part.tag) packer.Put(std::uint64_t{static_cast<unsigned char>(c)});
        }
        return packer.Bytes();
    }

    // False for what is none, or of other ranges.
    bool Unpack(const std::string& packed, const std::vector<std::uint64_t>& ranges) {
        zmchost::NumberUnpacker unpacker(packed);
        pieces = unpacker.Take();
        if (unpacker.Take() != ranges.size()) return false;
        for (const std::uint64_t range : ranges) {
            UploadedPart part{static_cast<std::uint32_t>(range + 1), {}};
            if (unpacker.Take() != part.number) return false;
            for (std::uint64_t left = unpacker.Take(); left != 0 && unpacker.Good(); --left)
                part.tag += static_cast<char>(unpacker.Take());
            parts.push_back(std::move(part));
        }
        return unpacker.Good() && unpacker.Rest().empty();
    }
};

}  // namespace

std::vector<std::uint64_t> UploadBounds(const std::string& target,
                                        const zmchost::PyramidHeader& header,
                                        const zmchost::PartGrid& grid, std::uint64_t leastRange) {
    if (header.tileDataEnd > zmcstore::kMostFileBytes)
        throw Failure(target,
                      "no upload holds so many bytes: " + std::to_string(header.tileDataEnd));
    std::vector<Extent> runs;
    for (std::uint64_t part = 0; part < grid.Count(); ++part) {
        const std::vector<Extent> extents = PartExtents(header, grid, part);
        runs.insert(runs.end(), extents.begin(), extents.end());
    }
    std::ranges::sort(runs, {}, &Extent::begin);
    return zmcstore::PlanRanges(runs, header.tileDataEnd,
                                zmcstore::LeastRange(header.tileDataEnd, leastRange));
}

StoreParts::StoreParts(const PyramidPlan& openedPlan)
    : plan(openedPlan),
      header(zmchost::PyramidHeader::Read(plan.PyramidPath())),
      store(OpenStore(plan.words.target)),
      path(plan.PyramidPath()) {
    if (!plan.upload.bounds.empty() && plan.upload.bounds.back() > header.tileDataEnd)
        throw Failure(plan.path, "the parts of its upload are those of another file");
}

StoreParts::~StoreParts() {
    if (isScratch) platform::RemoveEntry(path);
}

void StoreParts::UseScratch(const std::string& folder) {
    const std::string base = plan.ScratchBase(folder);
    zmchost::SideFile::RemoveStale(base, PyramidPlan::kScratchKind);
    const std::string made =
        zmchost::SideFile::MakeTemporary(base, PyramidPlan::kScratchKind, lock);
    if (made.empty())
        throw Failure(platform::FolderOf(base),
                      "no file can be made there: " + platform::LastErrorText());
    path = made;
    isScratch = true;
    std::string front(static_cast<std::size_t>(header.tileDataStart), '\0');
    const auto outline = Open(plan.PyramidPath(), OpenMode::Read);
    const auto scratch = Open(path, OpenMode::Update);
    int error = 0;
    if (outline->ReadAt(0, front.data(), front.size()) != front.size() ||
        scratch->WriteAt(0, front.data(), front.size(), &error) != front.size())
        throw Failure(path, "it cannot be written: " + platform::ErrorText(error));
}

void StoreParts::Clear() const {
    int error = 0;
    if (!Open(path, OpenMode::Update)->Truncate(header.tileDataStart, &error))
        throw Failure(path, "it cannot be cut: " + platform::ErrorText(error));
}

StoreParts::Fill StoreParts::FillOf(std::uint64_t part) const {
    Fill fill{PartExtents(header, plan.grid, part), {}, {}};
    zmcstore::Share share = zmcstore::ShareOf(fill.all, plan.upload.bounds);
    fill.ranges = std::move(share.ranges);
    // The levels above are made of these.
    const std::vector<Extent> top = PartExtents(header, plan.grid, part, plan.grid.level);
    share.pieces.insert(share.pieces.end(), top.begin(), top.end());
    fill.pieces = zmchost::Merged(std::move(share.pieces));
    return fill;
}

UploadedPart StoreParts::SendRange(ByteSource& source, std::uint64_t range, std::uint64_t end) {
    const std::uint64_t begin = range == 0 ? 0 : plan.upload.bounds[range - 1];
    return store->PutPart(plan.upload.id, static_cast<std::uint32_t>(range + 1),
                          {&source, begin, end - begin});
}

// Gives a sum over them.
std::uint64_t StoreParts::KeepPieces(ByteSource& source, std::uint64_t part,
                                     const std::vector<Extent>& pieces) const {
    const zmchost::PartFolder records = plan.Records();
    const std::string made = records.NewPiecesPath(part);
    const auto file = Open(made, OpenMode::Create);
    std::vector<std::byte> block(kBlock);
    std::uint64_t sum = 0, end = 0;
    int error = 0;
    bool done = InBlocks(pieces, [&](std::uint64_t at, std::size_t size) {
        if (source.ReadAt(at, block.data(), size, &error) != size ||
            file->WriteAt(end, block.data(), size, &error) != size)
            return false;
        sum = zmchost::PixelChecksum(sum, {block.data(), size});
        end += size;
        return true;
    });
    std::string reason = platform::ErrorText(error);
    if (done && !((!plan.durable || platform::SyncFile(made)) &&
                  platform::RenameFile(made, records.PiecesPath(part)))) {
        done = false;
        reason = platform::LastErrorText();
    }
    if (done) return sum;
    platform::RemoveEntry(made);
    throw Failure(records.PiecesPath(part), "it cannot be written: " + reason);
}

bool StoreParts::TakePieces(ByteSource& target, std::uint64_t part,
                            const std::vector<Extent>& pieces, std::uint64_t sum) const {
    const auto file =
        FileSource::Open(zmchost::WideFileName(plan.Records().PiecesPath(part)), OpenMode::Read);
    if (!file) return false;
    std::vector<std::byte> block(kBlock);
    std::uint64_t found = 0, end = 0;
    const bool done = InBlocks(pieces, [&](std::uint64_t at, std::size_t size) {
        int error = 0;
        if (file->ReadAt(end, block.data(), size) != size) return false;
        if (target.WriteAt(at, block.data(), size, &error) != size)
            throw Failure(path, "it cannot be written: " + platform::ErrorText(error));
        found = zmchost::PixelChecksum(found, {block.data(), size});
        end += size;
        return true;
    });
    return done && found == sum && file->Size() == end;
}

void StoreParts::Send(std::uint64_t part) {
    const Fill fill = FillOf(part);
    const auto source = Open(path, OpenMode::Read);
    Sent sent;
    for (const std::uint64_t range : fill.ranges)
        sent.parts.push_back(SendRange(*source, range, plan.upload.bounds[range]));
    sent.pieces = KeepPieces(*source, part, fill.pieces);
    plan.Records().Keep(Kind::Store, part, {0, sent.Packed()});
}

bool StoreParts::Restore(std::uint64_t part) {
    const auto record = plan.Records().Find(Kind::Store, part);
    if (!record) return false;
    const Fill fill = FillOf(part);
    Sent sent;
    if (!sent.Unpack(record->sums, fill.ranges)) return false;
    const auto target = Open(path, OpenMode::Update);
    int error = 0;
    if (target->Size() < header.tileDataEnd && !target->Truncate(header.tileDataEnd, &error))
        throw Failure(path, "it cannot be written: " + platform::ErrorText(error));
    if (!TakePieces(*target, part, fill.pieces, sent.pieces)) return false;
    stored.insert(stored.end(), sent.parts.begin(), sent.parts.end());
    return true;
}

void StoreParts::Drop(std::uint64_t part) {
    const Fill fill = FillOf(part);
    std::uint64_t kept = 0;
    auto piece = fill.pieces.begin();
    for (const Extent& extent : fill.all) {
        kept = extent.begin;
        for (; piece != fill.pieces.end() && piece->begin < extent.end; ++piece) {
            platform::DropRange(path, kept, piece->begin - kept);
            kept = piece->end;
        }
        platform::DropRange(path, kept, extent.end - kept);
    }
}

void StoreParts::SendRest() {
    const auto source = Open(path, OpenMode::Read);
    std::ranges::sort(stored, {}, &UploadedPart::number);
    std::vector<UploadedPart> all;
    auto next = stored.begin();
    const std::vector<std::uint64_t>& bounds = plan.upload.bounds;
    const std::uint64_t fileEnd = source->Size();
    for (std::uint64_t range = 0; range <= bounds.size(); ++range) {
        const std::uint64_t end = range == bounds.size() ? fileEnd : bounds[range];
        if (next != stored.end() && next->number == range + 1)
            all.push_back(*next++);
        else if (range == 0 || end > bounds[range - 1])
            all.push_back(SendRange(*source, range, end));
    }
    stored = std::move(all);
}

void StoreParts::PutBeside(const char* ending, const std::string& file) {
    if (!file.empty()) {
        const auto source = Open(file, OpenMode::Read);
        store->PutBeside(ending, {source.get(), 0, source->Size()});
    } else if (!plan.targetState.empty()) {
        store->RemoveBeside(ending);
    }
}

void StoreParts::Complete() {
    try {
        store->Complete(plan.upload.id, stored);
    } catch (const zmcstore::UploadGone&) {
        // An answer that was lost: the store has done it already.
        if (store->Look().mark != plan.upload.mark) throw;
    }
}

void DropPlan(const PyramidPlan& plan) {
    if (plan.IsInStore()) try {
            OpenStore(plan.words.target)->Abort(plan.upload.id);
        } catch (const zmcstore::UploadGone&) {
            // Somebody else has ended it.
        } catch (const zmchost::Cancelled&) {
            throw;
        } catch (const std::runtime_error& failure) {
            Warn(plan.words.target, "what was uploaded may be left in the store, as upload " +
                                        plan.upload.id + ": " + failure.what());
        }
    plan.Discard();
}

}  // namespace zmctools
