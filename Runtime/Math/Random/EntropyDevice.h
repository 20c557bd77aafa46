// Random bytes from device files; GetSystemEntropy names the system's. Any thread.
#pragma once

#include "Runtime/Core/Types.h"

// Fills length bytes of buffer from the first device or, if it can't be opened, from the second, which never blocks.
// False when fewer came; the buffer's contents are undefined then.
bool ReadEntropyDevice(const char* first, const char* second, UInt8* buffer, size_t length);
