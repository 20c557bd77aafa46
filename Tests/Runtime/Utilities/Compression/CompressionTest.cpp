#include "Runtime/Allocator/Allocator.h"
#include "Runtime/Utilities/Compression/Lz4Decompressor.h"
#include "Runtime/Utilities/Compression/LzmaDecompressor.h"
#include "Tests/Support/ReportRecorder.h"
#include "Tools/ArchiveWriter/Compressors.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <memory>
#include <random>

namespace {

const Lz4Decompressor kLz4;
const LzmaDecompressor kLzma;

using namespace std::string_literals;
const std::string kPlain = "zarvo zarvo zarvo zarvo\n";
const std::string kLz4Block = "\x69zarvo \6\0Parvo\n"s;
const std::string kUnmarked = "\x5d\0\x10\0\0\0\x3d\x18\x4a\xac\x4a\x1d\x09\x1a\x65\xdc\xc3\0\0"s;
const std::string kMarked = kUnmarked.substr(0, 15) + "\xe3\x3d\x7a\xff\xff\xfc\xf4\x50\0"s;
const std::string kEmptyMarked = "\x5d\0\x10\0\0\0\x83\xff\xfb\xff\xff\xc0\0\0\0"s;

struct Result {
    bool answer;
    size_t consumed, produced;
    std::string output;
    bool operator==(const Result&) const = default;
};

// One call: of the stream whose state is given, or for a whole buffer. The memory is of exactly the sizes given, for
// the sanitizer to watch; input that there is none of has no address.
Result Decode(const IDecompressor& decoder, void* state, const std::string& source, size_t room, bool isLast = false) {
    const std::unique_ptr<char[]> in(source.empty() ? nullptr : new char[source.size()]), out(new char[room]);
    source.copy(in.get(), source.size());
    Result result = {false, source.size(), room, ""};
    auto& [answer, taken, made, output] = result;
    answer = state == nullptr ? decoder.DecompressMemory(in.get(), &taken, out.get(), &made)
                              : decoder.DecompressStream(state, in.get(), &taken, out.get(), &made, isLast);
    if (answer) output.assign(out.get(), made);
    return result;
}

struct LzmaStream {
    ~LzmaStream() { kLzma.DecompressStreamDeinit(state); }
    bool Start() { return kLzma.DecompressStreamInit(&state); }
    Result Next(const std::string& source, size_t room) { return Decode(kLzma, state, source, room); }
    // The whole source, a piece of input and a window of room at a time, until total bytes are out or nothing moves.
    // The last input is announced when all that is left is offered and the window reaches the end.
    Result Feed(const std::string& source, size_t total, size_t piece, size_t window) {
        Result fed = {Start(), 0, 0, ""};
        for (bool moves = true; fed.answer && moves && fed.output.size() < total;) {
            // The properties come whole.
            const std::string input = source.substr(fed.consumed, std::max<size_t>(piece, fed.consumed == 0 ? 5 : 1));
            const size_t room = std::min(window, total - fed.output.size());
            const bool isAll = fed.consumed + input.size() == source.size();
            const Result step = Decode(kLzma, state, input, room, isAll && fed.output.size() + room == total);
            fed.answer = step.answer;
            fed.output += step.output;
            fed.consumed += step.answer ? step.consumed : 0;
            moves = step.consumed + step.produced != 0;
        }
        return fed;
    }

    void* state = nullptr;
};

} // namespace

TEST(CreateDecompressor, AnswersByKindAndReportsThoseWithoutOne) {
    for (const auto& [asked, type] : {std::pair(0, -1), {1, 1}, {2, 2}, {3, 2}, {4, -1}, {7, -1}, {63, -1}}) {
        ReportRecorder reports;
        IDecompressor* decompressor = CreateDecompressor(static_cast<CompressionType>(asked), kMemLabelGeneral);
        EXPECT_EQ(decompressor != nullptr ? static_cast<int>(decompressor->GetType()) : -1, type) << asked;
        Delete(decompressor, kMemLabelGeneral);
        const std::string text = "format (" + std::to_string(asked) + ") is not supported on this platform.";
        const std::vector<std::string> texts = reports.Take();
        ASSERT_EQ(texts.size(), asked > 3 ? 1u : 0u) << asked;
        EXPECT_TRUE(texts.empty() || texts[0].ends_with(": Decompressing this " + text)) << texts[0];
    }
}

TEST(Lz4Decompressor, DecodesWholeBlocksThatFitTheRoomAndNoStreams) {
    using Row = std::tuple<std::string, size_t, std::string>;
    const std::string run(70000, 'z');
    for (const auto& [source, room, output] :
         {Row(kLz4Block, 24, kPlain), Row(kLz4Block, 100, kPlain), Row(kLz4Block, 23, ""), Row(kLz4Block, 0, ""),
          Row(kLz4Block + kLz4Block, 100, ""), Row("\0"s, 10, ""), Row(CompressLz4HC(run), 70000, run)}) {
        const Result result = Decode(kLz4, nullptr, source, room);
        EXPECT_TRUE(result.answer == !output.empty() && result.output == output && result.consumed == source.size())
            << source.size() << " bytes into " << room;
    }
    for (size_t length = 0; length < kLz4Block.size(); ++length)
        EXPECT_NE(Decode(kLz4, nullptr, kLz4Block.substr(0, length), 24).output, kPlain) << "cut at " << length;
    void* state = nullptr;
    EXPECT_FALSE(kLz4.DecompressStreamInit(&state) || Decode(kLz4, &state, kLz4Block, 24).answer);
}

