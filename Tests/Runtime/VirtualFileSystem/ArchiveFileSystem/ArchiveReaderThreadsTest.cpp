// One reader, many threads. What must happen at the same time is held together by a disk that is shut, never by timing.
#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"
#include "Tests/Support/MutexInspector.h"

#include <thread>

// Threads read a part of a block at once, all of the same or each of its own, and the first is inside its fill before
// the others start: the disk is shut until all of them use a record, and then fails so often.
TEST(ArchiveReaderThreads, TheCacheHasARecordForEachUseThatCantShareOneAndAFailureIsOneThreadsOwn) {
    constexpr UInt64 kPiece = 20'000;
    const std::string text = SampleText(13 * kPiece);
    const std::tuple<unsigned, bool, UInt64, int> kRows[] = {
        {1, false, 0, 0}, {1, true, 0, 0}, {2, false, 0, 0}, {2, true, 0, 0},  {6, false, 0, 0}, {6, false, 1, 0},
        {6, true, 0, 0},  {6, true, 1, 0}, {6, false, 0, 1}, {6, false, 0, 6}, {6, true, 0, 2}};
    for (const auto& [threads, streamed, stride, failures] : kRows) {
        SCOPED_TRACE(testing::Message() << threads << " threads, " << streamed << ' ' << stride << ' ' << failures);
        const CompressionType type = streamed ? kCompressionLzma : kCompressionLz4;
        DisturbedDisk disk;
        OpenedArchive archive({.entries = {{.bytes = text}}, .chunkSize = kPiece, .type = type, .streamed = streamed});
        for (const UInt64 first : {0u, 6u, 0u}) {
            disk.isShut = true;
            disk.reads = 0;
            std::atomic<int> refused = 0;
            std::vector<std::jthread> all;
            for (unsigned index = 0; index < threads; ++index)
                all.emplace_back([&, index, from = (first + index * stride) * kPiece + 1] {
                    while (index != 0 && disk.isShut && Access::Look(archive.reader).uses == 0)
                        std::this_thread::yield();
                    const std::string got = archive.Read(from, kPiece - 2);
                    EXPECT_TRUE(got == "refused" || got == text.substr(from, kPiece - 2)) << from;
                    refused += got == "refused";
                });
            for (int tries = 1'000'000; Access::Look(archive.reader).uses != threads && tries != 0; --tries)
                std::this_thread::yield();
            Access::EmptyCache(archive.reader); // frees none of these
            disk.failures = failures;
            disk.isShut = false;
            disk.isShut.notify_all();
            all.clear();
            const Access::Cache cache = Access::Look(archive.reader);
            EXPECT_TRUE(refused == failures && cache.isIdle && cache.records <= threads);
            EXPECT_EQ(failures != 0 ? cache.records : stride == 0 && !streamed ? 1 : threads, cache.records);
            EXPECT_TRUE(failures != 0 || disk.reads == cache.records); // every stored byte is read by one thread
            EXPECT_EQ(text.substr(12 * kPiece, 9), archive.Read(12 * kPiece, 9)); // one block is forgotten
        }
    }
}

