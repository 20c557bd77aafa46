// LZ4 blocks, decoded as far as they can be. Any thread.
#pragma once

#include "Runtime/Core/Types.h"

// Decodes a block of storedSize bytes into out, which has room for size bytes. Returns how many bytes it decoded: size,
// or fewer if the block is damaged. Both sizes are below 2^31 - 1.
size_t DecodeLz4(const UInt8* stored, size_t storedSize, UInt8* out, size_t size);
