// LZ4 blocks, decoded as far as they can be. Any thread.
#pragma once

#include "Runtime/Core/Types.h"

// Decodes a block of storedSize bytes into out, which has room for size: all of them, or, of a damaged block, those
// that lie before its first broken run of literals or match. Returns how many. Both sizes are below 2^31 - 1.
size_t DecodeLz4(const UInt8* stored, size_t storedSize, UInt8* out, size_t size);

// How many bytes lie before the first broken run of literals or match, at most size. Looks at lengths and offsets only.
//
//   token 1: literals in the upper 4 bits, match length less 4 in the lower; 15 is followed by more
//   more literals: bytes that are added, the last one below 255
//   literals
//   offset 2, little-endian: how far back the match lies; 0 is broken
//   more of the match length: as above
//
// The last sequence ends after its literals, and with it the block. The last 5 bytes are literals, and no match starts
// in the last 12.
size_t MeasureLz4(const UInt8* stored, size_t storedSize, size_t size);