TEST(Lz4Decompressor, RefusesSizesFromTheLargestIntOn) {
    for (auto [srcSize, dstSize] : {std::pair(15ull, 0x7FFFFFFEull), {15, 0x7FFFFFFF}, {0x7FFFFFFF, 24}}) {
        ReportRecorder reports;
        std::string output(24, '.');
        size_t taken = srcSize, made = dstSize;
        const bool isRefused = !kLz4.DecompressMemory(kLz4Block.data(), &taken, output.data(), &made);
        EXPECT_EQ(isRefused, dstSize != 0x7FFFFFFE);
        EXPECT_EQ(output, isRefused ? std::string(24, '.') : kPlain);
        EXPECT_TRUE(!isRefused ||
                    reports.Take().at(0).ends_with(": Lz4 doesn't support input or output data size > INT_MAX"));
    }
}

TEST(LzmaDecompressor, DecodesWholeBuffersAndStreamsInOneCall) {
    using Row = std::tuple<std::string, size_t, bool, bool, size_t, size_t>; // answers: of a whole, and of a stream
    LzmaStream stream;
    for (const auto& [source, room, isWhole, isStream, consumed, produced] :
         {Row(kUnmarked, 24, true, true, 19, 24), Row(kMarked, 24, true, true, 19, 24),
          Row(kUnmarked, 25, false, true, 19, 24), Row(kMarked, 100, true, true, 24, 24),
          Row(kUnmarked, 10, true, true, 18, 10), Row(kUnmarked + "more", 24, true, true, 19, 24),
          Row(kMarked + "more", 100, true, true, 24, 24), Row(kEmptyMarked, 100, true, true, 15, 0),
          Row(kMarked.substr(0, 5), 0, false, true, 5, 0),
          Row("\xE1" + kMarked, 24, false, false, 0, 0),                  // no such properties
          Row(kMarked.substr(0, 5) + kMarked, 24, false, false, 0, 0)}) { // the stream has to start with 0
        const Result good = {true, consumed, produced, kPlain.substr(0, produced)};
        const Result bad = {false, source.size(), room, ""}; // the sizes stay
        ASSERT_TRUE(stream.Start());
        EXPECT_EQ(Decode(kLzma, nullptr, source, room), isWhole ? good : bad) << source.size() << " into " << room;
        EXPECT_EQ(stream.Next(source, room), isStream ? good : bad) << source.size() << " into " << room;
    }
    for (size_t length = 0; length < kMarked.size(); ++length) {
        const std::string source = kMarked.substr(0, length);
        EXPECT_EQ(Decode(kLzma, nullptr, source, 100), (Result{false, length, 100, ""})) << "cut at " << length;
        ASSERT_TRUE(stream.Start());
        const Result cut = stream.Next(source, 100);
        EXPECT_TRUE(cut.answer == (length >= 5) && cut.consumed == length && kPlain.starts_with(cut.output)) << length;
        const Result rest = stream.Next(cut.answer ? kMarked.substr(length) : kMarked, 100); // refused: as it was
        EXPECT_EQ(cut.output + rest.output, kPlain) << "cut at " << length;
    }
    EXPECT_FALSE(kLzma.DecompressStream(nullptr, nullptr, nullptr, nullptr, nullptr, true));
}

TEST(LzmaDecompressor, StreamCutInAnyWayIsTheWhole) {
    LzmaStream stream;
    std::string noise(140000, '\0');
    std::generate(noise.begin(), noise.end(), std::mt19937(1));
    for (const std::string& plain : {kPlain, noise, std::string(200000, 'z')})
        for (const bool endMark : {false, true}) {
            const std::string source = CompressLzma(plain, {.endMark = endMark});
            for (const size_t piece : {size_t{1}, size_t{7}, size_t{65536}, source.size()})
                for (const size_t window : {size_t{64}, size_t{200}, size_t{65536}, plain.size()})
                    EXPECT_TRUE(stream.Feed(source, plain.size(), piece, window).output == plain)
                        << plain.size() << " bytes, mark " << endMark << ", piece " << piece << ", window " << window;
        }
}

// The decoder, called again after an error, reads wild memory; the state refuses instead.
TEST(LzmaDecompressor, DamagedStreamRefusesEveryCallUntilItIsReset) {
    std::mt19937 random(7);
    std::string plain(160000, 'z');
    std::generate(plain.begin() + 90000, plain.end(), random);
    const std::string good = CompressLzma(plain, {.endMark = true});
    LzmaStream stream;
    int failures = 0;
    for (int round = 0; round < 300; ++round) {
        std::string source = good;
        source[5 + random() % (good.size() - 5)] ^= '\x55';
        const Result fed = stream.Feed(source, plain.size(), 65536, round % 2 == 0 ? 65536 : 1000);
        failures += !fed.answer;
        for (const std::string& next : {source.substr(fed.consumed), std::string(), good})
            ASSERT_TRUE(fed.answer || !stream.Next(next, 65536).answer) << "round " << round;
    }
    EXPECT_GT(failures, 10); // else the damage did not reach the decoder
    EXPECT_TRUE(stream.Feed(good, plain.size(), good.size(), plain.size()).output == plain);
}
