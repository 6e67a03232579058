// Visible: text as it may be shown to people.
//
// A name of a file may hold anything: characters that steer a terminal, ends of lines that make one
// message look like two, marks that turn the direction of writing. All of these, and bytes that are
// no UTF-8, are shown as "\\xHH", byte by byte; everything else, a backslash too, stands as it is.
// Who needs a name exactly asks for --json.
#ifndef ZMC_TOOLS_VISIBLE_H
#define ZMC_TOOLS_VISIBLE_H

#include <cstddef>
#include <string>
#include <string_view>

namespace zmctools {

std::string Visible(std::string_view text);

// The first `columns` bytes of a visible text at most, and no part of a character; three dots stand
// for what is cut off.
std::string Shortened(const std::string& visible, std::size_t columns);

}  // namespace zmctools

#endif
