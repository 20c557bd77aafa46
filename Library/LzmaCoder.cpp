#include "Library/LzmaCoder.h"

#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cstring>

using lzma::kPropertiesSize;

static constexpr lzma::Memory s_Memory = {
    .allocate =
        [](void*, size_t size) {
            return malloc_internal(size, alignof(max_align_t), kMemLabelFileSystem, kAllocateOptionNone, __FILE__,
                                   __LINE__);
        },
    .release = [](void*, void* address) { free_alloc_internal(address, kMemLabelFileSystem, __FILE__, __LINE__); },
    .context = nullptr,
};

static LzmaResult ResultOf(lzma::Result result) {
    if (result == lzma::kNoMemory) return kLzmaNoMemory;
    return result == lzma::kDamaged || result == lzma::kUnsupported ? kLzmaDamaged : kLzmaOk;
}

LzmaResult DecodeLzma(const UInt8* stored, size_t storedSize, UInt8* out, size_t size, size_t* produced) {
    *produced = 0;
    if (storedSize < kPropertiesSize) return kLzmaDamaged;
    const lzma::Answer answer =
        lzma::DecodeBlock(stored, stored + kPropertiesSize, storedSize - kPropertiesSize, out, size, s_Memory);
    *produced = answer.produced;
    if (answer.result == lzma::kNoMemory) return kLzmaNoMemory;
    return answer.produced == size ? kLzmaOk : kLzmaDamaged;
}

LzmaStream::LzmaStream() : m_Stream(s_Memory) {}

LzmaResult LzmaStream::Begin(const UInt8 properties[kPropertiesSize], UInt64 blockSize) {
    // A distance reaches back to the block's start at most, so a larger dictionary is never full.
    UInt8 bounded[kPropertiesSize];
    UInt32 dictionary = 0;
    for (size_t index = kPropertiesSize; --index != 0;)
        dictionary = dictionary << 8 | properties[index];
    dictionary = static_cast<UInt32>(std::min<UInt64>(dictionary, blockSize));
    bounded[0] = properties[0];
    for (size_t index = 1; index < kPropertiesSize; ++index)
        bounded[index] = static_cast<UInt8>(dictionary >> (8 * (index - 1)));
    return ResultOf(m_Stream.Start(bounded, lzma::kHistoryOwn));
}

LzmaResult LzmaStream::Decode(const UInt8* in, size_t* inSize, UInt8* out, size_t* outSize) {
    const lzma::Answer answer = m_Stream.Decode(in, *inSize, out, *outSize, lzma::kFinishAny);
    *inSize = answer.consumed;
    *outSize = answer.produced;
    return ResultOf(answer.result);
}
