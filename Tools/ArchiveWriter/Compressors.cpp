#include "Tools/ArchiveWriter/Compressors.h"

#include <cstdio>
#include <cstdlib>
#include <lz4.h>
#include <lz4hc.h>
#include <lzma/LzmaEnc.h>

namespace {

constexpr size_t kLzmaPropertiesSize = 5;

void* AllocateForEncoder(void*, size_t size) { return malloc(size); }
void FreeForEncoder(void*, void* address) { free(address); }

// An encoder that fails leaves nothing to test with.
void RequireEncoded(bool isEncoded, const char* encoder) {
    if (isEncoded) return;
    fprintf(stderr, "%s could not encode\n", encoder);
    abort();
}

} // namespace

std::string CompressLzma(std::string_view plain, const LzmaSettings& settings) {
    CLzmaEncProps properties;
    LzmaEncProps_Init(&properties);
    properties.level = settings.level;
    properties.dictSize = settings.dictionarySize;
    properties.numThreads = 1;

    ISzAlloc allocator = {AllocateForEncoder, FreeForEncoder};
    std::string stored(kLzmaPropertiesSize + plain.size() + plain.size() / 3 + 128, '\0');
    Byte* const bytes = reinterpret_cast<Byte*>(stored.data());
    size_t propertiesSize = kLzmaPropertiesSize;
    size_t codedSize = stored.size() - kLzmaPropertiesSize;
    const SRes result =
        LzmaEncode(bytes + kLzmaPropertiesSize, &codedSize, reinterpret_cast<const Byte*>(plain.data()), plain.size(),
                   &properties, bytes, &propertiesSize, settings.endMark ? 1 : 0, nullptr, &allocator, &allocator);
    RequireEncoded(result == SZ_OK && propertiesSize == kLzmaPropertiesSize, "LzmaEncode");
    stored.resize(kLzmaPropertiesSize + codedSize);
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
