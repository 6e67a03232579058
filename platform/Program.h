// What a process can find out about itself without believing those who started it.
//
// The name that a program was started by is whatever its caller passed, and the name that a library
// was loaded by may be relative to a working directory of the past; both would have to be looked up
// below the working directory, which belongs to somebody else. What is told here comes from the
// system. Nothing throws; any thread may call.
#ifndef ZMC_PLATFORM_PROGRAM_H
#define ZMC_PLATFORM_PROGRAM_H

#include <string>

namespace platform {

// Absolute path, without symbolic links, of the program or library that the code at an address was
// loaded from; empty if not known. A file that was replaced or removed since has its old name.
std::string FileOfCode(const void* code);

// The same of the program of this process.
std::string FileOfProgram();

// The value of an environment variable; empty if it is not set, and in a program that runs with
// rights which those who set the variable may not have.
std::string EnvironmentValue(const char* name);

// Whether a path means the same file whatever the working directory is.
bool IsAbsolutePath(const std::string& path);

}  // namespace platform

#endif
