// The element types as a list of typed tests.
#ifndef ZMC_TESTS_SUPPORT_ELEMENTTYPELIST_H
#define ZMC_TESTS_SUPPORT_ELEMENTTYPELIST_H

#include <gtest/gtest.h>

#include <string>

#include "core/ElementTypes.h"

namespace zmctest {

using namespace zelm;

template <class Ignored, class... Ts>
struct TypesAfterFirst {
    using Types = ::testing::Types<Ts...>;
};

#define ZMC_X(type, name, code) , type
using AllElementTypes = TypesAfterFirst<void ZMC_ELEMENT_TYPES(ZMC_X)>::Types;
#undef ZMC_X

// Names the instances of a typed test by the word of the element type.
struct ElementTypeNames {
    template <class T>
    static std::string GetName(int) {
        return ElementTraits<T>::word;
    }
};

}  // namespace zmctest

#endif
