// Links nothing of the module and loads it by path, again and again, without starting the parser
// library: what stays behind is counted after a few rounds and after the last.
//
//   bare_load_probe MODULE ROUNDS
#include <dlfcn.h>
#include <malloc.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

int LinesOf(const char* name, const char* holding) {
    int lines = 0;
    char line[1024];
    if (std::FILE* const file = std::fopen(name, "r")) {
        while (std::fgets(line, sizeof line, file))
            if (std::strstr(line, holding)) ++lines;
        std::fclose(file);
    }
    return lines;
}

int Mappings() { return LinesOf("/proc/self/maps", ""); }

std::size_t HeapBytes() {
    using Count = std::size_t (*)();
    static const auto count =
        reinterpret_cast<Count>(dlsym(RTLD_DEFAULT, "__sanitizer_get_current_allocated_bytes"));
    return count ? count() : mallinfo2().uordblks;
}

bool LoadAndUnload(const char* module) {
    void* const handle = dlopen(module, RTLD_NOW | RTLD_LOCAL);
    if (!handle) return std::fprintf(stderr, "%s\n", dlerror()), false;
    const bool found = dlsym(handle, "CreateDataConnectionFactory") != nullptr;
    return dlclose(handle) == 0 && found;
}

}  // namespace

int main(int, char** argv) {
    const int rounds = std::atoi(argv[2]);
    for (int i = 0; i < 20; ++i)
        if (!LoadAndUnload(argv[1])) return 2;
    const int mappings = Mappings();
    const std::size_t heap = HeapBytes();
    for (int i = 0; i < rounds; ++i)
        if (!LoadAndUnload(argv[1])) return 2;
    const int stays = LinesOf("/proc/self/maps", "libzmcraster.so");
    const auto growth = static_cast<std::ptrdiff_t>(HeapBytes() - heap);
    std::printf("%d rounds in a bare process: mappings %+d, heap %+td bytes\n", rounds,
                Mappings() - mappings, growth);
    // The address sanitizer keeps something of every load.
    const int loads = dlsym(RTLD_DEFAULT, "__asan_init") ? rounds : 1;
    return stays != 0 || Mappings() > mappings + 1 + loads || growth > 2048 * loads ? 1 : 0;
}
