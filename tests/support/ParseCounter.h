// How many texts the process has had parsed through a SAX parser, whichever library asked.
//
// The counter stands in front of the parser's own function. In a program that is not linked with
// it, it is loaded ahead of the others, and writes the number at the end into the file that
// ZMC_PARSE_COUNT names.
#ifndef ZMC_TESTS_SUPPORT_PARSECOUNTER_H
#define ZMC_TESTS_SUPPORT_PARSECOUNTER_H

#include <cstddef>

namespace zmctest {

std::size_t DocumentParses();

}  // namespace zmctest

#endif
