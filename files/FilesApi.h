// Marks what the library `zmcfiles` offers to others; whatever bears no mark stays inside.
#ifndef ZMC_FILES_FILESAPI_H
#define ZMC_FILES_FILESAPI_H

#if defined(_WIN32)
#if defined(zmcfiles_EXPORTS)
#define ZMC_FILES_API __declspec(dllexport)
#else
#define ZMC_FILES_API __declspec(dllimport)
#endif
#else
#define ZMC_FILES_API __attribute__((visibility("default")))
#endif

#endif
