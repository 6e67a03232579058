// Version of this program.
#ifndef ZMC_SERVE_VERSION_H
#define ZMC_SERVE_VERSION_H

namespace zmcserve {

inline const char* Version() { return ZMC_VERSION; }

}  // namespace zmcserve

#endif
