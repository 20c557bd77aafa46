// Decompressors by kind of compression. A decompressor holds no data: every operation is const, and one object serves
// any number of threads and streams. Each stream has a state of its own, which one thread at a time may use.
//
//   IDecompressor* lzma = CreateDecompressor(kCompressionLzma, label);
//   size_t srcSize = stored.size(), dstSize = plain.size();
//   if (!lzma->DecompressMemory(stored.data(), &srcSize, plain.data(), &dstSize) || dstSize != plain.size()) ...
//   Delete(lzma, label);
#pragma once

#include "Runtime/Allocator/MemLabel.h"
#include "Runtime/Core/Types.h"

// Stored in the low 6 bits of archive and block flags, so an archive may hold any value from 0 to 63.
enum CompressionType : UInt32 {
    kCompressionNone = 0, // stored as is
    kCompressionLzma = 1,
    kCompressionLz4 = 2,
    kCompressionLz4HC = 3,    // another encoder, the same decoder as kCompressionLz4
    kCompressionReserved = 4, // a valid kind that has no decompressor here
    kCompressionCount = 5,    // the bound of tables indexed by kind
};

enum class DecompressResult {
    kOk,
    kDamaged,     // the data can't be decoded, or not by this kind: trying again is useless
    kOutOfMemory, // the decoder was refused memory: the same call may succeed later
};

// The order of the virtual operations is fixed: add new ones at the end.
class IDecompressor {
public:
    virtual ~IDecompressor() = default;

    virtual CompressionType GetType() const = 0;

    // Decompresses one whole buffer. In: *srcSize bytes at src, room for *dstSize at dst. Out, on success: *dstSize is
    // the number of bytes produced (and, for LZMA, *srcSize the number consumed). LZMA data that doesn't fit the room
    // is cut short, and still a success.
    [[nodiscard]] virtual bool DecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const = 0;

    // Makes *state ready for a new stream: creates it when it is null, else resets it. False when the kind can't be
    // streamed.
    [[nodiscard]] virtual bool DecompressStreamInit(void** state) const = 0;

    // Frees a state; null is allowed.
    virtual void DecompressStreamDeinit(void* state) const = 0;

    // Continues the stream. In: the next *srcSize bytes of input, room for *dstSize bytes. Out, on success: *srcSize is
    // the number consumed (start the next call's input with the rest) and *dstSize the number produced.
    // isLastInput: the input ends with these bytes. Once the decoder has reported an error, every call fails until the
    // state is reset.
    [[nodiscard]] virtual bool DecompressStream(void* state, const void* src, size_t* srcSize, void* dst,
                                                size_t* dstSize, bool isLastInput) const = 0;

    // The same as DecompressMemory and DecompressStream, for callers that tell damage from refused memory.
    virtual DecompressResult TryDecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const;
    virtual DecompressResult TryDecompressStream(void* state, const void* src, size_t* srcSize, void* dst,
                                                 size_t* dstSize, bool isLastInput) const;
};

// A new decompressor, allocated under label: free it with Delete(decompressor, label). Null for kCompressionNone, and
// for a kind without a decompressor, which is reported as an error.
IDecompressor* CreateDecompressor(CompressionType type, MemLabelId label);
