// A library that nobody is to load: says so and ends the process, whatever was asked of it.
#include <unistd.h>

namespace {

[[gnu::constructor]] void Loaded() {
    const char text[] = "a planted library was loaded\n";
    static_cast<void>(!write(STDERR_FILENO, text, sizeof text - 1));
    _exit(99);
}

}  // namespace
