// Marks what the library `zmcfiles` offers to others, and parts of that which stay inside; whatever
// bears no mark stays inside too. A host needs nothing of it: the marks stand where classes and
// functions are declared.
#ifndef ZMC_FILES_FILESAPI_H
#define ZMC_FILES_FILESAPI_H

#if defined(_WIN32)
#if defined(zmcfiles_EXPORTS)
#define ZMC_FILES_API __declspec(dllexport)
#else
#define ZMC_FILES_API __declspec(dllimport)
#endif
#define ZMC_FILES_LOCAL
#else
#define ZMC_FILES_API __attribute__((visibility("default")))
#define ZMC_FILES_LOCAL __attribute__((visibility("hidden")))
#endif

#endif
