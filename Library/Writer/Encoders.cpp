#include "Library/Writer/Encoders.h"

#include "PlatformDependent/Linux/LargePages.h"
#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cstddef>
#include <lz4.h>
#include <lz4hc.h>
#include <lzma/LzmaEnc.h>

namespace {

void* Allocate(size_t size) {
    return malloc_internal(size, alignof(max_align_t), kMemLabelFileSystem, kAllocateOptionNone, __FILE__, __LINE__);
}
void Free(void* address) { free_alloc_internal(address, kMemLabelFileSystem, __FILE__, __LINE__); }

// The SDK's interfaces are structures of functions, which get a pointer to their structure.
ISzAlloc s_Allocator = {[](void*, size_t size) { return Allocate(size); }, [](void*, void* address) { Free(address); }};
// For what the match finder jumps about in.
ISzAlloc s_TableAllocator = {[](void*, size_t size) {
                                 void* const tables = Allocate(size);
                                 PreferLargePages(tables, size);
                                 return tables;
                             },
                             [](void*, void* address) { Free(address); }};

struct StopCheck {
    explicit StopCheck(const std::atomic<bool>* flag) : isStopped(flag) {}

    ICompressProgress* Get() { return isStopped != nullptr ? &progress : nullptr; }

    ICompressProgress progress = {[](void* self, UInt64, UInt64) -> SRes {
        const bool isOver = static_cast<StopCheck*>(self)->isStopped->load(std::memory_order_relaxed);
        return isOver ? SZ_ERROR_PROGRESS : SZ_OK;
    }};
    const std::atomic<bool>* isStopped;
};

struct StreamInput {
    ISeqInStream stream = {[](void* self, void* buffer, size_t* size) -> SRes {
        auto* const input = static_cast<StreamInput*>(self);
        input->hasFailed = input->hasFailed || !input->ends->Read(static_cast<UInt8*>(buffer), size);
        if (!input->hasFailed) return SZ_OK;
        *size = 0;
        return SZ_ERROR_READ;
    }};
    StreamEnds* ends;
    bool hasFailed = false;
};

struct StreamOutput {
    ISeqOutStream stream = {[](void* self, const void* bytes, size_t size) -> size_t {
        auto* const output = static_cast<StreamOutput*>(self);
        output->hasFailed = output->hasFailed || !output->ends->Write(static_cast<const UInt8*>(bytes), size);
        return output->hasFailed ? 0 : size;
    }};
    StreamEnds* ends;
    bool hasFailed = false;
};

// The SDK's encoder, made and set up; null when memory is refused.
CLzmaEncHandle MakeLzmaEncoder(const EncoderSettings& settings) {
    const CLzmaEncHandle encoder = LzmaEnc_Create(&s_Allocator);
    if (encoder == nullptr) return nullptr;
    CLzmaEncProps properties;
    LzmaEncProps_Init(&properties);
    properties.level = settings.level;
    properties.dictSize = settings.dictionarySize;
    properties.writeEndMark = settings.endMark ? 1 : 0;
    properties.numThreads = 1;
    (void)LzmaEnc_SetProps(encoder, &properties); // fails only for values that are out of range
    return encoder;
}

void FreeLzmaEncoder(CLzmaEncHandle encoder) { LzmaEnc_Destroy(encoder, &s_Allocator, &s_TableAllocator); }

void WriteLzmaProperties(CLzmaEncHandle encoder, UInt8 (&bytes)[kLzmaPropertiesSize]) {
    SizeT size = sizeof(bytes);
    (void)LzmaEnc_WriteProperties(encoder, bytes, &size); // fails only without room
}

EncodeResult ResultOf(SRes result) {
    switch (result) {
    case SZ_OK: return EncodeResult::kOk;
    case SZ_ERROR_MEM: return EncodeResult::kNoMemory;
    case SZ_ERROR_PROGRESS: return EncodeResult::kStopped;
    default: return EncodeResult::kNoRoom;
    }
}

} // namespace

UInt32 ChooseLzmaDictionary(int level, UInt64 bytes) {
    CLzmaEncProps properties;
    LzmaEncProps_Init(&properties);
    properties.level = level;
    const UInt64 most =
        std::max<UInt64>(std::min<UInt64>(LzmaEncProps_GetDictSize(&properties), bytes), kMinLzmaDictionary);
    UInt64 size = kMinLzmaDictionary;
    while (size * 2 <= most)
        size *= 2;
    return static_cast<UInt32>(size / 2 * 3 <= most ? size / 2 * 3 : size);
}

