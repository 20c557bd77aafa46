#include "Runtime/Utilities/Format.h"
#include "Runtime/Utilities/SpookyHash.h"
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"
#include "Tools/ArchiveWriter/ArchiveWriter.h"

#include <fcntl.h>
#include <filesystem>

namespace {

namespace fs = std::filesystem;

// A line that ParallelReader prints. It hashes pieces of 1 MiB, each hash the seed of the next.
std::string HashLine(const ArchiveEntry& entry) {
    UInt64 half1 = 0, half2 = 0;
    for (size_t from = 0; from < entry.bytes.size(); from += 1 << 20)
        SpookyHash::Hash128(&entry.bytes[from], entry.bytes.substr(from, 1 << 20).size(), &half1, &half2);
    return Format("%016llx%016llx  %s\n", half1, half2, entry.path.c_str()).c_str();
}

std::string FailureLine(const std::string& path) { return "can't be read                     " + path + "\n"; }

// Archives of the same files, larger than what the examples read at once.
class Examples : public testing::Test {
protected:
    static std::string MakeText() {
        std::string text;
        while (text.size() < 2'500'000)
            text += std::to_string(text.size()) + " ";
        return text;
    }

    ArchiveDescription Archive(ArchiveLayout layout) const {
        return {.layout = layout, .entries = {kSmall, kEmpty, kLarge, kLast}, .type = kCompressionLzma};
    }

    const ArchiveEntry kEmpty = {.path = "empty"}, kLarge = {.path = "large", .bytes = MakeText()},
                       kSmall = {.path = "a/b", .bytes = kLarge.bytes.substr(0, 50'000)},
                       kLast = {.path = "last", .bytes = "the end"};
    const TemporaryFolder m_Folder;
    const std::string m_Path = m_Folder / "a.zarvo";
};

constexpr ArchiveLayout kLayouts[] = {ArchiveLayout::kWeb, ArchiveLayout::kRaw, ArchiveLayout::kBlockBased};

TEST_F(Examples, ReadOneFileWritesAnyFile) {
    for (const ArchiveLayout layout : kLayouts) {
        WriteArchive(Archive(layout), m_Path);
        for (const ArchiveEntry& entry : Archive(layout).entries) {
            const auto [status, output] = RunProgram(READ_ONE_FILE, {m_Path, entry.path});
            EXPECT_EQ(0, status) << entry.path;
            EXPECT_TRUE(output == entry.bytes) << entry.path << ": other bytes"; // too many to print
        }
    }
}

TEST_F(Examples, ParallelReaderHashesEveryFile) {
    const std::string size = std::to_string(kLarge.bytes.size() + 50'007);
    for (const ArchiveLayout layout : kLayouts) {
        WriteArchive(Archive(layout), m_Path);
        for (const std::string threads : {"1", "3", "8"}) {
            const auto [status, output] = RunProgram(PARALLEL_READER, {m_Path, threads});
            EXPECT_EQ(0, status);
            const size_t lineEnd = output.find('\n') + 1;
            const std::string said = size + " bytes by " + threads + " threads, ";
            EXPECT_EQ(said, output.substr(0, said.size()));
            EXPECT_EQ(HashLine(kSmall) + HashLine(kEmpty) + HashLine(kLarge) + HashLine(kLast), output.substr(lineEnd));
        }
    }
}

TEST_F(Examples, ReportFilesThatCantBeRead) {
    WriteArchive(Archive(ArchiveLayout::kBlockBased), m_Path);
    fs::resize_file(m_Path, fs::file_size(m_Path) - 100); // cuts the last block, which holds the end of "large"
    EXPECT_EQ(Transcript(1, "last: damaged\n"), RunProgram(READ_ONE_FILE, {m_Path, "last"}));
    const auto [status, output] = RunProgram(PARALLEL_READER, {m_Path, "2"});
    EXPECT_EQ(1, status);
    EXPECT_EQ(HashLine(kSmall) + HashLine(kEmpty) + FailureLine("large") + FailureLine("last"),
              output.substr(output.find('\n') + 1));
}

TEST_F(Examples, ReadOneFileReportsAnUnknownPath) {
    WriteArchive(Archive(ArchiveLayout::kBlockBased), m_Path);
    EXPECT_EQ(Transcript(1, "b: no such file in the archive\n"), RunProgram(READ_ONE_FILE, {m_Path, "b"}));
}

TEST_F(Examples, ReportWhatIsNoArchive) {
    const Transcript noArchive(1, "Unable to read header from archive file: .\n.: not a readable archive\n");
    EXPECT_EQ(noArchive, RunProgram(READ_ONE_FILE, {".", "last"}));
    EXPECT_EQ(noArchive, RunProgram(PARALLEL_READER, {"."}));
}

TEST_F(Examples, KeepMessagesOutOfTheirResults) {
    // A block that is marked as a stream but can't be one makes a check fail, which prints a message.
    constexpr UInt64 kStreamedLz4 = 0x42;
    WriteArchive({.entries = {{.path = "a", .bytes = "text"}},
                  .type = kCompressionLz4,
                  .fields = {{"block[0].flags", kStreamedLz4}}},
                 m_Path);
    const auto splitOutput = [] {
        return dup2(open("messages", O_WRONLY | O_CREAT | O_TRUNC, 0600), STDERR_FILENO) >= 0;
    };
    const std::string message = "Decompressor's stream must be initialized!\n";
    EXPECT_EQ(Transcript(1, ""), RunProgram(READ_ONE_FILE, {m_Path, "a"}, m_Folder.Path(), splitOutput));
    EXPECT_EQ(message, ReadFile(m_Folder / "messages").substr(0, message.size()));
    EXPECT_EQ(Transcript(1, FailureLine("a")),
              RunProgram(PARALLEL_READER, {m_Path, "2"}, m_Folder.Path(), splitOutput));
    EXPECT_EQ(message, ReadFile(m_Folder / "messages").substr(0, message.size()));
}

} // namespace
