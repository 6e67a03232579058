#include "store/Sha256.h"

#include <openssl/evp.h>

#include <stdexcept>

namespace zmcstore {

struct Sha256::State {
    std::unique_ptr<EVP_MD_CTX, decltype(&EVP_MD_CTX_free)> context{EVP_MD_CTX_new(),
                                                                    &EVP_MD_CTX_free};
    static void Check(int result) {
        if (result != 1) throw std::runtime_error("SHA-256: the library refuses to compute it");
    }
};

Sha256::Sha256() : state(std::make_unique<State>()) {
    State::Check(state->context &&
                 EVP_DigestInit_ex(state->context.get(), EVP_sha256(), nullptr) == 1);
}

Sha256::~Sha256() = default;

void Sha256::Add(const void* bytes, std::size_t size) {
    State::Check(EVP_DigestUpdate(state->context.get(), bytes, size));
}

std::string Sha256::Finish() {
    unsigned char digest[EVP_MAX_MD_SIZE];
    unsigned int size = 0;
    State::Check(EVP_DigestFinal_ex(state->context.get(), digest, &size));
    std::string text;
    for (unsigned int i = 0; i < size; ++i) {
        text += "0123456789abcdef"[digest[i] >> 4];
        text += "0123456789abcdef"[digest[i] & 15];
    }
    return text;
}

}  // namespace zmcstore
