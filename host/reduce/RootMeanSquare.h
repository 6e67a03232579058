// Root mean squares of up to four samples, rounded correctly: integers half away from zero,
// floating types to nearest, ties to even.
#ifndef ZMC_HOST_REDUCE_ROOTMEANSQUARE_H
#define ZMC_HOST_REDUCE_ROOTMEANSQUARE_H

#include <cstdint>

#include "host/reduce/Rounded.h"

namespace zmchost {

// values: `count` finite samples, 1 <= count <= 4. Clamped to the largest value of T. Of complex
// types, which have no such root, the first sample.
template <class T>
Rounded<T> RootMeanSquare(const T* values, int count);

// The same of integers of which each counts as often as its weight says, from 1 to 2^32 - 1.
template <class T>
Rounded<T> RootMeanSquare(const T* values, const std::uint64_t* weights, int count);

}  // namespace zmchost

#endif
