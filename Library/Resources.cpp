#include "Library/Resources.h"

#include <algorithm>
#include <cstdio>
#include <sys/resource.h>

UInt64 MemoryBudget(UInt64 wanted) {
    constexpr UInt64 kUnknown = UInt64{1} << 30;
    if (wanted != 0) return wanted;
    FILE* const file = fopen("/proc/meminfo", "re");
    if (file == nullptr) return kUnknown;
    char line[128];
    unsigned long long kibibytes = 0;
    while (fgets(line, sizeof(line), file) != nullptr)
        if (sscanf(line, "MemAvailable: %llu kB", &kibibytes) == 1) break;
    fclose(file);
    return kibibytes != 0 ? kibibytes * 1'024 / 2 : kUnknown;
}

UInt64 FreeDescriptors(UInt64 kept) {
    rlimit limit = {};
    if (getrlimit(RLIMIT_NOFILE, &limit) != 0) return RLIM_INFINITY;
    return std::max<UInt64>(limit.rlim_cur, kept + 1) - kept;
}
