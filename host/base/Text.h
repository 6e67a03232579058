// The narrow UTF-8 text of this library and the wide text of the module's interface.
#ifndef ZMC_HOST_BASE_TEXT_H
#define ZMC_HOST_BASE_TEXT_H

#include <string>
#include <string_view>

#include "core/String.h"

namespace zmchost {

// The wide form of a file name. Throws Error if the name is not valid UTF-8, since it could not be
// told to the module unchanged.
zelm::String WideFileName(const std::string& name);

std::string Narrow(const zelm::String& text);

}  // namespace zmchost

#endif
