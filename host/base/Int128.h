// 128-bit integers, which the compilers have and the standard does not name.
#ifndef ZMC_HOST_BASE_INT128_H
#define ZMC_HOST_BASE_INT128_H

namespace zmchost {

__extension__ typedef __int128 Int128;
__extension__ typedef unsigned __int128 UInt128;

}  // namespace zmchost

#endif
