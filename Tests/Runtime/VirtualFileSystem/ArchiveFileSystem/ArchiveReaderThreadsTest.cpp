// One reader, many threads. What must happen at the same time is held together by a disk that is shut, never by timing.
#include "Tests/Runtime/VirtualFileSystem/ArchiveFileSystem/ReaderTest.h"
#include "Tests/Support/MutexInspector.h"

#include <thread>

namespace {

// Threads that read a part of a block at once.
struct Crowd {
    unsigned threads;
    bool streamed = false;
    UInt64 stride = 0; // 0: all read the same block; 1: each reads its own
    int failures = 0;  // of the disk

    friend void PrintTo(const Crowd& crowd, std::ostream* out) {
        *out << crowd.threads << (crowd.streamed ? " threads, streamed" : " threads, chunks") << ", stride "
             << crowd.stride << ", failures " << crowd.failures;
    }
};

struct Outcome {
    int refused;
    UInt64 diskReads;
    Access::Cache cache;

    bool operator==(const Outcome&) const = default;
    friend void PrintTo(const Outcome& outcome, std::ostream* out) {
        *out << outcome.refused << " refused, " << outcome.diskReads << " disk reads, "
             << testing::PrintToString(outcome.cache);
    }
};

class ReaderCrowd : public testing::TestWithParam<Crowd> {
protected:
    static constexpr UInt64 kPiece = 20'000;

    // The first thread is inside its fill before the others start, and the disk is shut until all of them use a record.
    Outcome ReadAtOnce(UInt64 firstBlock) {
        const auto& [threads, streamed, stride, failures] = GetParam();
        m_Disk.isShut = true;
        m_Disk.reads = 0;
        std::atomic<int> refused = 0;
        std::vector<std::jthread> all;
        for (unsigned index = 0; index < threads; ++index)
            all.emplace_back([&, index, from = (firstBlock + index * GetParam().stride) * kPiece + 1] {
                while (index != 0 && m_Disk.isShut && Access::Look(m_Archive.reader).uses == 0)
                    std::this_thread::yield();
                const std::string got = m_Archive.Read(from, kPiece - 2);
                if (got == kRefused)
                    ++refused;
                else
                    EXPECT_EQ(m_Text.substr(from, kPiece - 2), got) << from;
            });
        for (int tries = 1'000'000; Access::Look(m_Archive.reader).uses != threads && tries != 0; --tries)
            std::this_thread::yield();
        Access::EmptyCache(m_Archive.reader); // must free none of the records in use
        m_Disk.failures = failures;
        m_Disk.isShut = false;
        m_Disk.isShut.notify_all();
        all.clear();
        return {refused, m_Disk.reads, Access::Look(m_Archive.reader)};
    }

    void ReadPartOf(UInt64 block) { EXPECT_EQ(m_Text.substr(block * kPiece, 9), m_Archive.Read(block * kPiece, 9)); }

    // Makes the cache forget one block.
    void ReadAnotherBlock() { ReadPartOf(12); }

    const std::string m_Text = SampleText(13 * kPiece);
    DisturbedDisk m_Disk;
    OpenedArchive m_Archive{ArchiveDescription{.entries = {{.bytes = m_Text}},
                                               .chunkSize = kPiece,
                                               .type = GetParam().streamed ? kCompressionLzma : kCompressionLz4,
                                               .streamed = GetParam().streamed}};
};

using SoundDisk = ReaderCrowd;
using FailingDisk = ReaderCrowd;
using TwoRecords = ReaderCrowd;

} // namespace

