// Identifiers of layers and collections: names of rasters in letters that every document and every
// part of an address holds as they are.
//
// Clients put an identifier into addresses with and without escaping it, and XML holds neither all
// bytes nor a slash where a path is split. So letters, digits, "-", "." and "_" stand for
// themselves, and every other byte is "~" and two hexadecimal digits: "sub/a b.pyr" is
// "sub~2Fa~20b.pyr".
#ifndef ZMC_SERVE_LAYERID_H
#define ZMC_SERVE_LAYERID_H

#include <string>
#include <string_view>

namespace zmcserve {

std::string LayerIdOf(std::string_view name);
// The name of an identifier. What LayerIdOf would have written otherwise is taken as it is, so that
// a name itself is an identifier too unless "~" and two digits stand in it.
std::string NameOfLayerId(std::string_view id);

}  // namespace zmcserve

#endif
