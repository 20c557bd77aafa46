// File flags, for the other files of the stand-in.
#pragma once

#include <PlatformSystem.h>

// Follows links; 0 for a missing file. Does not change errno. Any thread.
uint32_t FileFlagsOf(const char* path);
