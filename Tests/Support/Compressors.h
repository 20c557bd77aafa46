// The encoders of libzarvo for texts, with settings of their own. Any thread.
//
//   std::string stored = CompressLzma(plain, {.endMark = true});
#pragma once

#include "Runtime/Utilities/Compression/Compression.h"

#include <string>
#include <string_view>

struct LzmaSettings {
    bool endMark = false;           // ends the stream with the end mark
    int level = 5;                  // 0 to 9
    UInt32 dictionarySize = 65'536; // at least 4,096
};

// The properties and the coded bytes, as archives store them, without the size field of the legacy layouts.
std::string CompressLzma(std::string_view plain, const LzmaSettings& settings = {});

// Each returns one LZ4 block.
std::string CompressLz4(std::string_view plain);
std::string CompressLz4HC(std::string_view plain);

// Compresses by kind. kCompressionNone and kinds without an encoder return the bytes unchanged.
std::string Compress(CompressionType type, std::string_view plain, const LzmaSettings& lzma = {});
