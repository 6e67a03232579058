// A source around another one that counts what is read of it. For one thread.
#ifndef ZMC_TESTS_SUPPORT_COUNTINGSOURCE_H
#define ZMC_TESTS_SUPPORT_COUNTINGSOURCE_H

#include <cstddef>
#include <cstdint>
#include <memory>
#include <utility>

#include "files/ByteSource.h"

namespace zmctest {

class CountingSource : public zelm::files::ByteSource {
public:
    explicit CountingSource(std::shared_ptr<ByteSource> source) : inner(std::move(source)) {}
    std::uint64_t bytes = 0;
    int reads = 0;

protected:
    zelm::files::Transfer DoReadAt(std::uint64_t offset, void* buffer, std::size_t size) override {
        zelm::files::Transfer done;
        done.bytes = inner->ReadAt(offset, buffer, size, &done.error);
        bytes += done.bytes;
        ++reads;
        return done;
    }
    int DoTellSize(std::uint64_t& size) const override {
        size = inner->Size();
        return 0;
    }

private:
    std::shared_ptr<ByteSource> inner;
};

}  // namespace zmctest

#endif
