#include "core/ErrorState.h"

#include "core/ObjectCodes.h"

namespace zelm {

const std::uint32_t ObjectErrorOutOfMemory::errorCode = GloballyUniqueObjectErrorCode();
const std::uint32_t RasterReaderErrorInvalid::errorCode = GloballyUniqueObjectErrorCode();

}  // namespace zelm