TEST_P(SoundDisk, ReadsWhatCantBeSharedOncePerThread) {
    const auto& [threads, streamed, stride, failures] = GetParam();
    const unsigned records = streamed || stride != 0 ? threads : 1;
    for (const UInt64 firstBlock : {0u, 6u, 0u}) {
        EXPECT_EQ((Outcome{.refused = 0, .diskReads = records, .cache = {.records = records}}), ReadAtOnce(firstBlock));
        ReadAnotherBlock();
    }
}
INSTANTIATE_TEST_SUITE_P(, SoundDisk,
                         testing::Values(Crowd{.threads = 1}, Crowd{.threads = 1, .streamed = true},
                                         Crowd{.threads = 2}, Crowd{.threads = 2, .streamed = true},
                                         Crowd{.threads = 6}, Crowd{.threads = 6, .stride = 1},
                                         Crowd{.threads = 6, .streamed = true},
                                         Crowd{.threads = 6, .streamed = true, .stride = 1}));

TEST_P(TwoRecords, ForgetWhatWasUsedLongestAgo) {
    ReadAtOnce(0);
    ReadPartOf(0);
    ReadPartOf(1);
    ReadAnotherBlock();
    m_Disk.reads = 0;
    ReadPartOf(1);
    EXPECT_EQ(0u, m_Disk.reads);
    ReadPartOf(0);
    EXPECT_EQ(1u, m_Disk.reads);
}
INSTANTIATE_TEST_SUITE_P(, TwoRecords, testing::Values(Crowd{.threads = 2, .stride = 1}));

TEST_P(FailingDisk, FailsOnlyTheThreadThatReads) {
    for (const UInt64 firstBlock : {0u, 6u, 0u}) {
        const Outcome outcome = ReadAtOnce(firstBlock);
        EXPECT_EQ(GetParam().failures, outcome.refused);
        EXPECT_EQ(Access::Cache{.records = outcome.cache.records}, outcome.cache); // idle
        EXPECT_LE(outcome.cache.records, GetParam().threads);
        ReadAnotherBlock();
    }
}
INSTANTIATE_TEST_SUITE_P(, FailingDisk,
                         testing::Values(Crowd{.threads = 6, .failures = 1}, Crowd{.threads = 6, .failures = 6},
                                         Crowd{.threads = 6, .streamed = true, .failures = 2}));

namespace {

// Blocks of every kind, whole up to kWholeSize and then cut.
class MixedArchive : public testing::Test {
protected:
    static constexpr UInt64 kSize = 851'074;
    static constexpr UInt64 kWholeSize = 621'074;
    static constexpr int kThreads = 8;

