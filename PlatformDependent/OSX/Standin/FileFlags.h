// The stand-in's record of file flags, for its other files.
#pragma once

#include <PlatformSystem.h>

// Follows links; 0 for what is missing. Leaves errno as it is. Any thread.
uint32_t FileFlagsOf(const char* path);
