// SpookyHash V2, the public-domain 128-bit hash published by Bob Jenkins. Not for cryptography. Any thread.
#pragma once

#include "Runtime/Core/Types.h"

class SpookyHash {
public:
    // *hash1 and *hash2 are the seeds on entry and the two halves of the hash on return. message may be null when
    // length is 0.
    static void Hash128(const void* message, size_t length, UInt64* hash1, UInt64* hash2);
};
