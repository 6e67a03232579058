// A source in memory that holds a text.
#ifndef ZMC_TESTS_SUPPORT_TEXTSOURCE_H
#define ZMC_TESTS_SUPPORT_TEXTSOURCE_H

#include <memory>
#include <string>

#include "files/MemorySource.h"

namespace zmctest {

inline std::shared_ptr<zelm::files::MemorySource> Holding(const std::string& text) {
    return std::make_shared<zelm::files::MemorySource>(
        zelm::files::MemorySource::Bytes(text.begin(), text.end()));
}

}  // namespace zmctest

#endif
