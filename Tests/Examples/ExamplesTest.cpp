#include "Runtime/Utilities/SpookyHash.h"
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"
#include "Tools/ArchiveWriter/ArchiveWriter.h"

// A line of ParallelReader: pieces of 1 MiB, each hash the seed of the next.
static std::string HashLine(const ArchiveEntry& entry) {
    UInt64 half1 = 0, half2 = 0;
    for (size_t from = 0; from < entry.bytes.size(); from += 1 << 20) {
        const std::string piece = entry.bytes.substr(from, 1 << 20);
        SpookyHash::Hash128(piece.data(), piece.size(), &half1, &half2);
    }
    char text[33];
    snprintf(text, sizeof(text), "%016llx%016llx", half1, half2);
    return text + ("  " + entry.path + "\n");
}

TEST(Examples, ReadEveryFileOfEveryLayoutAndSayWhatCantBeRead) {
    std::string text;
    while (text.size() < 2'500'000)
        text += std::to_string(text.size()) + " ";
    const std::vector<ArchiveEntry> entries = {{.path = "a/text", .bytes = text.substr(0, 50'000)},
                                               {.path = "empty"},
                                               {.path = "large", .bytes = text},
                                               {.path = "last", .bytes = "the end"}};
    const std::string total = std::to_string(text.size() + 50'007);
    const TemporaryFolder folder;
    const auto run = [&](const char* program, const std::vector<std::string>& arguments) {
        return RunProgram(program, arguments, folder.Path());
    };
    for (const ArchiveLayout layout : {ArchiveLayout::kWeb, ArchiveLayout::kRaw, ArchiveLayout::kBlockBased}) {
        const std::string bytes = BuildArchive({.layout = layout, .entries = entries, .type = kCompressionLzma}).bytes;
        WriteFile(folder / "archive", bytes);
        WriteFile(folder / "cut", bytes.substr(0, bytes.size() - 100)); // of the last block, where "large" ends
        std::string lines;
        for (const ArchiveEntry& entry : entries) {
            EXPECT_TRUE(run(READ_ONE_FILE, {"archive", entry.path}) == Transcript(0, entry.bytes)) << entry.path;
            lines += HashLine(entry);
        }
        for (const std::string threads : {"1", "3", "8"}) {
            const auto [status, output] = run(PARALLEL_READER, {"archive", threads});
            EXPECT_TRUE(output.starts_with(total + " bytes by " + threads + " threads, ")) << output;
            EXPECT_TRUE(status == 0 && output.ends_with(" bytes a second\n" + lines)) << output;
        }
    }
    EXPECT_EQ(Transcript(1, "last: damaged\n"), run(READ_ONE_FILE, {"cut", "last"}));
    EXPECT_EQ(Transcript(1, "b: no such file in the archive\n"), run(READ_ONE_FILE, {"cut", "b"}));
    const Transcript noArchive(1, "Unable to read header from archive file: .\n.: not a readable archive\n");
    EXPECT_EQ(noArchive, run(READ_ONE_FILE, {".", "last"}));
    EXPECT_EQ(noArchive, run(PARALLEL_READER, {"."}));
    const std::string unread = "can't be read                     ",
                      lines = HashLine(entries[0]) + HashLine(entries[1]);
    const auto [status, output] = run(PARALLEL_READER, {"cut", "2"});
    EXPECT_TRUE(status == 1 && output.ends_with(lines + unread + "large\n" + unread + "last\n")) << output;
}
