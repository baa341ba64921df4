// ostrand-bench: runs every registered benchmark, or those whose name contains the first argument.
#include "bench.h"

#include <cstring>

int main(int argc, char** argv)
{
    const char* filter = argc > 1 ? argv[1] : "";
    for (const bench::Entry& e : bench::Registry())
    {
        if (std::strstr(e.name, filter) == NULL)
            continue;
        std::printf("== %s\n", e.name);
        std::fflush(stdout);
        e.run();
        std::fflush(stdout);
    }
    return 0;
}
