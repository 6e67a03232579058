// Sha256: the digest of bytes that come in pieces.
#ifndef ZMC_STORE_SHA256_H
#define ZMC_STORE_SHA256_H

#include <cstddef>
#include <memory>
#include <string>

namespace zmcstore {

class Sha256 {
public:
    // Throws std::runtime_error if the cryptographic library does not give the algorithm.
    Sha256();
    ~Sha256();
    void Add(const void* bytes, std::size_t size);
    // 64 lower-case hexadecimal digits; nothing is added after that.
    std::string Finish();

private:
    struct State;
    std::unique_ptr<State> state;
};

}  // namespace zmcstore

#endif
