// LZMA data as archives hold it: the 5 bytes of properties, and the raw stream right behind them, with or without an
// end mark. No size lies between them. No data of its own: any thread, each stream's state one thread at a time.
#pragma once

#include "Runtime/Utilities/Compression/Compression.h"

class LzmaDecompressor : public IDecompressor {
public:
    CompressionType GetType() const override;

    // Stops when dst is full or the end mark is met; input that ends before both is a failure. Needs no memory for a
    // dictionary. After a failure both sizes are as they were.
    bool DecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const override;

    // States live under kMemLabelFileSystem. A reset state frees what the last stream allocated.
    bool DecompressStreamInit(void** state) const override;
    void DecompressStreamDeinit(void* state) const override;

    // The first call must bring the properties whole, and allocates the dictionary whose size they name; one that
    // fails to do so leaves the state as it was. Stops when dst is full, the end mark is met or input is missing. Once
    // the stream has turned out to be damaged, every call fails until the state is reset. After a failure both sizes
    // are as they were.
    bool DecompressStream(void* state, const void* src, size_t* srcSize, void* dst, size_t* dstSize,
                          bool isLastInput) const override;

    DecompressResult TryDecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const override;
    DecompressResult TryDecompressStream(void* state, const void* src, size_t* srcSize, void* dst, size_t* dstSize,
                                         bool isLastInput) const override;
};
