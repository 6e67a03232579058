// Says what a name from the command line is to a process that did not lend it.
#include <cstdio>

#include "files/Lending.h"
#include "files/OpenSource.h"

int main(int count, char** words) {
    using namespace zelm::files;
    if (count != 2) return 2;
    std::printf("%s, %s\n", LooksLent(words[1]) ? "looks lent" : "looks plain",
                OpenSource(words[1], OpenMode::Read) ? "opens" : "opens nothing");
    return 0;
}
