#include "host/base/Xerces.h"

#include "host/base/Error.h"
#include "loader/OpenModule.h"

namespace zmchost {

void InitialiseXerces() {
    if (const std::string failure = zmcraster::StartXerces(); !failure.empty())
        throw Error("Xerces-C++", "start", failure);
}

}  // namespace zmchost
