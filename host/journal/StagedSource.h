// StagedSource: a source as it is to become. What is written into it goes to a second source and
// leaves the first alone; what is read comes from where it stands.
//
//     auto staged = std::make_shared<StagedSource>(pyramid, aside);
//     ... whoever works on `staged` finds its own writes in it ...
//     for (const auto& piece : staged->Pieces()) ...  // what differs, and where it stands aside
//
// It holds both sources as long as it lives. Any thread may use it.
#ifndef ZMC_HOST_JOURNAL_STAGEDSOURCE_H
#define ZMC_HOST_JOURNAL_STAGEDSOURCE_H

#include <cstdint>
#include <map>
#include <memory>
#include <mutex>
#include <vector>

#include "files/ByteSource.h"

namespace zmchost {

class StagedSource final : public zelm::files::ByteSource {
public:
    struct Piece {
        std::uint64_t offset = 0;  // in the source
        std::uint64_t size = 0;
        std::uint64_t place = 0;  // in what is aside
    };

    // What is written is appended to `asideSource`, which is empty.
    StagedSource(std::shared_ptr<ByteSource> baseSource, std::shared_ptr<ByteSource> asideSource);
    ~StagedSource() override;

    // In the order of their offsets; no two have a byte in common.
    std::vector<Piece> Pieces() const;
    // Bytes that stand aside.
    std::uint64_t AsideSize() const;

protected:
    zelm::files::Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override;
    zelm::files::Transfer DoWriteAt(std::uint64_t offset, const void* buffer,
                                    std::size_t size) override;
    int DoTellSize(std::uint64_t& size) const override;
    int DoTruncate(std::uint64_t size) override;
    bool DoIsWritable() const override { return true; }
    zelm::files::Identity DoIdentify() const override;

private:
    struct Aside {
        std::uint64_t size = 0;
        std::uint64_t place = 0;
    };

    void CutAt(std::uint64_t offset);

    const std::shared_ptr<ByteSource> base;
    const std::shared_ptr<ByteSource> aside;
    mutable std::mutex mutex;  // guards what follows
    std::map<std::uint64_t, Aside> pieces;
    std::uint64_t baseEnd;  // of what is still seen of the base
    std::uint64_t end;
    std::uint64_t asideEnd = 0;
    std::int64_t changes = 0;
};

}  // namespace zmchost

#endif
