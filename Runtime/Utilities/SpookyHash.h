// SpookyHash V2, the public-domain 128-bit hash published by Bob Jenkins. Not for cryptography. Any thread.
#pragma once

#include "Runtime/Core/Types.h"

class SpookyHash {
public:
    // *hash1 and *hash2 hold the two seeds at the call and the two halves of the hash afterwards. message may be null
    // when length is 0.
    static void Hash128(const void* message, size_t length, UInt64* hash1, UInt64* hash2);
};
