// How mounts read archives, without a mount.
#include "Tools/Zarvo/MountReader.h"

#include "Tests/Tools/Zarvo/ZarvoTest.h"
#include <zarvo.hpp>

#include <unistd.h>

namespace {

// Bytes of which those from a limit on can't be read.
class LimitedSource : public zarvo::source {
public:
    LimitedSource(std::string bytes, const size_t& limit) : m_Bytes(std::move(bytes)), m_Limit(limit) {}
    int64_t read_at(std::span<std::byte> buffer, uint64_t offset) override {
        const size_t count = std::min<size_t>(buffer.size(), m_Bytes.size() - offset);
        if (offset + count > m_Limit) return -EIO;
        memcpy(buffer.data(), m_Bytes.data() + offset, count);
        return int64_t(count);
    }
    int64_t size() override { return int64_t(m_Bytes.size()); }

private:
    const std::string m_Bytes;
    const size_t& m_Limit;
};

TEST(ZarvoMountReader, HasAsManyThreadsAsMemoryAllows) {
    const std::string bytes = BuildArchive(Archive("lz4 chunk=100000 f:c300000")).bytes;
    const zarvo::result<zarvo::archive> archive = zarvo::archive::open(std::as_bytes(std::span(bytes)));
    for (const auto& [maxBlockBytes, threads] : {std::pair(1'000'000, 8), {250'000, 2}, {150'000, 1}, {50'000, 8}})
        EXPECT_EQ(size_t(threads), MountReader::FitThreads(*archive, 8, uint64_t(maxBlockBytes))) << maxBlockBytes;
}

TEST(ZarvoMountReader, CountsBlocksAsTheyAreStored) {
    const std::string bytes = BuildArchive(Archive("lz4 chunk=100000 f:r300000")).bytes;
    const zarvo::result<zarvo::archive> archive = zarvo::archive::open(std::as_bytes(std::span(bytes)));
    ASSERT_LT(100'000u, archive->block(0).stored_size);
    EXPECT_EQ(1u, MountReader::FitThreads(*archive, 8, 200'000));
}

TEST(ZarvoMountReader, ReadsAStreamAgainThatFailedOnce) {
    const BuiltArchive built = BuildArchive(Archive("lzma streamed chunk=2000000 f:r6000000"));
    size_t limit = SIZE_MAX;
    zarvo::result<zarvo::archive> archive = zarvo::archive::open(std::make_unique<LimitedSource>(built.bytes, limit));
    MountReader reader(*archive, 2, 1 << 30);
    const zarvo::entry entry = archive->entries()[0];
    const auto read = [&](uint64_t offset) {
        std::string bytes(50'000, '\0');
        const zarvo::read_result result = reader.Read(entry, offset, std::as_writable_bytes(std::span(bytes)));
        return result.error ? std::string(result.error.text()) : bytes;
    };
    limit = built.dataOffset + 450'000;
    EXPECT_THAT(read(480'000), testing::HasSubstr("Input/output error"));
    limit = SIZE_MAX;
    // Both places from which decoding could go on are taken.
    for (const size_t offset : {size_t{2'000'000}, size_t{4'000'000}})
        EXPECT_EQ(Brief(built.stream.substr(offset, 50'000)), Brief(read(offset)));
    alarm(20); // for a reader that never ends
    EXPECT_EQ(Brief(built.stream.substr(480'000, 50'000)), Brief(read(480'000)));
    alarm(0);
}

} // namespace
