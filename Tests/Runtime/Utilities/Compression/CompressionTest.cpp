#include "Runtime/Allocator/Owned.h"
#include "Tests/Support/Compressors.h"
#include "Tests/Support/RefusedMemory.h"
#include "Tests/Support/ReportRecorder.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <optional>
#include <random>

using namespace std::string_literals;

namespace {

const std::string kPlain = "zarvo zarvo zarvo zarvo\n";
const std::string kLz4Block = "\x69zarvo \6\0Parvo\n"s;
const std::string kLzma = "\x5d\0\x10\0\0\0\x3d\x18\x4a\xac\x4a\x1d\x09\x1a\x65\xdc\xc3\0\0"s;
const std::string kLzmaWithEndMark = kLzma.substr(0, 15) + "\xe3\x3d\x7a\xff\xff\xfc\xf4\x50\0"s;
constexpr size_t kPropertiesSize = 5;

struct Decoded {
    size_t consumed;
    std::string output;

    bool operator==(const Decoded&) const = default;
    friend void PrintTo(const Decoded& decoded, std::ostream* out) {
        *out << decoded.consumed << " consumed, " << testing::PrintToString(decoded.output);
    }
};
constexpr std::nullopt_t kRefused = std::nullopt;

// Copies of the input and the room are of exactly their sizes, for the sanitizer to watch.
std::optional<Decoded> DecodeWhole(const IDecompressor& decoder, const std::string& source, size_t room) {
    const std::vector<char> in(source.begin(), source.end());
    std::vector<char> out(room);
    size_t consumed = in.size();
    size_t produced = room;
    if (!decoder.DecompressMemory(in.data(), &consumed, out.data(), &produced)) return kRefused;
    return Decoded{consumed, std::string(out.data(), produced)};
}

// A stream for as long as the object lives.
class Stream {
public:
    explicit Stream(const IDecompressor& decoder) : m_Decoder(decoder) { Reset(); }
    ~Stream() { m_Decoder.DecompressStreamDeinit(m_State); }

    void Reset() { EXPECT_TRUE(m_Decoder.DecompressStreamInit(&m_State)); }

    std::optional<Decoded> Decode(const std::string& source, size_t room, bool isLastInput = false) {
        const std::vector<char> in(source.begin(), source.end()); // when it is empty, its address is null
        std::vector<char> out(room);
        size_t consumed = in.size();
        size_t produced = room;
        if (!m_Decoder.DecompressStream(m_State, in.data(), &consumed, out.data(), &produced, isLastInput))
            return kRefused;
        return Decoded{consumed, std::string(out.data(), produced)};
    }

private:
    const IDecompressor& m_Decoder;
    void* m_State = nullptr;
};

class Decompressor : public testing::Test {
protected:
    const Owned<IDecompressor> m_Lz4{CreateDecompressor(kCompressionLz4HC, kMemLabelGeneral), kMemLabelGeneral};
    const Owned<IDecompressor> m_Lzma{CreateDecompressor(kCompressionLzma, kMemLabelGeneral), kMemLabelGeneral};
};

} // namespace

TEST_F(Decompressor, Lz4DecodesExactlyOneWholeBlock) {
    EXPECT_EQ((Decoded{kLz4Block.size(), kPlain}), DecodeWhole(*m_Lz4, kLz4Block, 99));
    EXPECT_EQ(kRefused, DecodeWhole(*m_Lz4, kLz4Block, kPlain.size() - 1));
    EXPECT_EQ(kRefused, DecodeWhole(*m_Lz4, kLz4Block + kLz4Block, 99));
    EXPECT_EQ(kRefused, DecodeWhole(*m_Lz4, "\0"s, 9)); // decodes to nothing
    for (size_t length = 0; length < kLz4Block.size(); ++length)
        EXPECT_NE((Decoded{length, kPlain}), DecodeWhole(*m_Lz4, kLz4Block.substr(0, length), 24)) << length;
}

TEST_F(Decompressor, Lz4RefusesAndReportsHugeSizes) {
    ReportRecorder reports;
    size_t huge = 0x7FFFFFFF;
    size_t room = kPlain.size();
    EXPECT_FALSE(m_Lz4->DecompressMemory(kLz4Block.data(), &huge, nullptr, &room));
    size_t size = kLz4Block.size();
    EXPECT_FALSE(m_Lz4->DecompressMemory(kLz4Block.data(), &size, nullptr, &huge));
    EXPECT_EQ(2u, reports.Take().size());
}

TEST_F(Decompressor, Lz4HasNoStreams) {
    void* state = nullptr;
    EXPECT_FALSE(m_Lz4->DecompressStreamInit(&state));
    EXPECT_EQ(nullptr, state);
    char out[99];
    size_t size = kLz4Block.size();
    size_t room = sizeof(out);
    EXPECT_FALSE(m_Lz4->DecompressStream(state, kLz4Block.data(), &size, out, &room, true));
}

