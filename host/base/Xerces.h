// Xerces-C++ for this process.
#ifndef ZMC_HOST_BASE_XERCES_H
#define ZMC_HOST_BASE_XERCES_H

namespace zmchost {

// Initialises Xerces-C++ once, whoever asks and however often, on any thread. It is never
// terminated: other users in the process may still need it, and its two calls do not bear
// overlapping. A program that loads a library which initialises Xerces itself calls this first.
// Throws Error if Xerces does not start.
void InitialiseXerces();

}  // namespace zmchost

#endif
