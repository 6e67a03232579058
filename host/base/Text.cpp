#include "host/base/Text.h"

#include <new>

#include "host/base/Error.h"

namespace zmchost {

zelm::String WideFileName(const std::string& name) {
    zelm::String wide(name.c_str());
    if (name.empty()) throw Error("(no name)", "use a file", "its name is empty");
    // Bad text converts to other text; without memory there is none.
    if (!wide.wide || !wide.GetUtf8()) throw std::bad_alloc();
    if (Narrow(wide) != name) throw Error(name, "use the file", "its name is not valid UTF-8");
    return wide;
}

std::string Narrow(const zelm::String& text) {
    const char* const narrow = text.GetUtf8();
    return narrow ? narrow : "";
}

}  // namespace zmchost
