// LZMA as blocks hold it: 5 bytes of properties, then the raw stream, with or without an end mark. Reports how far
// decoding got, distinguishes refused memory from damage, and allocates no larger dictionary than the block can use.
#pragma once

#include "Library/Lzma/Lzma.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"

enum LzmaResult {
    kLzmaOk,
    kLzmaDamaged,
    kLzmaNoMemory,
};

// Decodes up to size bytes of a block that is in memory whole. *produced is how many were decoded, even of a damaged
// block. kLzmaOk: all of them.
LzmaResult DecodeLzma(const UInt8* stored, size_t storedSize, UInt8* out, size_t size, size_t* produced);

// Decodes piece by piece. One thread at a time.
class LzmaStream : private NonCopyable {
public:
    LzmaStream();

    // Starts a block of blockSize decoded bytes. kLzmaDamaged: the properties are impossible.
    LzmaResult Begin(const UInt8 properties[lzma::kPropertiesSize], UInt64 blockSize);

    // Decodes on: takes up to *inSize bytes, makes up to *outSize bytes, and stores how many it took and made. kLzmaOk
    // with fewer than asked for: more input is needed, or the stream's end mark was met. After damage, *outSize is the
    // number of bytes before it.
    LzmaResult Decode(const UInt8* in, size_t* inSize, UInt8* out, size_t* outSize);

    UInt64 MemoryUsed() const { return m_Stream.MemoryUsed(); }

private:
    lzma::Stream m_Stream;
};
