// Encoders for the kinds of compression that archives use. What they make depends on the bytes and the settings alone,
// not on what an encoder has done before.
//
//   BlockEncoder encoder;                                    // one per thread
//   if (!encoder.Prepare({.type = kCompressionLz4HC})) ...   // memory was refused
//   encoder.Encode(bytes, size, out, room, &outSize, nullptr);
#pragma once

#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Utilities/Compression/Compression.h"

#include <atomic>

constexpr size_t kLzmaPropertiesSize = 5;
constexpr UInt32 kMinLzmaDictionary = 4'096;

struct EncoderSettings {
    CompressionType type = kCompressionNone;
    int level = 0;             // LZ4HC: 1 to 12. LZMA: 0 to 9
    UInt32 dictionarySize = 0; // LZMA: from kMinLzmaDictionary on
    bool endMark = false;      // LZMA: the end mark follows the coded bytes
};

enum class EncodeResult { kOk, kNoRoom, kNoMemory, kStopped, kInputFailed, kOutputFailed };

// The largest dictionary that LZMA's level asks for, or as much of it as that many bytes can fill: 2^n or 3 * 2^n
// bytes, which the properties can name.
UInt32 ChooseLzmaDictionary(int level, UInt64 bytes);

// How much memory an encoder takes: of blocks, and of a stream.
UInt64 BlockEncoderMemory(const EncoderSettings& settings);
UInt64 StreamEncoderMemory(const EncoderSettings& settings);

// Encodes one block after another. One thread at a time.
class BlockEncoder : private NonCopyable {
public:
    ~BlockEncoder();

    // Before the first block, and once. False when memory is refused.
    [[nodiscard]] bool Prepare(const EncoderSettings& settings);

    // Encodes a block of size bytes, below 2^30 for LZ4, as archives store it: LZMA's properties come first. kNoRoom if
    // out, which has room for that many bytes, can't hold it all; always so for kCompressionNone. Not every encoder
    // looks at isStopped, which may be null.
    EncodeResult Encode(const UInt8* bytes, size_t size, UInt8* out, size_t room, size_t* outSize,
                        const std::atomic<bool>* isStopped);

private:
    EncodeResult EncodeWithLzma(const UInt8* bytes, size_t size, UInt8* out, size_t room, size_t* outSize,
                                const std::atomic<bool>* isStopped);

    EncoderSettings m_Settings;
    void* m_State = nullptr; // of LZ4 or LZ4HC, or the SDK's encoder
};

// The ends of a stream that is encoded piece by piece.
class StreamEnds {
public:
    virtual ~StreamEnds() = default;

    // The next bytes to encode, at most *size of them. *size: how many there are, and 0 at the end. False: a failure.
    virtual bool Read(UInt8* buffer, size_t* size) = 0;
    virtual bool Write(const UInt8* bytes, size_t size) = 0;
};

// Encodes a stream with LZMA. The properties are the first thing that is written, by themselves.
EncodeResult EncodeLzmaStream(const EncoderSettings& settings, StreamEnds* ends, const std::atomic<bool>* isStopped);
