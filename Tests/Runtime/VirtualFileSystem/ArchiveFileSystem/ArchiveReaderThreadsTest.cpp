// One reader, many threads. What must happen at the same time is held together by a gate in the file, never by timing.
#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"

#include "Runtime/VirtualFileSystem/MemoryFileSystem/SingleBlockMemoryFileData.h"
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/TemporaryFolder.h"

#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <random>
#include <thread>

using Access = ArchiveStorageReaderTestAccess;

namespace {

template <typename Work>
void RunThreads(int count, Work work) {
    std::vector<std::thread> threads;
    for (int index = 0; index < count; ++index)
        threads.emplace_back([&work, index] { work(index); });
    for (std::thread& thread : threads)
        thread.join();
}

// Gives up, and fails the test, after a minute.
template <typename Condition>
void WaitUntil(Condition condition) {
    int tries = 60'000;
    while (!condition() && --tries != 0)
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    EXPECT_NE(0, tries);
}

// Holds the reads of stored bytes while it is shut.
class Gate {
public:
    void Shut() {
        std::lock_guard lock(m_Mutex);
        m_IsShut = true;
        passed = 0;
    }
    // The next reads fail.
    void Open(int failures = 0) {
        std::lock_guard lock(m_Mutex);
        m_IsShut = false;
        m_Failures = failures;
        m_Opened.notify_all();
    }
    bool Pass() {
        std::unique_lock lock(m_Mutex);
        isReached = true;
        m_Opened.wait(lock, [this] { return !m_IsShut; });
        ++passed;
        return m_Failures-- <= 0 && (failsEvery == 0 || passed % failsEvery != 0);
    }

    std::atomic<bool> isReached = false; // since it was last set to false, by somebody
    std::atomic<int> passed = 0;         // since it was shut
    int failsEvery = 0;                  // one in so many reads fails; 0: none

private:
    std::mutex m_Mutex;
    std::condition_variable m_Opened;
    bool m_IsShut = false;
    int m_Failures = 0;
};

class GatedFile : public MemoryFile {
public:
    GatedFile(MemoryFileData* contents, Gate& gate)
        : MemoryFile(kMemLabelGeneral, contents, kFilePermissionRead), m_Gate(gate) {}
    using MemoryFile::Read;
    bool Read(VFS::FileSize from, UInt64 size, void* out, UInt64* actual, FileReadFlags flags) override {
        return m_Gate.Pass() && MemoryFile::Read(from, size, out, actual, flags);
    }

private:
    Gate& m_Gate;
};

constexpr UInt64 kBlockSize = 20'000;
constexpr UInt64 kGatedSize = 13 * kBlockSize;

// Bytes that do not compress, in thirteen blocks of one kind or in one, behind a gate.
struct GatedArchive {
    GatedArchive(CompressionType type, bool isStreamed, UInt64 chunkSize = kBlockSize)
        : opened(BuildArchive({.entries = {{.path = "a", .bytes = MakeBytes()}},
                               .chunkSize = chunkSize,
                               .type = type,
                               .streamed = isStreamed}),
                 [this](std::string& bytes) {
                     auto* contents = New<SingleBlockMemoryFileData>(kMemLabelGeneral, kMemLabelGeneral, bytes.data(),
                                                                     bytes.size(), false);
                     auto* file = New<GatedFile>(kMemLabelGeneral, contents, gate);
                     contents->Release();
                     FileEntryData data;
                     data.accessorHandler = New<IFileAdapter>(kMemLabelGeneral, file, kMemLabelGeneral, true);
                     return FileSystemEntry(data);
                 }) {}

    static std::string MakeBytes() {
        std::mt19937 random(1);
        std::string bytes(kGatedSize, '\0');
        std::generate(bytes.begin(), bytes.end(), [&] { return static_cast<char>(random()); });
        return bytes;
    }

