#include "Tools/ArchiveWriter/Compressors.h"

#include <cstdio>
#include <cstdlib>
#include <lz4.h>
#include <lz4hc.h>
#include <lzma/LzmaEnc.h>

namespace {

void* AllocateForEncoder(void*, size_t size) { return malloc(size); }
void FreeForEncoder(void*, void* address) { free(address); }

// No test can go on without its archive.
void RequireEncoded(bool isEncoded, const char* encoder) {
    if (isEncoded) return;
    fprintf(stderr, "%s could not encode\n", encoder);
    abort();
}

// The SDK's streams. The SDK passes a pointer to the first member, through which the functions below reach the others.
struct EncoderInput {
    ISeqInStream stream;
    const ByteSource& source;
};

struct EncoderOutput {
    ISeqOutStream stream;
    const ByteSink& sink;
};

SRes ReadForEncoder(void* stream, void* buffer, size_t* size) {
    const std::string_view piece = static_cast<EncoderInput*>(stream)->source(*size);
    *size = piece.copy(static_cast<char*>(buffer), piece.size());
    return SZ_OK;
}

size_t WriteForEncoder(void* stream, const void* bytes, size_t size) {
    static_cast<EncoderOutput*>(stream)->sink({static_cast<const char*>(bytes), size});
    return size;
}

} // namespace

void CompressLzma(const ByteSource& source, const ByteSink& sink, const LzmaSettings& settings) {
    CLzmaEncProps properties;
    LzmaEncProps_Init(&properties);
    properties.level = settings.level;
    properties.dictSize = settings.dictionarySize;
    properties.writeEndMark = settings.endMark ? 1 : 0;
    properties.numThreads = 1;

    ISzAlloc allocator = {AllocateForEncoder, FreeForEncoder};
    Byte propertyBytes[kLzmaPropertiesSize];
    SizeT propertiesSize = sizeof(propertyBytes);
    const CLzmaEncHandle encoder = LzmaEnc_Create(&allocator);
    RequireEncoded(encoder != nullptr && LzmaEnc_SetProps(encoder, &properties) == SZ_OK &&
                       LzmaEnc_WriteProperties(encoder, propertyBytes, &propertiesSize) == SZ_OK,
                   "LzmaEnc");
    sink({reinterpret_cast<const char*>(propertyBytes), propertiesSize});

    EncoderInput input{{ReadForEncoder}, source};
    EncoderOutput output{{WriteForEncoder}, sink};
    RequireEncoded(LzmaEnc_Encode(encoder, &output.stream, &input.stream, nullptr, &allocator, &allocator) == SZ_OK,
                   "LzmaEnc");
    LzmaEnc_Destroy(encoder, &allocator, &allocator);
}

std::string CompressLzma(std::string_view plain, const LzmaSettings& settings) {
    std::string stored;
    const ByteSource source = [&](size_t size) {
        const std::string_view piece = plain.substr(0, size);
        plain.remove_prefix(piece.size());
        return piece;
    };
    CompressLzma(
        source, [&](std::string_view bytes) { stored += bytes; }, settings);
    return stored;
}

std::string CompressLz4(std::string_view plain) {
    const int plainSize = static_cast<int>(plain.size());
    std::string stored(static_cast<size_t>(LZ4_compressBound(plainSize)), '\0');
    const int size = LZ4_compress_default(plain.data(), stored.data(), plainSize, static_cast<int>(stored.size()));
    RequireEncoded(size > 0, "LZ4_compress_default");
    stored.resize(static_cast<size_t>(size));
    return stored;
}

std::string CompressLz4HC(std::string_view plain) {
    const int plainSize = static_cast<int>(plain.size());
    std::string stored(static_cast<size_t>(LZ4_compressBound(plainSize)), '\0');
    const int size =
        LZ4_compress_HC(plain.data(), stored.data(), plainSize, static_cast<int>(stored.size()), LZ4HC_CLEVEL_DEFAULT);
    RequireEncoded(size > 0, "LZ4_compress_HC");
    stored.resize(static_cast<size_t>(size));
    return stored;
}

std::string Compress(CompressionType type, std::string_view plain, const LzmaSettings& lzma) {
    switch (type) {
    case kCompressionLzma: return CompressLzma(plain, lzma);
    case kCompressionLz4: return CompressLz4(plain);
    case kCompressionLz4HC: return CompressLz4HC(plain);
    default: return std::string(plain);
    }
}
