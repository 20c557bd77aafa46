#include "Library/Lzma/Lzma.h"
#include "Library/Lzma/BitDecoder.h"
#include "Tests/Support/Compressors.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <random>

using namespace lzma;
using namespace std::string_literals;

namespace {

// Properties and stream of the same text, without an end mark, and with one.
const std::string kPlain = "zarvo zarvo zarvo zarvo\n";
const std::string kBare = "\x5d\0\x10\0\0\0\x3d\x18\x4a\xac\x4a\x1d\x09\x1a\x65\xdc\xc3\0\0"s;
const std::string kMarked = kBare.substr(0, 15) + "\xe3\x3d\x7a\xff\xff\xfc\xf4\x50\0"s;

// Counts what is allocated, and refuses once there have been so many grants.
struct CountingMemory {
    int grantsLeft = 1'000;
    int held = 0;

    static void* Allocate(void* context, size_t size) {
        auto* const self = static_cast<CountingMemory*>(context);
        if (self->grantsLeft == 0) return nullptr;
        --self->grantsLeft;
        ++self->held;
        return malloc(size);
    }

    static void Release(void* context, void* address) {
        --static_cast<CountingMemory*>(context)->held;
        free(address);
    }

    operator Memory() { return {Allocate, Release, this}; }
};

struct Outcome {
    Result result;
    size_t consumed; // without properties
    std::string output;
    bool operator==(const Outcome&) const = default;
};

std::ostream& operator<<(std::ostream& stream, const Outcome& outcome) {
    return stream << "result " << outcome.result << ", consumed " << outcome.consumed << ", \"" << outcome.output
                  << '"';
}

// Memory of exactly the sizes given, for the sanitizer to watch.
Outcome DecodeWhole(const std::string& stored, size_t room, const Memory& memory) {
    const std::vector<char> input(stored.begin() + kPropertiesSize, stored.end());
    std::vector<char> output(room);
    const Answer answer = DecodeBlock(stored.data(), input.data(), input.size(), output.data(), room, memory);
    return {answer.result, answer.consumed, std::string(output.data(), answer.produced)};
}

Outcome DecodeWhole(const std::string& stored, size_t room) {
    CountingMemory memory;
    return DecodeWhole(stored, room, memory);
}

Outcome DecodeStep(Stream& stream, const std::string& bytes, size_t room, Finish finish = kFinishAny) {
    const std::vector<char> input(bytes.begin(), bytes.end());
    std::vector<char> output(room);
    const Answer answer = stream.Decode(input.data(), input.size(), output.data(), room, finish);
    return {answer.result, answer.consumed, std::string(output.data(), answer.produced)};
}

// Text, runs and noise, of more than two dictionaries of 64 KiB.
std::string MakeLongText() {
    std::mt19937 random(7);
    std::string text;
    while (text.size() < 180'000) {
        text += "line " + std::to_string(random() % 1'000) + std::string(random() % 9, 'z') + "\n";
        if (random() % 50 == 0) text += std::string(400, static_cast<char>(random()));
        if (random() % 50 == 0)
            text += text.substr(text.size() - random() % std::min<size_t>(text.size(), 60'000), 300);
    }
    return text;
}

} // namespace

TEST(LzmaBlock, RoomAndEndMarkDecideTheAnswer) {
    struct Row {
        const char* name;
        std::string stored;
        size_t room;
        Outcome expected;
    };
    const Row kRows[] = {
        {"no mark, exact room", kBare, 24, {kMayBeEnded, 14, kPlain}},
        {"no mark, bytes behind", kBare + "!", 24, {kMayBeEnded, 14, kPlain}},
        {"no mark, small room", kBare, 10, {kRoomFilled, 13, kPlain.substr(0, 10)}},
        {"no mark, large room", kBare, 25, {kNeedsInput, 14, kPlain}},
        {"no mark, no room", kBare, 0, {kRoomFilled, 5, ""}},
        {"mark, exact room", kMarked, 24, {kRoomFilled, 14, kPlain}},
        {"mark, large room", kMarked, 99, {kEnded, 19, kPlain}},
        {"mark, bytes behind", kMarked + "!", 99, {kEnded, 19, kPlain}},
        {"first byte not 0", kBare.substr(0, 5) + "\1" + kBare.substr(6), 24, {kDamaged, 5, ""}},
        {"mark at the wrong code", kMarked.substr(0, 23) + "\1", 99, {kDamaged, 19, kPlain}},
        {"properties beyond all", "\xe1" + kBare.substr(1), 24, {kUnsupported, 0, ""}},
        {"fewer than 5 bytes", kBare.substr(0, 9), 0, {kNeedsInput, 0, ""}},
    };
    for (const Row& row : kRows)
        EXPECT_EQ(DecodeWhole(row.stored, row.room), row.expected) << row.name;
}

TEST(LzmaBlock, EveryTruncationNeedsInput) {
    size_t produced = 0;
    for (size_t size = kPropertiesSize; size < kMarked.size(); ++size) {
        const Outcome outcome = DecodeWhole(kMarked.substr(0, size), 99);
        EXPECT_EQ(outcome.result, kNeedsInput) << size;
        EXPECT_EQ(outcome.output, kPlain.substr(0, outcome.output.size())) << size;
        EXPECT_GE(outcome.output.size(), produced) << size;
        produced = outcome.output.size();
    }
    EXPECT_EQ(produced, kPlain.size());
}

// However a broken stream is cut into pieces, the same bytes come before the damage.
TEST(LzmaBlock, BytesBeforeDamageDoNotDependOnPieces) {
    const std::string plain = MakeLongText();
    const std::string stored = CompressLzma(plain, {.endMark = true});
    std::mt19937 random(3);
    for (int round = 0; round < 40; ++round) {
        SCOPED_TRACE(round);
        std::string broken = stored;
        broken[kPropertiesSize + 1 + random() % (broken.size() - 6)] ^= static_cast<char>(1 + random() % 255);
        const Outcome whole = DecodeWhole(broken, plain.size() + 1);
        CountingMemory memory;
        Stream stream(memory);
        ASSERT_EQ(stream.Start(broken.data(), kHistoryOwn), kRoomFilled);
        std::string output;
        size_t consumed = kPropertiesSize;
        Outcome step = {kRoomFilled, 0, ""};
        const auto isDone = [&] {
            const bool isWithoutInput = step.result == kNeedsInput && consumed == broken.size();
            return output.size() > plain.size() || step.result == kDamaged || step.result == kEnded || isWithoutInput;
        };
        while (!isDone()) {
            const size_t room = std::min<size_t>(1 + random() % 9'000, plain.size() + 1 - output.size());
            step = DecodeStep(stream, broken.substr(consumed, 1 + random() % 5'000), room);
            consumed += step.consumed;
            output += step.output;
        }
        EXPECT_EQ(whole.output, output);
    }
}

TEST(LzmaBlock, RefusedMemoryIsNotDamage) {
    CountingMemory none = {.grantsLeft = 0};
    EXPECT_EQ(DecodeWhole(kBare, 24, none), (Outcome{kNoMemory, 0, ""}));
    CountingMemory enough;
    EXPECT_EQ(DecodeWhole(kBare, 24, enough), (Outcome{kMayBeEnded, 14, kPlain}));
    EXPECT_EQ(enough.held, 0);
}

TEST(LzmaStream, KnownSizeIsHeldByFinish) {
    struct Row {
        const char* name;
        std::string stored;
        size_t room;
        Result result;
    };
    const Row kRows[] = {
        {"no mark", kBare, 24, kMayBeEnded},
        {"mark", kMarked, 24, kEnded},
        {"within a match", kBare, 20, kDamaged},
        {"before a literal", kBare, 3, kDamaged},
        {"cut mark", kMarked.substr(0, 22), 24, kNeedsInput},
    };
    CountingMemory memory;
    Stream stream(memory);
    for (const Row& row : kRows) {
        ASSERT_EQ(stream.Start(row.stored.data(), kHistoryOwn), kRoomFilled);
        EXPECT_EQ(DecodeStep(stream, row.stored.substr(5), row.room, kFinishHere).result, row.result) << row.name;
    }
}

TEST(LzmaStream, DamageLastsUntilItIsStartedAgain) {
    CountingMemory memory;
    Stream stream(memory);
    EXPECT_EQ(DecodeStep(stream, kBare.substr(5), 24).result, kDamaged); // never started
    ASSERT_EQ(stream.Start(kBare.data(), kHistoryOwn), kRoomFilled);
    EXPECT_EQ(DecodeStep(stream, "\1\2\3\4\5", 24), (Outcome{kDamaged, 5, ""}));
    EXPECT_EQ(DecodeStep(stream, kBare.substr(5), 24), (Outcome{kDamaged, 0, ""}));
    ASSERT_EQ(stream.Start(kBare.data(), kHistoryOwn), kRoomFilled);
    EXPECT_EQ(DecodeStep(stream, kBare.substr(5), 24), (Outcome{kMayBeEnded, 14, kPlain}));
}

TEST(LzmaStream, EndIsAnsweredAgain) {
    CountingMemory memory;
    Stream stream(memory);
    ASSERT_EQ(stream.Start(kMarked.data(), kHistoryOwn), kRoomFilled);
    EXPECT_EQ(DecodeStep(stream, kMarked.substr(5), 99), (Outcome{kEnded, 19, kPlain}));
    EXPECT_EQ(DecodeStep(stream, "more", 99), (Outcome{kEnded, 0, ""}));
}

// Each allocation refused in turn: the stream says so, holds nothing twice, and starts once there is memory.
TEST(LzmaStream, StartsOnceThereIsMemory) {
    for (int grants = 0; grants < 2; ++grants) {
        CountingMemory memory = {.grantsLeft = grants};
        {
            Stream stream(memory);
            EXPECT_EQ(stream.Start(kBare.data(), kHistoryOwn), kNoMemory) << grants;
            EXPECT_EQ(DecodeStep(stream, kBare.substr(5), 24).result, kDamaged) << grants;
            memory.grantsLeft = 2 - grants;
            EXPECT_EQ(stream.Start(kBare.data(), kHistoryOwn), kRoomFilled) << grants;
            EXPECT_EQ(DecodeStep(stream, kBare.substr(5), 24).output, kPlain) << grants;
            EXPECT_EQ(memory.held, 2) << grants;
        }
        EXPECT_EQ(memory.held, 0) << grants;
    }
}

TEST(LzmaStream, HistoryInOutputTakesNoDictionary) {
    CountingMemory memory;
    Stream stream(memory);
    ASSERT_EQ(stream.Start(kBare.data(), kHistoryInOutput), kRoomFilled);
    EXPECT_EQ(memory.held, 1);
}

// The dictionary is 4,096 bytes when less is named, and what lies further back is damage even where it is still there.
TEST(LzmaBlock, DistanceBeyondTheDictionaryIsDamage) {
    std::mt19937 random(5);
    std::string noise(4'200, '\0');
    std::generate(noise.begin(), noise.end(), std::ref(random));
    for (const size_t distance : {4'096u, 4'097u}) {
        const std::string plain = noise + noise.substr(noise.size() - distance, 60);
        std::string stored = CompressLzma(plain, {.level = 9, .dictionarySize = 65'536});
        stored.replace(1, 4, "\0\0\0\0"s);
        EXPECT_EQ(DecodeWhole(stored, plain.size()).result, distance == 4'096 ? kMayBeEnded : kDamaged) << distance;
    }
}

// Matches that reach nearly as far as the dictionary does, each of them followed by a byte that is not of the match:
// copies that write more than they should would spoil what the next one reads.
TEST(LzmaStream, RingHoldsTheWholeDictionary) {
    std::mt19937 random(9);
    std::string plain(40'000, '\0');
    for (size_t i = 0; i < plain.size(); ++i)
        plain[i] = i < 4'090 || i % 21 == 0 ? static_cast<char>(random()) : plain[i - 4'090];
    const std::string stored = CompressLzma(plain, {.level = 9, .dictionarySize = 4'096});
    CountingMemory memory;
    Stream stream(memory);
    ASSERT_EQ(stream.Start(stored.data(), kHistoryOwn), kRoomFilled);
    EXPECT_TRUE(DecodeStep(stream, stored.substr(kPropertiesSize), plain.size()).output == plain); // too long to print
}

// Damage can bring any code, also one that is not below the range, which no stream of random damage comes upon.
TEST(LzmaBits, TrialAndDecoderAgreeOnAnyCode) {
    std::mt19937 engine(3);
    const auto random = [&] { return static_cast<uint32_t>(engine()); };
    std::vector<Probability> table(kLiteralProbabilities);
    const uint8_t input[kLongestSymbol] = {0x00, 0xFF, 0x80, 0x7F, 0x01};
    for (int round = 0; round < 20'000; ++round) {
        for (Probability& probability : table)
            probability = static_cast<Probability>(31 + random() % 1'987);
        BitDecoder decoder;
        decoder.range = kLeastRange + random() % (0xFFFFFFFF - kLeastRange);
        decoder.code = round % 2 != 0 ? random() : decoder.range - 2 + random() % 5;
        decoder.in = input;
        TrialDecoder trial = {decoder.range, decoder.code, input, std::end(input), false};
        const int bits = 1 + static_cast<int>(random() % 26);
        const uint32_t match = random() % 256;
        // The trial first, as the decoder learns.
        const uint32_t direct = trial.DirectBits(2, bits);
        EXPECT_EQ(decoder.DirectBits(2, bits), direct) << round;
        const uint32_t align = trial.AlignTree(table.data());
        EXPECT_EQ(decoder.AlignTree(table.data()), align) << round;
        const uint32_t literal = trial.MatchedLiteral(table.data(), match);
        EXPECT_EQ(decoder.MatchedLiteral(table.data(), match), literal) << round;
        EXPECT_EQ(trial.range, decoder.range) << round;
        EXPECT_EQ(trial.code, decoder.code) << round;
    }
}
