#include "Tests/Support/ReportRecorder.h"
#include "Tools/ArchiveWriter/Compressors.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <optional>
#include <random>

using namespace std::string_literals;
static const IDecompressor* const kLz4 = CreateDecompressor(kCompressionLz4HC, kMemLabelGeneral);
static const IDecompressor* const kLzma = CreateDecompressor(kCompressionLzma, kMemLabelGeneral);
static const std::string kPlain = "zarvo zarvo zarvo zarvo\n", kBlock = "\x69zarvo \6\0Parvo\n"s;
static const std::string kBare = "\x5d\0\x10\0\0\0\x3d\x18\x4a\xac\x4a\x1d\x09\x1a\x65\xdc\xc3\0\0"s;
static const std::string kEnded = kBare.substr(0, 15) + "\xe3\x3d\x7a\xff\xff\xfc\xf4\x50\0"s;

// One call, of a stream or for a whole buffer: how much was consumed, and the output; nothing when it is refused. The
// memory is of exactly the sizes given, for the sanitizer to watch; input that there is none of has no address.
using Result = std::optional<std::pair<size_t, std::string>>;
static Result Decode(const IDecompressor* decoder, void* state, const std::string& source, size_t room, bool isLast) {
    std::vector<char> in(source.begin(), source.end()), out(room);
    size_t taken = in.size(), made = room;
    if (state == nullptr ? !decoder->DecompressMemory(in.data(), &taken, out.data(), &made)
                         : !decoder->DecompressStream(state, in.data(), &taken, out.data(), &made, isLast))
        return {};
    return Result({taken, std::string(out.data(), made)});
}

TEST(Decompressor, OneCallDecodesWhatFitsOrRefuses) {
    using Row = std::tuple<const IDecompressor*, bool, std::string, size_t, size_t, size_t>;
    for (const auto& [decoder, isStream, source, room, consumed, produced] : // consumed: 0 when refused
         {Row(kLz4, false, kBlock, 99, 15, 24), Row(kLz4, false, kBlock, 23, 0, 0),
          Row(kLz4, false, kBlock + kBlock, 99, 0, 0), Row(kLz4, true, kBlock, 24, 0, 0),
          Row(kLz4, false, "\0"s, 9, 0, 0), Row(kLzma, false, kBare + "!", 24, 19, 24),
          Row(kLzma, true, kBare, 25, 19, 24), Row(kLzma, false, kBare, 25, 0, 0), Row(kLzma, false, kBare, 10, 18, 10),
          Row(kLzma, false, kEnded + "!", 99, 24, 24), Row(kLzma, true, kEnded + "!", 99, 24, 24),
          Row(kLzma, true, kEnded.substr(0, 4), 9, 0, 0), Row(kLzma, true, "\xE1" + kEnded, 24, 0, 0)}) {
        void* state = nullptr;
        ASSERT_TRUE(!isStream || kLzma->DecompressStreamInit(&state));
        const Result expected = consumed == 0 ? Result() : Result({consumed, kPlain.substr(0, produced)});
        EXPECT_EQ(Decode(decoder, state, source, room, false), expected) << source.size() << " into " << room;
        kLzma->DecompressStreamDeinit(state);
    }
    for (size_t length = 0; length < kEnded.size(); ++length)
        EXPECT_FALSE(Decode(kLzma, nullptr, kEnded.substr(0, length), 99, false)) << length;
    for (size_t length = 0; length < kBlock.size(); ++length)
        EXPECT_NE(Decode(kLz4, nullptr, kBlock.substr(0, length), 24, false), Result({length, kPlain})) << length;
    ReportRecorder reports;
    EXPECT_TRUE(kLz4->GetType() == kCompressionLz4 && kLzma->GetType() == kCompressionLzma);
    for (const CompressionType type : {kCompressionNone, kCompressionCount}) // the second is reported
        EXPECT_EQ(CreateDecompressor(type, kMemLabelGeneral), nullptr);
    size_t tooMuch = 0x7FFFFFFF, made = 24;
    EXPECT_FALSE(kLz4->DecompressMemory(kBlock.data(), &tooMuch, nullptr, &made)); // reported
    EXPECT_EQ(reports.Take().size(), 2u);
}

// The decoder, called again after an error, reads wild memory; the state refuses instead.
TEST(LzmaDecompressor, StreamCutInAnyWayIsTheWholeAndADamagedOneRefusesUntilItIsReset) {
    std::mt19937 random(7);
    std::string plain(100'000, 'z');
    std::generate(plain.begin() + 30'000, plain.end(), random);
    const std::string stored[] = {CompressLzma(plain), CompressLzma(plain, {.endMark = true})};
    void* state = nullptr;
    int refused = 0;
    for (int round = 0; round < 100; ++round) {
        std::string source = stored[round % 2], output;
        if (round % 4 < 2) source[5 + random() % (source.size() - 5)] ^= '\x55';
        const size_t piece = size_t{7} << random() % 14, window = 1 + piece * (random() % 40 + 1) / 8;
        ASSERT_TRUE(kLzma->DecompressStreamInit(&state));
        Result step;
        do {
            const size_t left = plain.size() - output.size(), room = std::min(window, left);
            step = Decode(kLzma, state, source.substr(0, piece), room, piece >= source.size() && room == left);
            if (step) source.erase(0, step->first), output += step->second;
        } while (step && step->first + step->second.size() != 0 && output.size() < plain.size());
        EXPECT_TRUE(round % 4 < 2 || output == plain) << round;
        EXPECT_TRUE(step || !(Decode(kLzma, state, source, 9, false) || Decode(kLzma, state, "", 9, false))) << round;
        refused += !step;
    }
    EXPECT_GT(refused, 10); // else the damage did not reach the decoder
    kLzma->DecompressStreamDeinit(state);
}