    static std::string Build(const std::string& text) {
        struct {
            UInt64 size;
            CompressionType type;
            bool streamed = false;
        } const blocks[] = {
            {.size = 60'000, .type = kCompressionLz4},
            {.size = 65'537, .type = kCompressionLzma},
            {.size = 200'000, .type = kCompressionLzma, .streamed = true},
            {.size = 1, .type = kCompressionLz4HC},
            {.size = 50'000, .type = kCompressionNone},
            {.size = 80'000, .type = kCompressionLz4HC},
            {.size = 65'536, .type = kCompressionLzma, .streamed = true},
            {.size = 100'000, .type = kCompressionNone, .streamed = true},
            {.size = 40'000, .type = kCompressionLz4},
            {.size = 40'000, .type = kCompressionLzma},
            {.size = 150'000, .type = kCompressionLzma, .streamed = true},
        };
        ArchiveDescription description{.entries = {{.bytes = text}}, .sectionPadded = true};
        UInt64 position = 0;
        for (const auto& block : blocks) {
            std::string stored = Compress(block.type, text.substr(position, block.size));
            if (position >= kWholeSize) stored.resize(stored.size() / 2);
            description.blocks.push_back({block.size, block.type, block.streamed, stored});
            position += block.size;
        }
        return BuildArchive(description).bytes;
    }

    // Threads read ranges, and count what they get. Another --gtest_random_seed reads others.
    void ReadRandomRanges() {
        const auto first = static_cast<unsigned>(testing::UnitTest::GetInstance()->random_seed());
        std::vector<std::jthread> all;
        for (unsigned seed = first; seed != first + kThreads; ++seed)
            all.emplace_back([this, seed] {
                std::mt19937 random(seed);
                for (int step = 0; step < 300; ++step)
                    ReadRandomRange(&random, testing::Message() << "seed " << seed << ", step " << step);
            });
    }

    void ReadRandomRange(std::mt19937* random, const testing::Message& where) {
        const UInt64 from = (*random)() % kSize;
        const UInt64 limit = 1u << (*random)() % 18;
        const UInt64 size = std::min<UInt64>(1 + (*random)() % limit, kSize - from);
        EXPECT_TRUE(m_Archive.reader.MakeStorageUsed(true));
        const std::string got = m_Archive.Read(from, size, static_cast<FileReadFlags>((*random)() % 2));
        m_Archive.reader.MakeStorageUnused();
        const bool isRefused = got == kRefused;
        if (!isRefused) {
            EXPECT_EQ(m_Text.substr(from, got.size()), got) << where;
        }
        if (m_Disk.failsEvery == kNever && from + size <= kWholeSize) {
            EXPECT_EQ(size, got.size()) << where;
        }
        ++(isRefused ? m_Refused : got.size() < size ? m_Shortened : m_Whole);
    }

    void ExpectAllKindsOfAnswersAndAnIdleCache() {
        EXPECT_GT(m_Whole, 0);
        EXPECT_GT(m_Shortened, 0);
        EXPECT_GT(m_Refused, 0);
        const Access::Cache cache = Access::Look(m_Archive.reader);
        EXPECT_EQ(Access::Cache{.records = cache.records}, cache);
    }

    static constexpr UInt64 kNever = ~UInt64{0};
    const std::string m_Text = SampleText(kSize);
    DisturbedDisk m_Disk;
    OpenedArchive m_Archive{Build(m_Text), 7};
    std::atomic<int> m_Whole = 0;
    std::atomic<int> m_Shortened = 0;
    std::atomic<int> m_Refused = 0;
};

} // namespace

TEST_F(MixedArchive, DeliversWhatIsThereToManyThreads) {
    ReadRandomRanges();
    ExpectAllKindsOfAnswersAndAnIdleCache();
    EXPECT_LE(Access::Look(m_Archive.reader).records, size_t{kThreads});
}

TEST_F(MixedArchive, MayCloseWheneverNobodyReads) {
    m_Archive.reader.MakeStorageUnused();
    ReadRandomRanges();
    ExpectAllKindsOfAnswersAndAnIdleCache();
    EXPECT_EQ(0u, Access::Look(m_Archive.reader).records);
}

TEST_F(MixedArchive, IsWholeAgainAfterReadsHaveFailed) {
    m_Disk.failsEvery = 5;
    ReadRandomRanges();
    ExpectAllKindsOfAnswersAndAnIdleCache();
    m_Disk.failsEvery = kNever;
    EXPECT_EQ(m_Text.substr(0, kWholeSize), m_Archive.Read(0, kWholeSize));
}

// This thread asks for the cache lock again while a hit has it. By the time this thread gets the lock, the hit must not
// need it any more: the hit goes on until nobody uses its record.
TEST(ArchiveReaderThreads, CacheHitTakesTheCacheLockOnce) {
    const std::string text = SampleText(1'000);
    OpenedArchive archive({.entries = {{.bytes = text}}, .chunkSize = 1'000, .type = kCompressionLz4});
    EXPECT_EQ(text.substr(1, 9), archive.Read(1, 9)); // fills the record
    Mutex& lock = Access::CacheLock(archive.reader);
    for (int round = 0; round < 20; ++round) {
        std::atomic<bool> isRead = false;
        std::jthread hit;
        const Mutex::AutoLock held(lock); // unlocked before hit is joined
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
            ASSERT_EQ(0u, Access::Look(archive.reader).uses) << "the hit waits for the lock a second time";
        }
    }
}
