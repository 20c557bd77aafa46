// LZ4 blocks, decompressed whole: LZ4 can't be streamed. Any thread.
#pragma once

#include "Runtime/Utilities/Compression/Compression.h"

class Lz4Decompressor : public IDecompressor {
public:
    static constexpr size_t kSizeLimit = 0x7FFFFFFF;

    CompressionType GetType() const override;

    // Refuses sizes of kSizeLimit and more, and reports a failed check. An empty output is a failure. *srcSize is left
    // as it is; after a failure *dstSize has no meaning.
    bool DecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const override;

    // Refused: all answer false.
    bool DecompressStreamInit(void** state) const override;
    void DecompressStreamDeinit(void* state) const override;
    bool DecompressStream(void* state, const void* src, size_t* srcSize, void* dst, size_t* dstSize,
                          bool isLastInput) const override;
};
