#include "Runtime/Utilities/Compression/LzmaDecompressor.h"

#include "Runtime/Allocator/Allocator.h"

#include <lzma/LzmaDec.h>

namespace {

constexpr size_t kDecoderMemoryAlignment = 16;

void* LzmaDecAlloc(void*, size_t size) {
    return malloc_internal(size, kDecoderMemoryAlignment, kMemLabelFileSystem, kAllocateOptionNone, __FILE__, __LINE__);
}

void LzmaDecFree(void*, void* address) { free_alloc_internal(address, kMemLabelFileSystem, __FILE__, __LINE__); }

// Not const, because the decoder takes a plain pointer; it only calls the two functions.
constinit ISzAlloc s_LzmaDecAlloc = {LzmaDecAlloc, LzmaDecFree};

// The address of empty input: the decoder copies 0 bytes from it, which null doesn't allow.
constexpr Byte kNoInput = 0;

struct LzmaStreamState {
    CLzmaDec decoder;
    bool started; // the properties were consumed, and the decoder has its tables and dictionary
    bool failed;  // the decoder reported an error: another call would read and write wild memory
};

DecompressResult FailureOf(SRes result) {
    return result == SZ_ERROR_MEM ? DecompressResult::kOutOfMemory : DecompressResult::kDamaged;
}

} // namespace

CompressionType LzmaDecompressor::GetType() const { return kCompressionLzma; }

bool LzmaDecompressor::DecompressMemory(const void* src, size_t* srcSize, void* dst, size_t* dstSize) const {
    return TryDecompressMemory(src, srcSize, dst, dstSize) == DecompressResult::kOk;
}

DecompressResult LzmaDecompressor::TryDecompressMemory(const void* src, size_t* srcSize, void* dst,
                                                       size_t* dstSize) const {
    if (*srcSize < LZMA_PROPS_SIZE) return DecompressResult::kDamaged;
    const auto* const properties = static_cast<const Byte*>(src);
    SizeT consumed = *srcSize - LZMA_PROPS_SIZE;
    SizeT produced = *dstSize;
    ELzmaStatus status;
    const SRes result = LzmaDecode(static_cast<Byte*>(dst), &produced, properties + LZMA_PROPS_SIZE, &consumed,
                                   properties, LZMA_PROPS_SIZE, LZMA_FINISH_ANY, &status, &s_LzmaDecAlloc);
    if (result != SZ_OK) return FailureOf(result);
    *srcSize = consumed + LZMA_PROPS_SIZE;
    *dstSize = produced;
    return DecompressResult::kOk;
}

bool LzmaDecompressor::DecompressStreamInit(void** state) const {
    if (*state == nullptr) *state = RequireMemory(New<LzmaStreamState>(kMemLabelFileSystem));
    auto& stream = *static_cast<LzmaStreamState*>(*state);
    if (stream.started) LzmaDec_Free(&stream.decoder, &s_LzmaDecAlloc);
    LzmaDec_Construct(&stream.decoder);
    stream.started = false;
    stream.failed = false;
    return true;
}

void LzmaDecompressor::DecompressStreamDeinit(void* state) const {
    auto* const stream = static_cast<LzmaStreamState*>(state);
    if (stream == nullptr) return;
    if (stream->started) LzmaDec_Free(&stream->decoder, &s_LzmaDecAlloc);
    Delete(stream, kMemLabelFileSystem);
}

bool LzmaDecompressor::DecompressStream(void* state, const void* src, size_t* srcSize, void* dst, size_t* dstSize,
                                        bool isLastInput) const {
    return TryDecompressStream(state, src, srcSize, dst, dstSize, isLastInput) == DecompressResult::kOk;
}

DecompressResult LzmaDecompressor::TryDecompressStream(void* state, const void* src, size_t* srcSize, void* dst,
                                                       size_t* dstSize, bool isLastInput) const {
    auto* const stream = static_cast<LzmaStreamState*>(state);
    if (stream == nullptr || stream->failed) return DecompressResult::kDamaged;
    const Byte* const input = src != nullptr ? static_cast<const Byte*>(src) : &kNoInput;
    size_t consumed = 0;
    if (!stream->started) {
        if (*srcSize < LZMA_PROPS_SIZE) return DecompressResult::kDamaged;
        const SRes result = LzmaDec_Allocate(&stream->decoder, input, LZMA_PROPS_SIZE, &s_LzmaDecAlloc);
        if (result != SZ_OK) return FailureOf(result);
        LzmaDec_Init(&stream->decoder);
        stream->started = true;
        consumed = LZMA_PROPS_SIZE;
    }

    // Ends: each round produces at least one byte, or is the last.
    size_t produced = 0;
    while (produced < *dstSize) {
        SizeT taken = *srcSize - consumed;
        SizeT made = *dstSize - produced;
        ELzmaStatus status;
        if (LzmaDec_DecodeToBuf(&stream->decoder, static_cast<Byte*>(dst) + produced, &made, input + consumed, &taken,
                                isLastInput ? LZMA_FINISH_END : LZMA_FINISH_ANY, &status) != SZ_OK) {
            stream->failed = true;
            return DecompressResult::kDamaged;
        }
        consumed += taken;
        produced += made;
        if (status == LZMA_STATUS_FINISHED_WITH_MARK || status == LZMA_STATUS_NEEDS_MORE_INPUT) break;
    }
    *srcSize = consumed;
    *dstSize = produced;
    return DecompressResult::kOk;
}
