#include "Runtime/Utilities/Compression/Lz4Decompressor.h"

#include "Runtime/Utilities/LogAssert.h"

#include <limits>
#include <lz4.h>

static_assert(Lz4Decompressor::kSizeLimit == std::numeric_limits<int>::max());

CompressionType Lz4Decompressor::GetType() const { return kCompressionLz4; }

bool Lz4Decompressor::DecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const {
    if (!Check(*srcSize < kSizeLimit && *dstSize < kSizeLimit,
               "Lz4 doesn't support input or output data size > INT_MAX"))
        return false;
    const int produced = LZ4_decompress_safe(static_cast<const char*>(src), static_cast<char*>(dst),
                                             static_cast<int>(*srcSize), static_cast<int>(*dstSize));
    *dstSize = static_cast<size_t>(produced);
    return produced > 0;
}

bool Lz4Decompressor::DecompressStreamInit(void**) const { return false; }

void Lz4Decompressor::DecompressStreamDeinit(void*) const {}

bool Lz4Decompressor::DecompressStream(void*, const void*, size_t*, void*, size_t*, bool) const { return false; }
