// Encoders for the kinds of compression that archives use, to make archives with. Any thread.
//
//   std::string stored = CompressLzma(plain, {.endMark = true});
#pragma once

#include "Runtime/Utilities/Compression/Compression.h"

#include <functional>
#include <string>
#include <string_view>

constexpr size_t kLzmaPropertiesSize = 5;

struct LzmaSettings {
    bool endMark = false;           // close the stream with the end mark
    int level = 5;                  // 0 to 9, as the encoder takes them
    UInt32 dictionarySize = 65'536; // at least 4,096
};

// The next bytes to compress, at most size; none at the end.
using ByteSource = std::function<std::string_view(size_t size)>;
using ByteSink = std::function<void(std::string_view bytes)>;

// The properties, then the coded bytes: the form that archives store, without the legacy size field. The properties go
// to the sink in a call of their own; the first form holds no more in memory than the encoder needs.
void CompressLzma(const ByteSource& source, const ByteSink& sink, const LzmaSettings& settings);
std::string CompressLzma(std::string_view plain, const LzmaSettings& settings = {});

// One LZ4 block each.
std::string CompressLz4(std::string_view plain);
std::string CompressLz4HC(std::string_view plain);

// By kind; kCompressionNone and kinds without an encoder return the bytes as they are.
std::string Compress(CompressionType type, std::string_view plain, const LzmaSettings& lzma = {});
