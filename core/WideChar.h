// The code unit of the object model's text: 16 bits on every platform.
#ifndef ZMC_CORE_WIDECHAR_H
#define ZMC_CORE_WIDECHAR_H

#include <type_traits>

namespace zelm {

// wchar_t where that has 16 bits, so that texts pass to the platform's calls as they are;
// char16_t elsewhere.
using WideChar = std::conditional_t<sizeof(wchar_t) == 2, wchar_t, char16_t>;

}  // namespace zelm

#endif
