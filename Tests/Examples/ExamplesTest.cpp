#include "Runtime/Utilities/SpookyHash.h"
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"
#include "Tools/ArchiveWriter/ArchiveWriter.h"

#include <algorithm>
#include <gtest/gtest.h>

namespace {

// Pieces of 1 MiB, each hash the seed of the next.
std::string Hash(const std::string& bytes) {
    UInt64 half1 = 0, half2 = 0;
    for (size_t from = 0; from < bytes.size(); from += 1 << 20)
        SpookyHash::Hash128(bytes.data() + from, std::min<size_t>(bytes.size() - from, 1 << 20), &half1, &half2);
    char text[33];
    snprintf(text, sizeof(text), "%016llx%016llx", half1, half2);
    return text;
}

std::string Repeat(const char* text, size_t size) {
    std::string bytes;
    while (bytes.size() < size)
        bytes += text + std::to_string(bytes.size());
    return bytes;
}

class Examples : public testing::Test {
protected:
    void Write(ArchiveLayout layout) {
        description.layout = layout;
        description.type = kCompressionLzma;
        description.entries = {{.path = "a/text", .bytes = Repeat("text ", 50'000)},
                               {.path = "empty"},
                               {.path = "large", .bytes = Repeat("large ", 2'500'000)},
                               {.path = "last", .bytes = "the end"}};
        WriteFile(path, BuildArchive(description).bytes);
    }

    ArchiveDescription description;
    TemporaryFolder folder;
    const std::string path = folder / "archive";
};

} // namespace

TEST_F(Examples, ReadEveryFileOfEveryLayout) {
    for (ArchiveLayout layout : {ArchiveLayout::kBlockBased, ArchiveLayout::kWeb, ArchiveLayout::kRaw}) {
        Write(layout);
        std::string hashes;
        for (const ArchiveEntry& entry : description.entries) {
            EXPECT_EQ(RunProgram(READ_ONE_FILE, {path, entry.path}, {}), (Transcript{.output = entry.bytes}));
            hashes += Hash(entry.bytes) + "  " + entry.path + "\n";
        }
        for (const char* threads : {"1", "3", "8"}) {
            const Transcript run = RunProgram(PARALLEL_READER, {path, threads}, {});
            EXPECT_EQ(0, run.status);
            EXPECT_EQ(hashes, run.output);
            const std::string start = " bytes by " + std::string(threads) + " threads, ";
            unsigned long long total = 0, bytesASecond = 0;
            ASSERT_EQ(
                2, sscanf(run.error.c_str(), ("%llu" + start + "%llu bytes a second").c_str(), &total, &bytesASecond))
                << run.error;
            EXPECT_EQ(description.entries[0].bytes.size() + description.entries[2].bytes.size() + 7, total);
            EXPECT_NE(0u, bytesASecond);
        }
    }
}

TEST_F(Examples, SayWhatCantBeRead) {
    Write(ArchiveLayout::kBlockBased);
    const std::string bytes = ReadFile(path);
    const std::string cut = folder / "cut", text = folder / "text";
    WriteFile(cut, bytes.substr(0, bytes.size() - 100)); // the last block, in which "large" ends and "last" lies
    WriteFile(text, "no archive at all");
    EXPECT_EQ((Transcript{.status = 1, .error = "last: damaged\n"}), RunProgram(READ_ONE_FILE, {cut, "last"}, {}));
    EXPECT_EQ((Transcript{.status = 1, .error = "b: no such file in the archive\n"}),
              RunProgram(READ_ONE_FILE, {cut, "b"}, {}));
    EXPECT_EQ(text + ": not a readable archive\n", RunProgram(READ_ONE_FILE, {text, "last"}, {}).error);
    EXPECT_EQ(text + ": not a readable archive\n", RunProgram(PARALLEL_READER, {text}, {}).error);
    const Transcript run = RunProgram(PARALLEL_READER, {cut, "2"}, {});
    EXPECT_EQ(1, run.status);
    EXPECT_EQ(Hash(description.entries[0].bytes) + "  a/text\n" + Hash("") + "  empty\n" + //
                  "can't be read                     large\ncan't be read                     last\n",
              run.output);
}
