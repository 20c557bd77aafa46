// Random bytes from the operating system. Any thread.
#pragma once

#include "Runtime/Core/Types.h"

// Fills length bytes of buffer. False when fewer came; the buffer's contents are undefined then.
bool GetSystemEntropy(UInt8* buffer, size_t length);
