// The two functions that draw codes for classes and errors, as zmcg exports them.
//
// They stand apart from the rest of zmcg's contract so that the object model needs nothing of it:
// the rest stands on String, and brings the headers of a threading library. Both work from
// load-time initialisers of any module in the process, and from any thread.
#ifndef ZMC_CORE_OBJECTCODES_H
#define ZMC_CORE_OBJECTCODES_H

#include "core/String.h"

// A name of zmcg's, found by its plain name.
#if defined(_WIN32)
#define ZMCG_SYMBOL extern "C" __declspec(dllimport)
#else
#define ZMCG_SYMBOL extern "C" __attribute__((visibility("default")))
#endif

// A number for a class word, never 0; equal for equal words, stable for the life of the process.
// Where memory runs out the number is still one that no other word has, and goes unremembered.
ZMCG_SYMBOL unsigned GloballyUniqueObjectTypeCode(const zelm::String& name);
// A number that no earlier call has returned, never 0.
ZMCG_SYMBOL unsigned GloballyUniqueObjectErrorCode();

#endif