UInt64 BlockEncoderMemory(const EncoderSettings& settings) {
    constexpr UInt64 kLzmaTables = 1'048'576;
    switch (settings.type) {
    case kCompressionLzma: return 12 * UInt64{settings.dictionarySize} + kLzmaTables;
    case kCompressionLz4: return static_cast<UInt64>(LZ4_sizeofState());
    case kCompressionLz4HC: return static_cast<UInt64>(LZ4_sizeofStateHC());
    default: return 0;
    }
}

// The window that slides over the stream is half as long again as the dictionary.
UInt64 StreamEncoderMemory(const EncoderSettings& settings) {
    return BlockEncoderMemory(settings) + 2 * UInt64{settings.dictionarySize};
}

BlockEncoder::~BlockEncoder() {
    if (m_State == nullptr) return;
    if (m_Settings.type == kCompressionLzma)
        FreeLzmaEncoder(m_State);
    else
        Free(m_State);
}

bool BlockEncoder::Prepare(const EncoderSettings& settings) {
    m_Settings = settings;
    switch (settings.type) {
    case kCompressionLzma: m_State = MakeLzmaEncoder(settings); break;
    case kCompressionLz4: m_State = Allocate(static_cast<size_t>(LZ4_sizeofState())); break;
    case kCompressionLz4HC: m_State = Allocate(static_cast<size_t>(LZ4_sizeofStateHC())); break;
    default: return true;
    }
    return m_State != nullptr;
}

EncodeResult BlockEncoder::Encode(const UInt8* bytes, size_t size, UInt8* out, size_t room, size_t* outSize,
                                  const std::atomic<bool>* isStopped) {
    if (m_Settings.type == kCompressionLzma) return EncodeWithLzma(bytes, size, out, room, outSize, isStopped);
    const auto* const from = reinterpret_cast<const char*>(bytes);
    auto* const to = reinterpret_cast<char*>(out);
    const int fromSize = static_cast<int>(size);
    const int toSize = static_cast<int>(std::min<size_t>(room, LZ4_MAX_INPUT_SIZE));
    int written = 0;
    // Both set up all of their state: a quicker reset would let the bytes depend on the blocks before.
    if (m_Settings.type == kCompressionLz4)
        written = LZ4_compress_fast_extState(m_State, from, to, fromSize, toSize, 1);
    if (m_Settings.type == kCompressionLz4HC)
        written = LZ4_compress_HC_extStateHC(m_State, from, to, fromSize, toSize, m_Settings.level);
    *outSize = static_cast<size_t>(std::max(written, 0));
    return written > 0 ? EncodeResult::kOk : EncodeResult::kNoRoom;
}

EncodeResult BlockEncoder::EncodeWithLzma(const UInt8* bytes, size_t size, UInt8* out, size_t room, size_t* outSize,
                                          const std::atomic<bool>* isStopped) {
    if (room < kLzmaPropertiesSize) return EncodeResult::kNoRoom;
    UInt8 properties[kLzmaPropertiesSize];
    WriteLzmaProperties(m_State, properties);
    std::copy(properties, properties + kLzmaPropertiesSize, out);
    SizeT coded = room - kLzmaPropertiesSize;
    StopCheck check(isStopped);
    const SRes result = LzmaEnc_MemEncode(m_State, out + kLzmaPropertiesSize, &coded, bytes, size,
                                          m_Settings.endMark ? 1 : 0, check.Get(), &s_Allocator, &s_TableAllocator);
    *outSize = kLzmaPropertiesSize + coded;
    return ResultOf(result);
}

EncodeResult EncodeLzmaStream(const EncoderSettings& settings, StreamEnds* ends, const std::atomic<bool>* isStopped) {
    const CLzmaEncHandle encoder = MakeLzmaEncoder(settings);
    if (encoder == nullptr) return EncodeResult::kNoMemory;
    UInt8 properties[kLzmaPropertiesSize];
    WriteLzmaProperties(encoder, properties);
    StreamInput input{.ends = ends};
    StreamOutput output{.ends = ends};
    StopCheck check(isStopped);
    output.hasFailed = !ends->Write(properties, sizeof(properties));
    SRes result = SZ_OK;
    if (!output.hasFailed)
        result = LzmaEnc_Encode(encoder, &output.stream, &input.stream, check.Get(), &s_Allocator, &s_TableAllocator);
    FreeLzmaEncoder(encoder);
    if (input.hasFailed) return EncodeResult::kInputFailed;
    if (output.hasFailed) return EncodeResult::kOutputFailed;
    return ResultOf(result);
}
