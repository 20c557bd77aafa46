// Encoders for the kinds of compression that archives use. Any thread.
//
//   std::string stored = CompressLzma(plain, {.endMark = true});
#pragma once

#include "Runtime/Utilities/Compression/Compression.h"

#include <functional>
#include <string>
#include <string_view>

constexpr size_t kLzmaPropertiesSize = 5;

struct LzmaSettings {
    bool endMark = false;           // ends the stream with the end mark
    int level = 5;                  // 0 to 9
    UInt32 dictionarySize = 65'536; // at least 4,096
};

// Returns the next bytes to compress, at most size, and none at the end.
using ByteSource = std::function<std::string_view(size_t size)>;
using ByteSink = std::function<void(std::string_view bytes)>;

// Writes the properties, then the coded bytes, as archives store them, without the legacy size field. The properties
// get their own call of the sink. The form with source and sink holds only the encoder's state in memory.
void CompressLzma(const ByteSource& source, const ByteSink& sink, const LzmaSettings& settings);
std::string CompressLzma(std::string_view plain, const LzmaSettings& settings = {});

// Each returns one LZ4 block.
std::string CompressLz4(std::string_view plain);
std::string CompressLz4HC(std::string_view plain);

// Compresses by kind. kCompressionNone and kinds without an encoder return the bytes unchanged.
std::string Compress(CompressionType type, std::string_view plain, const LzmaSettings& lzma = {});