// Blocks of every kind, whole and then cut, on a disk that is sound or fails now and then. Another --gtest_random_seed
// reads other ranges.
TEST(ArchiveReaderThreads, RandomReadsOfAMixedArchiveDeliverWhatIsThere) {
    constexpr UInt64 kSize = 851'074, kWholeSize = 621'074;
    const std::string text = SampleText(kSize), start = text.substr(0, kWholeSize);
    const std::tuple<UInt64, CompressionType, bool> kBlocks[] = {
        {60'000, kCompressionLz4, false},  {65'537, kCompressionLzma, false}, {200'000, kCompressionLzma, true},
        {1, kCompressionLz4HC, false},     {50'000, kCompressionNone, false}, {80'000, kCompressionLz4HC, false},
        {65'536, kCompressionLzma, true},  {100'000, kCompressionNone, true}, {40'000, kCompressionLz4, false},
        {40'000, kCompressionLzma, false}, {150'000, kCompressionLzma, true}};
    ArchiveDescription description{.entries = {{.bytes = text}}, .sectionPadded = true};
    for (UInt64 position = 0; const auto& [size, type, isStreamed] : kBlocks) {
        std::string stored = Compress(type, text.substr(position, size));
        stored.resize(position < kWholeSize ? stored.size() : stored.size() / 2);
        description.blocks.push_back({size, type, isStreamed, stored});
        position += size;
    }
    unsigned seed = static_cast<unsigned>(testing::UnitTest::GetInstance()->random_seed());
    for (const auto& [staysOpen, fails] : {std::pair(true, false), {false, false}, {true, true}}) {
        DisturbedDisk disk;
        OpenedArchive archive(BuildArchive(description).bytes, 7);
        // Whole blocks need no record.
        EXPECT_TRUE(archive.Read(0, kWholeSize) == start && Access::Look(archive.reader).records == 0);
        disk.failsEvery = fails ? 5 : ~UInt64{0};
        if (!staysOpen) archive.reader.MakeStorageUnused(); // it is closed whenever nobody is inside
        std::atomic<int> whole = 0, shortened = 0, refused = 0;
        std::vector<std::jthread> all;
        for (const unsigned last = seed + 8; seed != last; ++seed)
            all.emplace_back([&, fails = fails, seed] {
                std::mt19937 random(seed);
                for (int step = 0; step < 300; ++step) {
                    const UInt64 from = random() % kSize;
                    const UInt64 size = std::min<UInt64>(1 + random() % (1u << random() % 18), kSize - from);
                    EXPECT_TRUE(archive.reader.MakeStorageUsed(true));
                    const std::string got = archive.Read(from, size, static_cast<FileReadFlags>(random() % 2));
                    archive.reader.MakeStorageUnused();
                    ++(got == "refused" ? refused : got.size() < size ? shortened : whole);
                    EXPECT_TRUE(got == "refused" || got == text.substr(from, got.size())) << seed << " step " << step;
                    EXPECT_TRUE(got.size() == size || fails || from + size > kWholeSize) << seed << " step " << step;
                }
            });
        all.clear();
        EXPECT_TRUE(whole > 0 && shortened > 0 && refused > 0 && Access::Look(archive.reader).isIdle);
        EXPECT_GE(staysOpen ? 8u : 0u, Access::Look(archive.reader).records);
        disk.failsEvery = ~UInt64{0}; // what could not be read then can be now
        EXPECT_TRUE(archive.reader.MakeStorageUsed(true) && archive.Read(0, kWholeSize) == start);
    }
}

// This thread asks for the cache lock again while a hit has it. When it gets it, the hit needs it no more: it goes on
// until its record is nobody's.
TEST(ArchiveReaderThreads, ACacheHitTakesTheCacheLockOnce) {
    const std::string text = SampleText(1'000);
    OpenedArchive archive({.entries = {{.bytes = text}}, .chunkSize = 1'000, .type = kCompressionLz4});
    EXPECT_EQ(text.substr(1, 9), archive.Read(1, 9)); // fills the record
    Mutex& lock = Access::CacheLock(archive.reader);
    for (int round = 0; round < 20; ++round) {
        std::atomic<bool> isRead = false;
        std::jthread hit;
        const Mutex::AutoLock held(lock); // given back before the thread is waited for
        hit = std::jthread([&] {
            EXPECT_EQ(text.substr(1, 9), archive.Read(1, 9));
            isRead = true;
        });
        while (MutexInspector::Counter(lock) == 0)
            std::this_thread::yield();
        while (!isRead) {
            lock.Unlock(); // hands it to the hit, unless this thread is faster
            lock.Lock();
            for (int wait = 0; Access::Look(archive.reader).uses != 0 && wait < 500; ++wait)
                std::this_thread::sleep_for(std::chrono::milliseconds(1));
            ASSERT_EQ(0u, Access::Look(archive.reader).uses) << "the hit waits for the lock that it has had";
        }
    }
}
