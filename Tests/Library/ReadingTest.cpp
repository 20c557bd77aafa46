#include "Tests/Library/LibraryTest.h"
#include "Tests/Support/ArchiveBuilder.h"

#include <malloc.h>
#include <map>
#include <random>
#include <thread>

namespace {

// How a block is stored, and what its damage costs.
struct Form {
    const char* what;
    ArchiveDescription description;
};

// Every layout and kind, each holding text as one file, in blocks small enough for several and streams large enough to
// be read in pieces.
std::vector<Form> EveryForm(const std::string& text) {
    std::vector<Form> forms = {
        {"stored", {.chunkSize = 10'000}},
        {"LZ4", {.chunkSize = 10'000, .type = kCompressionLz4}},
        {"LZ4HC", {.chunkSize = 131'072, .type = kCompressionLz4HC}},
        {"LZMA", {.chunkSize = 10'000, .type = kCompressionLzma, .lzma = {.level = 1}}},
        {"LZMA with its end mark",
         {.chunkSize = 10'000, .type = kCompressionLzma, .lzma = {.endMark = true, .level = 1}}},
        {"LZMA, small streams",
         {.chunkSize = 10'000, .type = kCompressionLzma, .streamed = true, .lzma = {.level = 1}}},
        {"LZMA, one stream", {.chunkSize = 0, .type = kCompressionLzma, .streamed = true, .lzma = {.level = 1}}},
        {"web", {.layout = ArchiveLayout::kWeb}},
        {"raw", {.layout = ArchiveLayout::kRaw}},
        {"old", {.layout = ArchiveLayout::kArchive, .chunkSize = 10'000, .type = kCompressionLz4}},
    };
    for (Form& form : forms)
        form.description.entries = {{.path = "a"}, {.path = "text", .bytes = text}, {.path = "z", .bytes = "end"}};
    return forms;
}

constexpr uint64_t kTextEntry = 1;

// An archive with one block of text, stored as the test says.
std::string ArchiveOfOneBlock(const std::string& text, CompressionType type, bool isStreamed,
                              std::optional<std::string> stored = {}) {
    return BuildArchive({.entries = {{.path = "text", .bytes = text}},
                         .blocks = {{.size = text.size(), .type = type, .streamed = isStreamed, .stored = stored}}})
        .bytes;
}

// All that a stream delivers, and what ended it.
Delivered ReadInPieces(zarvo::archive& archive, uint64_t index, size_t size) {
    zarvo::stream stream = *archive.open_stream(index);
    Delivered all;
    for (Delivered piece; all.code == ZARVO_OK; all.code = piece.code) {
        piece = ReadNext(stream, size);
        if (piece.bytes.empty() && piece.code == ZARVO_OK) break;
        all.bytes += piece.bytes;
    }
    return all;
}

uint64_t Readable(zarvo::archive& archive, uint64_t index) { return *archive.readable(index); }

} // namespace

TEST(Reading, AnyRangeIsTheSameRangeOfTheText) {
    const std::string text = SampleText(1'500'000);
    for (const Form& form : EveryForm(text)) {
        SCOPED_TRACE(form.what);
        const std::string bytes = BuildArchive(form.description).bytes;
        zarvo::archive archive = OpenBytes(bytes);
        EXPECT_EQ(Delivered{text}, Read(archive, kTextEntry, 0, text.size()));
        std::mt19937 random(11);
        for (int round = 0; round < 20; ++round) {
            const size_t from = random() % text.size();
            const size_t size = random() % 40'000;
            SCOPED_TRACE(from);
            ASSERT_EQ(Delivered{text.substr(from, size)}, Read(archive, kTextEntry, from, size));
        }
        EXPECT_EQ(Delivered{""}, Read(archive, kTextEntry, text.size(), 10));
        EXPECT_EQ(Delivered{""}, Read(archive, kTextEntry, UINT64_MAX, 10));
        EXPECT_EQ(Delivered{text.substr(text.size() - 5)}, Read(archive, kTextEntry, text.size() - 5, 10));
        EXPECT_EQ(text.size(), Readable(archive, kTextEntry));
    }
}

TEST(Reading, StreamGoesOnAndSeeks) {
    const std::string text = SampleText(1'500'000);
    for (const Form& form : EveryForm(text)) {
        SCOPED_TRACE(form.what);
        const std::string bytes = BuildArchive(form.description).bytes;
        zarvo::archive archive = OpenBytes(bytes);
        EXPECT_EQ(Delivered{text}, ReadInPieces(archive, kTextEntry, 70'000));
        zarvo::stream stream = *archive.open_stream(kTextEntry);
        stream.seek(1'000'003);
        EXPECT_EQ(Delivered{text.substr(1'000'003, 50)}, ReadNext(stream, 50));
        EXPECT_EQ(Delivered{text.substr(1'000'053, 50)}, ReadNext(stream, 50));
        stream.seek(7);
        EXPECT_EQ(Delivered{text.substr(7, 50)}, ReadNext(stream, 50));
    }
}

// Two files of two blocks that are read in turns, in small pieces, cost one reading of each block.
TEST(Reading, FilesReadInTurnsShareTheCache) {
    const std::string text = SampleText(131'072);
    for (const bool isStreamed : {false, true}) {
        SCOPED_TRACE(isStreamed ? "streamed" : "whole");
        auto source = std::make_unique<CountingSource>(
            BuildArchive({.entries = {{.path = "a", .bytes = text}, {.path = "b", .bytes = text}},
                          .chunkSize = 131'072,
                          .type = isStreamed ? kCompressionLzma : kCompressionLz4HC,
                          .streamed = isStreamed})
                .bytes);
        CountingSource& counts = *source;
        zarvo::archive archive = *zarvo::archive::open(std::move(source));
        counts.bytesRead = 0;
        for (size_t from = 0; from < text.size(); from += 4'096)
            for (const uint64_t file : {uint64_t{0}, uint64_t{1}})
                ASSERT_EQ(Delivered{text.substr(from, 4'096)}, Read(archive, file, from, 4'096));
        EXPECT_LE(counts.bytesRead.load(), archive.info().stored_size);
    }
}

// One file of a large archive costs the directory, and the stored bytes of its own blocks.
TEST(Reading, OneFileCostsItsOwnBlocks) {
    const std::string text = SampleText(30'000);
    ArchiveDescription description{.chunkSize = 50'000, .type = kCompressionLz4};
    for (int number = 0; number < 300; ++number)
        description.entries.push_back({.path = std::to_string(number), .bytes = text});
    const BuiltArchive built = BuildArchive(description);
    constexpr uint64_t kReadAhead = 16'384; // of whoever parses the directory
    auto source = std::make_unique<CountingSource>(built.bytes);
    CountingSource& counts = *source;
    zarvo::archive archive = *zarvo::archive::open(std::move(source));
    EXPECT_LE(counts.bytesRead.load(), 2 * (built.dataOffset + kReadAhead));
    counts.bytesRead = 0;
    EXPECT_EQ(Delivered{text}, Read(archive, 151, 0, text.size()));
    // The file lies across the border of two blocks.
    EXPECT_EQ(archive.block(90).stored_size + archive.block(91).stored_size, counts.bytesRead.load());
}

// However many streams are open in one large block, each goes on where it was.
TEST(Reading, OpenStreamsKeepTheirPlaces) {
    const std::string text = SampleText(3'000'000);
    auto source = std::make_unique<CountingSource>(ArchiveOfOneBlock(text, kCompressionLzma, true));
    CountingSource& counts = *source;
    zarvo::archive archive = *zarvo::archive::open(std::move(source), {.cache_bytes = 1});
    std::vector<zarvo::stream> streams;
    for (int number = 0; number < 20; ++number)
        streams.push_back(*archive.open_stream(0));
    counts.bytesRead = 0;
    for (size_t from = 0; from < text.size(); from += 100'000)
        for (zarvo::stream& stream : streams)
            ASSERT_EQ(Delivered{text.substr(from, 100'000)}, ReadNext(stream, 100'000));
    EXPECT_LE(counts.bytesRead.load(), streams.size() * archive.info().stored_size);
}

// Properties that ask for 6 MB of decoder state count as what they cost.
TEST(Reading, IdleStreamsStayInsideTheCache) {
    const std::string text = SampleText(3'000'000);
    constexpr char kLargestTables = 44; // 8 literal context bits, 4 literal position bits
    const std::string bytes =
        ArchiveOfOneBlock(text, kCompressionLzma, true, kLargestTables + CompressLzma(text).substr(1));
    zarvo::archive archive = OpenBytes(bytes, {.cache_bytes = 1'000'000});
    const auto usedMemory = [] {
        const struct mallinfo2 info = mallinfo2();
        return info.uordblks + info.hblkhd;
    };
    const size_t before = usedMemory();
    {
        std::vector<zarvo::stream> streams;
        for (int number = 0; number < 10; ++number) {
            streams.push_back(*archive.open_stream(0));
            (void)ReadNext(streams.back(), 1); // damaged, but the state has been made
        }
    }
    EXPECT_LE(usedMemory(), before + 10'000'000);
}

TEST(Reading, ThreadsReadOneArchiveAtOnce) {
    const std::string text = SampleText(1'500'000);
    for (const Form& form : EveryForm(text)) {
        SCOPED_TRACE(form.what);
        const std::string bytes = BuildArchive(form.description).bytes;
        zarvo::archive archive = OpenBytes(bytes, {.cache_bytes = 50'000});
        std::atomic<int> wrong = 0;
        std::vector<std::thread> threads;
        for (unsigned number = 0; number < 4; ++number)
            threads.emplace_back([&, number] {
                std::mt19937 random(number);
                for (int round = 0; round < 15; ++round) {
                    const size_t from = random() % text.size();
                    const size_t size = random() % 20'000;
                    if (Read(archive, kTextEntry, from, size) != Delivered{text.substr(from, size)}) ++wrong;
                    if (!archive.find("text")) ++wrong;
                }
            });
        for (std::thread& thread : threads)
            thread.join();
        EXPECT_EQ(0, wrong.load());
    }
}

// What can be read of a damaged block does not depend on how it is asked for, and everything before the damage can.
TEST(Reading, DamageIsWhereNoDecoderDelivers) {
    const std::string text = SampleText(2'000'000);
    const std::string lzma = CompressLzma(text);
    const std::string lz4 = CompressLz4(text);
    const struct {
        const char* what;
        CompressionType type;
        bool isStreamed;
        std::string stored;
        size_t atLeast; // of the text can be read
        size_t atMost;
    } cases[] = {
        {"cut LZMA", kCompressionLzma, false, lzma.substr(0, lzma.size() / 2), 900'000, 1'100'000},
        {"cut LZMA stream", kCompressionLzma, true, lzma.substr(0, lzma.size() / 2), 900'000, 1'100'000},
        {"cut LZ4", kCompressionLz4, false, lz4.substr(0, lz4.size() / 2), 900'000, 1'100'000},
        {"cut LZMA properties", kCompressionLzma, false, lzma.substr(0, 3), 0, 0},
        {"impossible LZMA properties", kCompressionLzma, true, "\xFF" + lzma.substr(1), 0, 0},
        {"streamed LZ4", kCompressionLz4, true, lz4, 0, 0},
        {"LZMA that ends early", kCompressionLzma, false, CompressLzma(text.substr(0, 1'234'567), {.endMark = true}),
         1'234'567, 1'234'567},
        {"LZ4 that ends early", kCompressionLz4, false, CompressLz4(text.substr(0, 1'234'567)), 1'234'567, 1'234'567},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.what);
        const std::string bytes = ArchiveOfOneBlock(text, row.type, row.isStreamed, row.stored);
        zarvo::archive archive = OpenBytes(bytes);
        const uint64_t readable = Readable(archive, 0);
        EXPECT_GE(readable, row.atLeast);
        EXPECT_LE(readable, row.atMost);
        const Delivered expected{text.substr(0, readable), ZARVO_ERROR_DAMAGED};
        EXPECT_EQ(expected, Read(archive, 0, 0, text.size()));
        EXPECT_EQ(expected, ReadInPieces(archive, 0, 10'007));
        std::string block(text.size(), '?');
        const zarvo::read_result whole = archive.read_block(0, std::as_writable_bytes(std::span(block)));
        EXPECT_EQ(expected, (Delivered{block.substr(0, whole.count), whole.error.code()}));
    }
}

// A file that was cut gives what its blocks still hold; entries before the cut are whole.
TEST(Reading, CutFileGivesWhatIsThere) {
    const std::string text = SampleText(100'000);
    for (const CompressionType type : {kCompressionNone, kCompressionLz4, kCompressionLzma}) {
        SCOPED_TRACE(type);
        const BuiltArchive built =
            BuildArchive({.entries = {{.path = "first", .bytes = text}, {.path = "second", .bytes = text}},
                          .chunkSize = 10'000,
                          .type = type});
        const size_t dataSize = built.bytes.size() - built.dataOffset;
        const std::string cut = built.bytes.substr(0, built.dataOffset + dataSize * 3 / 4);
        zarvo::archive archive = OpenBytes(cut);
        EXPECT_EQ(Delivered{text}, Read(archive, 0, 0, text.size()));
        const uint64_t readable = Readable(archive, 1);
        EXPECT_GE(readable, 40'000u);
        EXPECT_LE(readable, 60'000u);
        EXPECT_EQ((Delivered{text.substr(0, readable), ZARVO_ERROR_DAMAGED}), Read(archive, 1, 0, text.size()));
    }
}

TEST(Reading, EntryOutsideTheDataIsDamagedWhereItLeavesIt) {
    const std::string text = "0123456789";
    const struct {
        const char* what;
        uint64_t offset;
        uint64_t size;
        Delivered delivered;
    } cases[] = {
        {"past the end", 10, 1, {"", ZARVO_ERROR_DAMAGED}},
        {"across the end", 4, 20, {"456789", ZARVO_ERROR_DAMAGED}},
        {"far away", UINT64_MAX - 2, 20, {"", ZARVO_ERROR_DAMAGED}},
        {"of no bytes", 99, 0, {"", ZARVO_OK}},
        {"of all there are", 0, UINT64_MAX, {"0123456789", ZARVO_ERROR_DAMAGED}},
    };
    for (const auto& row : cases) {
        const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = text}},
                                                .fields = {{"node[0].offset", row.offset}, {"node[0].size", row.size}}})
                                      .bytes;
        zarvo::archive archive = OpenBytes(bytes);
        EXPECT_EQ(row.delivered, Read(archive, 0, 0, 100)) << row.what;
        EXPECT_EQ(row.delivered.bytes.size(), Readable(archive, 0)) << row.what;
    }
}

TEST(Reading, UnknownKindIsSaidOnceAndRefused) {
    const std::string bytes =
        BuildArchive({.entries = {{.path = "a", .bytes = "0123456789"}, {.path = "b", .bytes = "0123456789"}},
                      .blocks = {{.size = 10, .type = static_cast<CompressionType>(7), .stored = "01234567"},
                                 {.size = 10, .type = static_cast<CompressionType>(7), .stored = "01234567"}}})
            .bytes;
    std::vector<std::string> messages;
    zarvo::archive archive =
        OpenBytes(bytes, {.log = [&](std::string_view message) { messages.emplace_back(message); }});
    EXPECT_EQ((Delivered{"", ZARVO_ERROR_UNSUPPORTED}), Read(archive, 0, 0, 10));
    EXPECT_EQ((Delivered{"", ZARVO_ERROR_UNSUPPORTED}), Read(archive, 1, 2, 3));
    EXPECT_EQ((std::vector<std::string>{"Decompressing this format (7) is not supported on this platform."}), messages);
    EXPECT_EQ(2u, archive.info().blocks_unknown);
}

// What can be decoded piece by piece needs no memory for the whole. What is small when it is decoded may be large as it
// is stored.
TEST(Reading, BlockAboveTheLimitIsStreamedOrRefused) {
    const std::string text = SampleText(300'000);
    const std::string refusal = "block 0 of 300000 bytes is too large to be held in memory";
    const struct {
        const char* what;
        ArchiveBlock block;
        std::string error = {};
    } cases[] = {
        {.what = "stored", .block = {.size = 300'000}},
        {.what = "LZMA", .block = {.size = 300'000, .type = kCompressionLzma}},
        {.what = "LZMA stream", .block = {.size = 300'000, .type = kCompressionLzma, .streamed = true}},
        {.what = "LZ4", .block = {.size = 300'000, .type = kCompressionLz4}, .error = refusal},
        {.what = "small LZ4 of many bytes",
         .block = {.size = 4, .type = kCompressionLz4, .stored = std::string(300'000, 'x')},
         .error = refusal},
    };
    for (const auto& row : cases) {
        SCOPED_TRACE(row.what);
        const std::string expected = row.error.empty() ? text.substr(0, row.block.size) : "";
        const std::string bytes =
            BuildArchive({.entries = {{.path = "a", .bytes = text.substr(0, row.block.size)}}, .blocks = {row.block}})
                .bytes;
        zarvo::archive archive = OpenBytes(bytes, {.max_block_bytes = 299'999});
        for (const size_t size : {size_t{1}, text.size()}) {
            std::string got(size, '?');
            const zarvo::read_result read = archive.read(0, 0, std::as_writable_bytes(std::span(got)));
            EXPECT_EQ(row.error, read.error.text());
            EXPECT_EQ(Delivered{expected.substr(0, size)}, Delivered{got.substr(0, read.count)});
        }
    }
}

// Of files that are stored as they are, only the bytes of the pages that can't be read are lost.
TEST(Reading, BadPagesOfStoredDataLoseTheirBytesAlone) {
    const std::string text = SampleText(200'000);
    ArchiveDescription description{.layout = ArchiveLayout::kRaw};
    for (size_t from = 0; from < text.size(); from += 1'000)
        description.entries.push_back({.path = std::to_string(from), .bytes = text.substr(from, 1'000)});
    const std::string bytes = BuildArchive(description).bytes;
    const size_t textOffset = bytes.find(text);
    ASSERT_NE(std::string::npos, textOffset);
    const std::vector<size_t> bad = {12, 20, 21, 22, 40};
    for (const bool isExact : {false, true}) {
        SCOPED_TRACE(isExact);
        zarvo::archive archive = *zarvo::archive::open(std::make_unique<DamagedMedium>(bytes, bad, isExact));
        std::map<uint64_t, uint64_t> expected, tested;
        for (const zarvo::entry entry : archive.entries()) {
            const size_t begin = textOffset + entry.index() * 1'000, end = begin + entry.size();
            size_t readable = end;
            for (const size_t page : bad)
                if (begin < (page + 1) * 4'096 && end > page * 4'096)
                    readable = std::min(readable, std::max(begin, page * 4'096));
            if (readable != end) expected[entry.index()] = readable - begin;
            const Delivered delivered = {text.substr(entry.index() * 1'000, readable - begin),
                                         readable == end ? ZARVO_OK : ZARVO_ERROR_SYSTEM};
            EXPECT_EQ(delivered, Read(archive, entry.index(), 0, 1'000)) << entry.path();
        }
        zarvo::test_options test;
        test.entry = [&](uint64_t index, uint64_t readable) { tested[index] = readable; };
        std::string said;
        test.block = [&](uint64_t, std::string_view why) { said += why; };
        EXPECT_EQ(ZARVO_OK, archive.test({}, test).error.code());
        EXPECT_EQ(expected, tested);
        EXPECT_EQ("Input/output error: block 0", said);
        std::map<uint64_t, std::string> visited;
        zarvo::visit_options visit;
        visit.bytes = [&](uint64_t index, uint64_t, std::span<const std::byte> piece) {
            visited[index].append(reinterpret_cast<const char*>(piece.data()), piece.size());
        };
        EXPECT_EQ(expected.size(), archive.visit({.threads = 1}, visit).summary.failures);
        for (const auto& [index, readable] : expected)
            EXPECT_EQ(text.substr(index * 1'000, readable), visited[index]) << index;
    }
}

// Of a compressed block, what the bytes before a bad page give can be read, in whatever way.
TEST(Reading, BadPagesOfCompressedBlocksLeaveWhatIsBefore) {
    std::mt19937 random(3);
    std::string text(400'000, '?');
    for (char& letter : text)
        letter = static_cast<char>('a' + random() % 8);
    for (const Form& form : EveryForm(text)) {
        if (form.description.type == kCompressionNone) continue; // "web" keeps its directory in front of the page
        SCOPED_TRACE(form.what);
        const std::string bytes = BuildArchive(form.description).bytes;
        zarvo::archive archive =
            *zarvo::archive::open(std::make_unique<DamagedMedium>(bytes, std::vector<size_t>{10}, false));
        const Delivered whole = Read(archive, kTextEntry, 0, text.size());
        EXPECT_EQ(ZARVO_ERROR_SYSTEM, whole.code);
        EXPECT_LT(30'000u, whole.bytes.size());
        EXPECT_EQ(text.substr(0, whole.bytes.size()), whole.bytes);

        EXPECT_EQ(whole, ReadInPieces(archive, kTextEntry, 777));
        uint64_t tested = 0;
        zarvo::test_options test;
        test.entry = [&](uint64_t index, uint64_t readable) {
            if (index == kTextEntry) tested = readable;
        };
        EXPECT_EQ(ZARVO_OK, archive.test({}, test).error.code());
        EXPECT_EQ(whole.bytes.size(), tested);
    }
}

// Blocks without bytes are stepped over in one go.
TEST(Reading, EmptyBlocksCostNothing) {
    std::vector<ArchiveBlock> blocks(10'000, ArchiveBlock{.size = 0});
    blocks.front().size = 5;
    blocks.back().size = 5;
    const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = "0123456789"}}, .blocks = blocks}).bytes;
    zarvo::archive archive = OpenBytes(bytes);
    EXPECT_EQ(Delivered{"23456"}, Read(archive, 0, 2, 5));
    EXPECT_EQ(ZARVO_OK, archive.read_block(1, {}).error.code());
}
