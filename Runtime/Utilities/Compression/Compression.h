// Decompressors by kind of compression. A decompressor holds no data: every operation is const and one object serves
// any number of threads and streams, each stream with a state of its own that one thread uses at a time.
//
//   IDecompressor* lzma = CreateDecompressor(kCompressionLzma, label);
//   size_t srcSize = stored.size(), dstSize = plain.size();
//   if (!lzma->DecompressMemory(stored.data(), &srcSize, plain.data(), &dstSize) || dstSize != plain.size()) ...
//   Delete(lzma, label);
#pragma once

#include "Runtime/Allocator/MemLabel.h"
#include "Runtime/Core/Types.h"

// Stored in the low 6 bits of archive and block flags, so any value from 0 to 63 may be met.
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
    kDamaged,     // the data can't be decoded, or not by this kind: trying again is of no use
    kOutOfMemory, // the decoder was refused memory: the same call may succeed later
};

// The order of the virtual operations is fixed; new ones follow the last.
class IDecompressor {
public:
    virtual ~IDecompressor() = default;

    virtual CompressionType GetType() const = 0;

    // Decompresses one whole buffer. In: *srcSize bytes at src, room for *dstSize at dst. Out, on success: *dstSize is
    // the number of bytes produced (and, for LZMA, *srcSize the number consumed). Data that is cut short by the room
    // may still be a success, so compare *dstSize with what was promised.
    [[nodiscard]] virtual bool DecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const = 0;

    // Makes *state (null: created; else reset) ready for a new stream. False when the kind can't be streamed.
    [[nodiscard]] virtual bool DecompressStreamInit(void** state) const = 0;

    // Frees a state; null is allowed.
    virtual void DecompressStreamDeinit(void* state) const = 0;

    // Goes on with the stream. In: *srcSize bytes of further input, room for *dstSize bytes. Out, on success: *srcSize
    // is what was consumed (offer the rest again, first, at the next call) and *dstSize what was produced.
    // isLastInput: no input follows what is offered. Once the decoder has reported an error, every call fails until the
    // state is reset.
    [[nodiscard]] virtual bool DecompressStream(void* state, const void* src, size_t* srcSize, void* dst,
                                                size_t* dstSize, bool isLastInput) const = 0;

    // The same as DecompressMemory and DecompressStream, for callers who treat damage and refused memory differently.
    virtual DecompressResult TryDecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const;
    virtual DecompressResult TryDecompressStream(void* state, const void* src, size_t* srcSize, void* dst,
                                                 size_t* dstSize, bool isLastInput) const;
};

// A new decompressor, allocated under label: destroy it with Delete(decompressor, label). Null for kCompressionNone,
// silently, and for a kind that has no decompressor, which is reported as an error.
IDecompressor* CreateDecompressor(CompressionType type, MemLabelId label);