TEST_F(Decompressor, LzmaStopsAtFullRoomOrEndMark) {
    EXPECT_EQ((Decoded{kLzma.size(), kPlain}), DecodeWhole(*m_Lzma, kLzma + "!", kPlain.size()));
    EXPECT_EQ((Decoded{18, kPlain.substr(0, 10)}), DecodeWhole(*m_Lzma, kLzma, 10));
    EXPECT_EQ((Decoded{kLzmaWithEndMark.size(), kPlain}), DecodeWhole(*m_Lzma, kLzmaWithEndMark + "!", 99));
}

TEST_F(Decompressor, LzmaRefusesInputThatEndsEarly) {
    EXPECT_EQ(kRefused, DecodeWhole(*m_Lzma, kLzma, kPlain.size() + 1));
    for (size_t length = 0; length < kLzmaWithEndMark.size(); ++length)
        EXPECT_EQ(kRefused, DecodeWhole(*m_Lzma, kLzmaWithEndMark.substr(0, length), 99)) << length;
}

TEST_F(Decompressor, LzmaTellsRefusedMemoryFromDamage) {
    const auto decode = [&](const std::string& source) {
        char out[99];
        size_t size = source.size();
        size_t room = sizeof(out);
        return m_Lzma->TryDecompressMemory(source.data(), &size, out, &room);
    };
    EXPECT_EQ(DecompressResult::kOk, decode(kLzmaWithEndMark));
    EXPECT_EQ(DecompressResult::kDamaged, decode("\xE1" + kLzmaWithEndMark.substr(1))); // no such properties
    const RefusedMemory refusal(1);
    EXPECT_EQ(DecompressResult::kOutOfMemory, decode(kLzmaWithEndMark));
}

TEST_F(Decompressor, LzmaStreamWaitsForMoreInput) {
    Stream stream(*m_Lzma);
    EXPECT_EQ((Decoded{kLzma.size(), kPlain}), stream.Decode(kLzma, kPlain.size() + 1));
    stream.Reset();
    EXPECT_EQ((Decoded{kLzmaWithEndMark.size(), kPlain}), stream.Decode(kLzmaWithEndMark + "!", 99));
}

TEST_F(Decompressor, LzmaStreamNeedsItsPropertiesWhole) {
    Stream stream(*m_Lzma);
    EXPECT_EQ(kRefused, stream.Decode(kLzma.substr(0, kPropertiesSize - 1), 9));
    EXPECT_EQ(kRefused, stream.Decode("\xE1" + kLzma.substr(1), 9));
    EXPECT_EQ((Decoded{kPropertiesSize, ""}), stream.Decode(kLzma.substr(0, kPropertiesSize), 0));
    EXPECT_EQ(kPlain, stream.Decode(kLzma.substr(kPropertiesSize), kPlain.size()).value_or(Decoded{}).output);
}

// A stream cut in any way is the whole. Called again after an error, the decoder would read wild memory: the state
// refuses instead, until it is reset.
TEST_F(Decompressor, DamagedLzmaStreamRefusesUntilReset) {
    std::mt19937 random(7);
    std::string plain(100'000, 'z');
    std::generate(plain.begin() + 30'000, plain.end(), random);
    const std::string withoutMark = CompressLzma(plain);
    const std::string withMark = CompressLzma(plain, {.endMark = true});
    Stream stream(*m_Lzma);
    int refused = 0;
    for (int round = 0; round < 100; ++round) {
        SCOPED_TRACE(round);
        const bool isDamaged = round % 4 < 2;
        std::string source = round % 2 == 0 ? withoutMark : withMark;
        if (isDamaged) source[kPropertiesSize + random() % (source.size() - kPropertiesSize)] ^= '\x55';
        const size_t piece = size_t{7} << random() % 14;
        const size_t window = 1 + piece * (random() % 40 + 1) / 8;
        stream.Reset();
        std::string output;
        std::optional<Decoded> step;
        do {
            const size_t left = plain.size() - output.size();
            const size_t room = std::min(window, left);
            step = stream.Decode(source.substr(0, piece), room, piece >= source.size() && room == left);
            if (!step) break;
            source.erase(0, step->consumed);
            output += step->output;
        } while (step->consumed + step->output.size() != 0 && output.size() < plain.size());
        if (!isDamaged) {
            EXPECT_EQ(plain, output);
        }
        if (!step) {
            ++refused;
            EXPECT_EQ(kRefused, stream.Decode(source, 9));
            EXPECT_EQ(kRefused, stream.Decode("", 9));
        }
    }
    EXPECT_GT(refused, 10); // else the damage did not reach the decoder
}

TEST_F(Decompressor, TellsItsKind) {
    EXPECT_EQ(kCompressionLz4, m_Lz4->GetType()); // though made for kCompressionLz4HC
    EXPECT_EQ(kCompressionLzma, m_Lzma->GetType());
}

TEST_F(Decompressor, OnlyAnUnknownKindIsReported) {
    ReportRecorder reports;
    EXPECT_EQ(nullptr, CreateDecompressor(kCompressionNone, kMemLabelGeneral));
    EXPECT_EQ(0u, reports.Take().size());
    EXPECT_EQ(nullptr, CreateDecompressor(kCompressionReserved, kMemLabelGeneral));
    EXPECT_EQ(1u, reports.Take().size());
}