    // Has threads that read parts of blocks at once: block firstBlock + n x stride is the n-th's. The first is inside
    // its fill before the others start; the gate opens once all of them use a record. How many were refused.
    int ReadAtOnce(int threads, UInt64 firstBlock, UInt64 stride, int failures) {
        ConsoleCapture console;
        gate.Shut();
        gate.isReached = false;
        std::atomic<int> refused = 0;
        auto read = [&](int index) {
            if (index != 0) WaitUntil([&] { return gate.isReached.load(); });
            const UInt64 from = (firstBlock + static_cast<UInt64>(index) * stride) * kBlockSize + 1;
            const std::string got = opened.Read(from, kBlockSize - 2);
            if (got == "refused")
                ++refused;
            else
                EXPECT_EQ(opened.built.stream.substr(from, kBlockSize - 2), got) << from;
        };
        std::thread all([&] { RunThreads(threads, read); });
        WaitUntil([&] { return Access::CountUses(opened.reader).total == threads; });
        usesAtOnce = Access::CountUses(opened.reader).most;
        Access::EmptyCache(opened.reader); // frees none of these
        gate.Open(failures);
        all.join();
        EXPECT_TRUE(Access::IsCacheIdle(opened.reader));
        EXPECT_EQ("", console.Text());
        return refused;
    }

    Gate gate;
    OpenedArchive opened;
    SInt32 usesAtOnce = 0; // of the record that most threads used
};

} // namespace

TEST(ArchiveReaderThreads, TheCacheHasARecordForEachUseThatCantShareOne) {
    const struct {
        const char* name;
        CompressionType type;
        bool isStreamed;
        UInt64 stride; // 0: all read the same block
    } kRows[] = {
        {"one LZ4 chunk", kCompressionLz4, false, 0}, {"one LZMA chunk", kCompressionLzma, false, 0},
        {"a chunk each", kCompressionLz4, false, 1},  {"one stream", kCompressionLzma, true, 0},
        {"a stream each", kCompressionLzma, true, 1},
    };
    for (const auto& row : kRows) {
        for (int threads : {1, 2, 6}) {
            SCOPED_TRACE(testing::Message() << row.name << ", " << threads << " threads");
            GatedArchive archive(row.type, row.isStreamed);
            const bool isShared = row.stride == 0 && !row.isStreamed;
            const int records = isShared ? 1 : threads;
            for (UInt64 firstBlock : {0u, 6u, 0u}) {
                ASSERT_EQ(0, archive.ReadAtOnce(threads, firstBlock, row.stride, 0));
                ASSERT_EQ(isShared ? threads : 1, archive.usesAtOnce);
                EXPECT_EQ(records, archive.gate.passed) << "fills"; // every stored byte is read by one thread
                EXPECT_EQ(static_cast<size_t>(records), Access::CachedBlockCount(archive.opened.reader));
                archive.opened.Read(12 * kBlockSize, 1); // makes one record forget its block, and needs no other
            }
        }
    }
}

TEST(ArchiveReaderThreads, AFillThatFailsFailsItsOwnThreadAndTheOthersFillAnew) {
    for (bool isStreamed : {false, true}) {
        for (int failures : {1, 2, 4}) {
            SCOPED_TRACE(testing::Message() << (isStreamed ? "streamed, " : "chunk, ") << failures << " failures");
            GatedArchive archive(kCompressionLzma, isStreamed);
            ASSERT_EQ(failures, archive.ReadAtOnce(4, 0, 0, failures));
            EXPECT_EQ(4, archive.gate.passed);
            EXPECT_LE(Access::CachedBlockCount(archive.opened.reader), 4u);
            EXPECT_EQ(archive.opened.built.stream.substr(5, 10), archive.opened.Read(5, 10));
        }
    }
}

