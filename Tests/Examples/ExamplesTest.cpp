#include "Runtime/Utilities/Format.h"
#include "Runtime/Utilities/SpookyHash.h"
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"
#include "Tools/ArchiveWriter/ArchiveWriter.h"

#include <fcntl.h>

// A line of ParallelReader: pieces of 1 MiB, each hash the seed of the next.
static std::string HashLine(const ArchiveEntry& entry) {
    UInt64 half1 = 0, half2 = 0;
    for (size_t from = 0; from < entry.bytes.size(); from += 1 << 20)
        SpookyHash::Hash128(&entry.bytes[from], entry.bytes.substr(from, 1 << 20).size(), &half1, &half2);
    return Format("%016llx%016llx  %s\n", half1, half2, entry.path.c_str()).c_str();
}

TEST(Examples, ReadEveryFileOfEveryLayoutAndSayWhatCantBeRead) {
    std::string text, unread = "can't be read                     ";
    while (text.size() < 2'500'000)
        text += std::to_string(text.size()) + " ";
    const ArchiveEntry small{.path = "a/b", .bytes = text.substr(0, 50'000)}, empty{.path = "empty"},
        large{.path = "large", .bytes = text}, last{.path = "last", .bytes = "the end"};
    const std::string lines = HashLine(small) + HashLine(empty);
    const std::string total = std::to_string(text.size() + 50'007) + " bytes by ";
    const TemporaryFolder folder;
    const std::string whole = folder / "whole", cut = folder / "cut"; // in the last block, where "large" ends
    for (const ArchiveLayout layout : {ArchiveLayout::kWeb, ArchiveLayout::kRaw, ArchiveLayout::kBlockBased}) {
        const ArchiveDescription archive{
            .layout = layout, .entries = {small, empty, large, last}, .type = kCompressionLzma};
        WriteArchive(archive, whole);
        for (const auto& [path, bytes, flags, sourceFile, isListed] : archive.entries)
            EXPECT_TRUE(RunProgram(READ_ONE_FILE, {whole, path}) == Transcript(0, bytes)) << path;
        for (const std::string threads : {"1", "3", "8"}) {
            const auto [status, output] = RunProgram(PARALLEL_READER, {whole, threads});
            EXPECT_TRUE(status == 0 && output.starts_with(total + threads + " threads, ")) << output;
            EXPECT_TRUE(output.ends_with(" bytes a second\n" + lines + HashLine(large) + HashLine(last))) << output;
        }
    }
    WriteFile(cut, ReadFile(whole).erase(std::filesystem::file_size(whole) - 100));
    EXPECT_EQ(Transcript(1, "last: damaged\n"), RunProgram(READ_ONE_FILE, {cut, "last"}));
    EXPECT_EQ(Transcript(1, "b: no such file in the archive\n"), RunProgram(READ_ONE_FILE, {cut, "b"}));
    const auto [status, output] = RunProgram(PARALLEL_READER, {cut, "2"});
    EXPECT_TRUE(status == 1 && output.ends_with(lines + unread + "large\n" + unread + "last\n")) << output;
    const Transcript noArchive(1, "Unable to read header from archive file: .\n.: not a readable archive\n");
    EXPECT_EQ(noArchive, RunProgram(READ_ONE_FILE, {".", "last"}));
    EXPECT_EQ(noArchive, RunProgram(PARALLEL_READER, {"."}));
}

TEST(Examples, KeepMessagesOutOfTheirResults) {
    // A block that is marked as a stream, but can't be one: its check fails, and says so.
    ArchiveDescription archive{.entries = {{.path = "a", .bytes = "text"}}, .type = kCompressionLz4};
    archive.fields["block[0].flags"] = 0x42;
    const TemporaryFolder folder;
    WriteArchive(archive, folder / "damaged");
    const std::string unread = "can't be read                     a\n",
                      noStream = "Decompressor's stream must be initialized!\n";
    for (const auto& [program, argument, results] :
         {std::tuple(READ_ONE_FILE, "a", std::string()), std::tuple(PARALLEL_READER, "2", unread)}) {
        const auto splitOutput = [&] {
            return dup2(open("messages", O_WRONLY | O_CREAT | O_TRUNC, 0600), STDERR_FILENO) >= 0;
        };
        EXPECT_EQ(Transcript(1, results), RunProgram(program, {"damaged", argument}, folder.Path(), splitOutput));
        EXPECT_TRUE(ReadFile(folder / "messages").starts_with(noStream)) << ReadFile(folder / "messages");
    }
}
