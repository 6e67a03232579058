// Compression: answers made shorter where the client takes it and it is worth it.
#ifndef ZMC_SERVE_COMPRESSION_H
#define ZMC_SERVE_COMPRESSION_H

#include <cstdint>
#include <string_view>

#include "serve/Answer.h"
#include "serve/Request.h"

namespace zmcserve {

enum class Coding { None, Gzip, Zstd };

// What a value of Accept-Encoding wants most of what there is, zstd before gzip where it likes both
// alike.
Coding CodingFor(std::string_view accepted);

// Codes the body of an answer with status 200 that may be compressed, of at least a kilobyte and at
// most `most` bytes, unless it comes out hardly shorter. The ETag then tells the coding, so that
// no two forms have one. Vary is set whether or not anything is done. Throws Refusal where bytes of
// a file cannot be read, and std::bad_alloc.
void Compress(const Request& request, std::uint64_t most, Answer& answer);

// The ETags of a request as the answer without a coding has them.
std::string WithoutCodings(std::string_view tags);

}  // namespace zmcserve

#endif