TEST(ArchiveReaderThreads, ReadsThatFailNowAndThenSpoilNothing) {
    constexpr int kThreads = 8;
    for (bool isStreamed : {false, true}) {
        GatedArchive archive(kCompressionLzma, isStreamed, isStreamed ? 0 : kBlockSize);
        archive.gate.failsEvery = 5;
        std::atomic<int> whole = 0, failed = 0;
        RunThreads(kThreads, [&](int self) {
            std::mt19937 random(static_cast<unsigned>(self));
            for (int count = 0; count < 50; ++count) {
                const UInt64 from = random() % kGatedSize;
                const UInt64 size = std::min<UInt64>(1 + random() % kBlockSize, kGatedSize - from);
                const std::string got = archive.opened.Read(from, size);
                ++(got.size() == size && got != "refused" ? whole : failed);
                if (got != "refused") {
                    EXPECT_EQ(archive.opened.built.stream.substr(from, got.size()), got) << from;
                }
            }
        });
        EXPECT_NE(0, whole);
        EXPECT_NE(0, failed);
        EXPECT_TRUE(Access::IsCacheIdle(archive.opened.reader));
        EXPECT_LE(Access::CachedBlockCount(archive.opened.reader), size_t{kThreads});
        archive.gate.failsEvery = 0;
        EXPECT_EQ(archive.opened.built.stream, archive.opened.Read(0, kGatedSize));
    }
}

TEST(ArchiveReaderThreads, ADecompressorIsMadeOnce) {
    constexpr int kRounds = 1'000;
    std::vector<std::unique_ptr<ArchiveStorageReader>> readers(kRounds);
    for (auto& reader : readers)
        reader = std::make_unique<ArchiveStorageReader>(kMemLabelFileSystem);
    std::vector<const IDecompressor*> made[2];
    for (auto& each : made)
        each.resize(kRounds);
    std::atomic<int> arrived = 0;
    RunThreads(2, [&](int self) {
        for (int round = 0; round < kRounds; ++round) {
            ++arrived;
            while (arrived < 2 * (round + 1)) // not asleep: both are to go on at once
                std::this_thread::yield();
            const auto index = static_cast<size_t>(round);
            made[self][index] = Access::GetDecompressor(*readers[index], kCompressionLzma);
        }
    });
    EXPECT_EQ(made[0], made[1]);
}

