#include "tests/support/ParseCounter.h"

#include <dlfcn.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <string>

#include <xercesc/parsers/SAXParser.hpp>

#define ZMC_TEXT_OF(name) #name
#define ZMC_TEXT(name) ZMC_TEXT_OF(name)

namespace {

std::atomic<std::size_t> parses = 0;

using Parse = void (*)(xercesc::SAXParser*, const xercesc::InputSource&);

// The next function of that name in the order of loading: the parser's own.
Parse NextParse() {
    const std::string space = ZMC_TEXT(XERCES_CPP_NAMESPACE);
    const std::string name =
        "_ZN" + std::to_string(space.size()) + space + "9SAXParser5parseERKNS_11InputSourceE";
    void* const found = dlsym(RTLD_NEXT, name.c_str());
    if (!found) std::abort();
    return reinterpret_cast<Parse>(found);
}

struct Report {
    ~Report() {
        const char* const name = std::getenv("ZMC_PARSE_COUNT");
        std::FILE* const file = name ? std::fopen(name, "w") : nullptr;
        if (!file) return;
        static_cast<void>(std::fprintf(file, "%zu\n", parses.load()));
        static_cast<void>(std::fclose(file));
    }
} report;

}  // namespace

XERCES_CPP_NAMESPACE_BEGIN

void SAXParser::parse(const InputSource& source) {
    static const Parse next = NextParse();
    ++parses;
    next(this, source);
}

XERCES_CPP_NAMESPACE_END

namespace zmctest {

std::size_t DocumentParses() { return parses; }

}  // namespace zmctest
