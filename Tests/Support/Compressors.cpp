#include "Tests/Support/Compressors.h"

#include "Library/Writer/Encoders.h"

#include <cstdio>
#include <cstdlib>

// No test can go on without its archive.
static std::string Encode(const EncoderSettings& settings, std::string_view plain) {
    constexpr size_t kMostOverhead = 1'024;
    std::string stored(plain.size() + plain.size() / 8 + kMostOverhead, '\0');
    size_t size = 0;
    BlockEncoder encoder;
    const bool isEncoded =
        encoder.Prepare(settings) &&
        encoder.Encode(reinterpret_cast<const UInt8*>(plain.data()), plain.size(),
                       reinterpret_cast<UInt8*>(stored.data()), stored.size(), &size, nullptr) == EncodeResult::kOk;
    if (!isEncoded) {
        fprintf(stderr, "%zu bytes could not be encoded by kind %u\n", plain.size(), settings.type);
        abort();
    }
    stored.resize(size);
    return stored;
}

std::string CompressLzma(std::string_view plain, const LzmaSettings& settings) {
    return Encode({.type = kCompressionLzma,
                   .level = settings.level,
                   .dictionarySize = settings.dictionarySize,
                   .endMark = settings.endMark},
                  plain);
}

std::string CompressLz4(std::string_view plain) { return Encode({.type = kCompressionLz4}, plain); }

std::string CompressLz4HC(std::string_view plain) { return Encode({.type = kCompressionLz4HC, .level = 9}, plain); }

std::string Compress(CompressionType type, std::string_view plain, const LzmaSettings& lzma) {
    switch (type) {
    case kCompressionLzma: return CompressLzma(plain, lzma);
    case kCompressionLz4: return CompressLz4(plain);
    case kCompressionLz4HC: return CompressLz4HC(plain);
    default: return std::string(plain);
    }
}
