// Random bytes from the operating system. Any thread.
#pragma once

#include "Runtime/Core/Types.h"

// Whether all length bytes of buffer were filled; when not, some may have been.
bool GetSystemEntropy(UInt8* buffer, size_t length);

// The same from two device files: the second is tried when the first can't be opened, and never made to wait.
bool ReadEntropyDevice(const char* first, const char* second, UInt8* buffer, size_t length);
