// LZ4 blocks, each decompressed whole: there is no streaming. No data of its own: any thread.
#pragma once

#include "Runtime/Utilities/Compression/Compression.h"

class Lz4Decompressor : public IDecompressor {
public:
    static constexpr size_t kSizeLimit = 0x7FFFFFFF;

    CompressionType GetType() const override;

    // Sizes of kSizeLimit and more are refused and reported as a failed check. An empty output counts as a
    // failure. *srcSize is left as it is; after a failure *dstSize means nothing.
    bool DecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const override;

    // Streams: refused.
    bool DecompressStreamInit(void** state) const override;
    void DecompressStreamDeinit(void* state) const override;
    bool DecompressStream(void* state, const void* src, size_t* srcSize, void* dst, size_t* dstSize,
                          bool isLastInput) const override;
};
