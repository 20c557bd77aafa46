#include "Library/LzmaCoder.h"

#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cstring>

static void* Allocate(void*, size_t size) {
    return malloc_internal(size, alignof(max_align_t), kMemLabelFileSystem, kAllocateOptionNone, __FILE__, __LINE__);
}
static void Free(void*, void* address) { free_alloc_internal(address, kMemLabelFileSystem, __FILE__, __LINE__); }
static constinit ISzAlloc s_Allocation = {Allocate, Free};

LzmaResult DecodeLzma(const UInt8* stored, size_t storedSize, UInt8* out, size_t size, size_t* produced) {
    *produced = 0;
    if (storedSize < kLzmaPropertiesSize) return kLzmaDamaged;
    SizeT made = size;
    SizeT taken = storedSize - kLzmaPropertiesSize;
    ELzmaStatus status;
    const SRes result = LzmaDecode(out, &made, stored + kLzmaPropertiesSize, &taken, stored, kLzmaPropertiesSize,
                                   LZMA_FINISH_ANY, &status, &s_Allocation);
    if (result == SZ_ERROR_MEM) return kLzmaNoMemory;
    *produced = made;
    return made == size ? kLzmaOk : kLzmaDamaged;
}

LzmaStream::~LzmaStream() { LzmaDec_Free(&m_Decoder, &s_Allocation); }

LzmaResult LzmaStream::Begin(const UInt8 properties[kLzmaPropertiesSize], UInt64 blockSize) {
    // A distance reaches back to the block's start at most, so a larger dictionary is never full.
    UInt8 bounded[kLzmaPropertiesSize];
    memcpy(bounded, properties, sizeof(bounded));
    UInt32 dictionary;
    memcpy(&dictionary, bounded + 1, sizeof(dictionary));
    dictionary = static_cast<UInt32>(std::min<UInt64>(dictionary, blockSize));
    memcpy(bounded + 1, &dictionary, sizeof(dictionary));
    const SRes result = LzmaDec_Allocate(&m_Decoder, bounded, sizeof(bounded), &s_Allocation);
    if (result == SZ_ERROR_MEM) return kLzmaNoMemory;
    if (result != SZ_OK) return kLzmaDamaged;
    m_MemoryUsed = m_Decoder.dicBufSize + UInt64{m_Decoder.numProbs} * sizeof(CLzmaProb);
    LzmaDec_Init(&m_Decoder);
    return kLzmaOk;
}

LzmaResult LzmaStream::Decode(const UInt8* in, size_t* inSize, UInt8* out, size_t* outSize) {
    ELzmaStatus status;
    return LzmaDec_DecodeToBuf(&m_Decoder, out, outSize, in, inSize, LZMA_FINISH_ANY, &status) == SZ_OK ? kLzmaOk
                                                                                                        : kLzmaDamaged;
}
