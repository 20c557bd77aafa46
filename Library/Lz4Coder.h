// LZ4 blocks, decoded as far as they can be. Any thread.
#pragma once

#include "Runtime/Core/Types.h"

// Decodes a block of storedSize bytes into out, which has room for size, and returns how many bytes it gives: size, or,
// of a damaged block, less. Both sizes are below 2^31 - 1.
size_t DecodeLz4(const UInt8* stored, size_t storedSize, UInt8* out, size_t size);