namespace {

constexpr UInt64 kMixedSize = 1'100'000;
constexpr UInt64 kDamagedStart = 605'538, kDamagedEnd = 805'538; // a stream that delivers wrong bytes before it fails

// Blocks of every kind, whole and broken.
BuiltArchive BuildMixedArchive() {
    ArchiveDescription description;
    description.entries = {{.path = "a", .bytes = SampleText(kMixedSize)}};
    UInt64 start = 0;
    auto add = [&](UInt64 size, CompressionType type, bool isStreamed) {
        const std::string_view bytes = std::string_view(description.entries[0].bytes).substr(start, size);
        description.blocks.push_back(
            {.size = size, .type = type, .streamed = isStreamed, .stored = Compress(type, bytes)});
        start += size;
    };
    auto cut = [&] { description.blocks.back().stored->resize(description.blocks.back().stored->size() / 2); };
    add(60'000, kCompressionLz4, false);
    add(65'537, kCompressionLzma, false);
    add(200'000, kCompressionLzma, true);
    add(50'000, kCompressionNone, false);
    add(40'000, kCompressionLz4, false);
    cut();
    add(40'000, kCompressionLzma, false);
    cut();
    add(1, kCompressionLz4HC, false);
    add(150'000, kCompressionLzma, true);
    cut();
    EXPECT_EQ(kDamagedStart, start);
    add(200'000, kCompressionLzma, true);
    EXPECT_EQ(kDamagedEnd, start);
    std::string& damaged = *description.blocks.back().stored;
    std::fill(damaged.begin() + static_cast<ptrdiff_t>(damaged.size() * 2 / 3), damaged.end(), '\xA5');
    add(80'000, kCompressionLz4HC, false);
    add(65'536, kCompressionLzma, true);
    add(kMixedSize - start, kCompressionLzma, false);
    return BuildArchive(description);
}

struct StressCounts {
    std::atomic<UInt64> reads = 0, bytes = 0, refused = 0, shortened = 0;
    std::atomic<bool> hasFailed = false;
};

// Random ranges, half of them from the first blocks, until so many bytes have been compared with the source. A reader
// of the thread's own says how the same call ends where nobody else reads.
void ReadRandomly(ArchiveStorageReader& reader, const std::string& path, const std::string& source, unsigned seed,
                  UInt64 bytes, StressCounts& counts) {
    ArchiveStorageReader alone(kMemLabelFileSystem);
    ASSERT_EQ(0, alone.Initialize(core::string(path.c_str()), 0));
    std::mt19937 random(seed);
    std::string got(131'072, '\0'), gotAlone = got;
    for (UInt64 compared = 0; compared < bytes && !counts.hasFailed; ++counts.reads) {
        const UInt64 from = random() % (random() % 2 == 0 ? kMixedSize : 400'000);
        const UInt64 size = std::min<UInt64>(1 + random() % (1u << random() % 18), kMixedSize - from);
        const auto flags = static_cast<FileReadFlags>(random() % 2);
        UInt64 count = 0, countAlone = 0;
        const bool isReadAlone = alone.Read(from, size, gotAlone.data(), &countAlone, flags);
        EXPECT_TRUE(reader.MakeStorageUsed(true));
        const bool isRead = reader.Read(from, size, got.data(), &count, flags);
        reader.MakeStorageUnused();
        const bool isOfSource = from >= kDamagedEnd || from + count <= kDamagedStart;
        const char* const expected = isOfSource ? source.data() + from : gotAlone.data();
        if (isRead != isReadAlone || count != countAlone || memcmp(got.data(), expected, count) != 0) {
            counts.hasFailed = true;
            ADD_FAILURE() << "seed " << seed << ", read " << counts.reads << ": " << size << " bytes from " << from
                          << ", flags " << flags << ": " << isRead << ' ' << count << ", alone " << isReadAlone << ' '
                          << countAlone;
        }
        compared += count;
        counts.bytes += count;
        counts.refused += !isRead;
        counts.shortened += isRead && count < size;
    }
}

} // namespace

// VARNEX_STRESS_SECONDS makes it go on for so long, with other seeds, and say what it has done.
TEST(ArchiveReaderThreads, RandomReadsOfAMixedArchiveEndAsTheyDoForOneThread) {
    constexpr int kThreads = 8;
    TemporaryFolder folder;
    const std::string path = folder / "mixed";
    const BuiltArchive built = BuildMixedArchive();
    WriteFile(path, built.bytes);
    const char* const asked = getenv("VARNEX_STRESS_SECONDS");
    const auto end = std::chrono::steady_clock::now() + std::chrono::seconds(asked != nullptr ? atoi(asked) : 0);
    StressCounts counts;
    ConsoleCapture console;
    unsigned seed = 1;
    do
        // Whether the file stays open throughout, or is closed whenever nobody is inside.
        for (bool staysOpen : {true, false}) {
            ArchiveStorageReader reader(kMemLabelFileSystem);
            ASSERT_EQ(0, reader.Initialize(core::string(path.c_str()), 0));
            if (!staysOpen) reader.MakeStorageUnused();
            RunThreads(kThreads, [&](int index) {
                ReadRandomly(reader, path, built.stream, seed + static_cast<unsigned>(index), 1'000'000, counts);
            });
            seed += kThreads;
            EXPECT_TRUE(Access::IsCacheIdle(reader));
            EXPECT_LE(Access::CachedBlockCount(reader), staysOpen ? size_t{kThreads} : 0u);
        }
    while (std::chrono::steady_clock::now() < end && !HasFailure());
    EXPECT_EQ("", console.Text());
    EXPECT_NE(0u, counts.refused);
    EXPECT_NE(0u, counts.shortened);
    if (asked == nullptr) return;
    printf("seeds 1 to %u: %llu reads, of which %llu refused and %llu shortened, %llu bytes compared\n", seed - 1,
           counts.reads.load(), counts.refused.load(), counts.shortened.load(), counts.bytes.load());
}
