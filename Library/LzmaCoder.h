// LZMA as blocks hold it: 5 bytes of properties and the raw stream after them, with or without an end mark. Says how
// far decoding got, tells refused memory from damage, and takes no more memory for a dictionary than the block can use.
#pragma once

#include "Library/Lzma/Lzma.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"

enum LzmaResult {
    kLzmaOk,
    kLzmaDamaged,
    kLzmaNoMemory,
};

// Decodes up to size bytes of a block that is in memory whole. *produced is how many there are, also of a damaged one.
// kLzmaOk: all of them.
LzmaResult DecodeLzma(const UInt8* stored, size_t storedSize, UInt8* out, size_t size, size_t* produced);

// Decodes piece by piece. One thread at a time.
class LzmaStream : private NonCopyable {
public:
    LzmaStream();

    // Starts a block of blockSize bytes. kLzmaDamaged: properties that there can't be.
    LzmaResult Begin(const UInt8 properties[lzma::kPropertiesSize], UInt64 blockSize);

    // Goes on: takes up to *inSize bytes and makes up to *outSize, and stores how many it took and made. kLzmaOk with
    // less than was asked: more input is needed, or the stream's end mark was met. Damage: *outSize is what came
    // before.
    LzmaResult Decode(const UInt8* in, size_t* inSize, UInt8* out, size_t* outSize);

    UInt64 MemoryUsed() const { return m_Stream.MemoryUsed(); }

private:
    lzma::Stream m_Stream;
};
