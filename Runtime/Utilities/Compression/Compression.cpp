#include "Runtime/Utilities/Compression/Compression.h"

#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Utilities/Compression/Lz4Decompressor.h"
#include "Runtime/Utilities/Compression/LzmaDecompressor.h"
#include "Runtime/Utilities/Format.h"
#include "Runtime/Utilities/LogAssert.h"

// For kinds that need no memory to decode.
DecompressResult IDecompressor::TryDecompressMemory(const void* src, size_t* srcSize, void* dst,
                                                    size_t* dstSize) const {
    return DecompressMemory(src, srcSize, dst, dstSize) ? DecompressResult::kOk : DecompressResult::kDamaged;
}

DecompressResult IDecompressor::TryDecompressStream(void* state, const void* src, size_t* srcSize, void* dst,
                                                    size_t* dstSize, bool isLastInput) const {
    return DecompressStream(state, src, srcSize, dst, dstSize, isLastInput) ? DecompressResult::kOk
                                                                            : DecompressResult::kDamaged;
}

IDecompressor* CreateDecompressor(CompressionType type, MemLabelId label) {
    if (type == kCompressionNone) return nullptr;
    if (type == kCompressionLzma) return RequireMemory(New<LzmaDecompressor>(label));
    if (type == kCompressionLz4 || type == kCompressionLz4HC) return RequireMemory(New<Lz4Decompressor>(label));
    ReportError(
        Format("Decompressing this format (%d) is not supported on this platform.", static_cast<int>(type)).c_str());
    return nullptr;
}
