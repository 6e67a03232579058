#include "tools/Command.h"

#include <cstdio>

namespace zmctools {

void Command::PrintDocument(const Json& document) {
    // Names of files need not be UTF-8; a document always is.
    const std::string text = document.dump(2, ' ', false, Json::error_handler_t::replace) + '\n';
    if (std::fwrite(text.data(), 1, text.size(), stdout) != text.size() || std::fflush(stdout) != 0)
        throw Failure("standard output", "it cannot be written");
}

}  // namespace zmctools
