// LZMA data as archives hold it: 5 bytes of properties and, right after them, the raw stream, with or without an end
// mark. There is no size between them. Any thread; each stream's state one thread at a time.
#pragma once

#include "Runtime/Utilities/Compression/Compression.h"

class LzmaDecompressor : public IDecompressor {
public:
    CompressionType GetType() const override;

    // Stops when dst is full or at the end mark; input that ends before both is a failure. Takes no memory for a
    // dictionary. A failure changes neither size.
    bool DecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const override;

    // States are allocated under kMemLabelFileSystem. A reset frees what the last stream allocated.
    bool DecompressStreamInit(void** state) const override;
    void DecompressStreamDeinit(void* state) const override;

    // The first call needs all 5 bytes of the properties, and allocates a dictionary of the size that they name; if it
    // fails before the dictionary is there, the state is as it was. Stops when dst is full, at the end mark, or when it
    // needs more input. After damage, every call fails until the state is reset. A failure changes neither size.
    bool DecompressStream(void* state, const void* src, size_t* srcSize, void* dst, size_t* dstSize,
                          bool isLastInput) const override;

    DecompressResult TryDecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const override;
    DecompressResult TryDecompressStream(void* state, const void* src, size_t* srcSize, void* dst, size_t* dstSize,
                                         bool isLastInput) const override;
};
