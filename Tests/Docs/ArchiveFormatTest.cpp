// The archives that docs/archive-format.md shows in hexadecimal are those that the writer makes, and can be extracted.
#include "Tests/Tools/Extractor/ExtractorTest.h"

#include <sstream>

namespace {

// The bytes of each dump. A line is an offset, bytes up to two spaces or the line's end, and a note.
std::vector<std::string> ReadDumps(const std::string& document) {
    std::vector<std::string> dumps;
    std::istringstream text(ReadFile(document));
    bool isInDump = false;
    for (std::string line; std::getline(text, line);) {
        if (line.starts_with("```")) {
            isInDump = line == "```text";
            if (isInDump) dumps.emplace_back();
        } else if (isInDump) {
            EXPECT_EQ(dumps.back().size(), strtoull(line.c_str(), nullptr, 16)) << line;
            std::istringstream bytes(line.substr(6, line.find("  ", 6) - 6));
            for (unsigned byte; bytes >> std::hex >> byte;)
                dumps.back().push_back(static_cast<char>(byte));
        }
    }
    return dumps;
}

std::vector<ArchiveDescription> ShownArchives() {
    const ArchiveEntry folder = {.path = "d", .flags = kFolderEntry}, text = {.path = "d/a.txt", .bytes = "text\n"},
                       run = {.path = "z", .bytes = std::string(32, 'z')},
                       longRun = {.path = "z", .bytes = std::string(65'536, 'z')};
    return {{.entries = {folder, text, run},
             .blocks = {{.size = 5}, {.size = 32, .type = kCompressionLz4}},
             .version = 8,
             .sectionPadded = true},
            {.layout = ArchiveLayout::kWebVersion6, .entries = {text}},
            {.layout = ArchiveLayout::kWeb, .entries = {text, longRun}, .version = 4},
            {.layout = ArchiveLayout::kRaw, .entries = {text, run}},
            {.layout = ArchiveLayout::kArchive,
             .entries = {folder, text, run},
             .blocks = {{.size = 5}, {.size = 32, .type = kCompressionLzma, .streamed = true}}}};
}

TEST(ArchiveFormatDocument, ShowsArchivesThatTheWriterMakes) {
    const std::vector<std::string> dumps = ReadDumps(VARNEX_SOURCE_DIR "/docs/archive-format.md");
    const std::vector<ArchiveDescription> archives = ShownArchives();
    ASSERT_EQ(archives.size(), dumps.size());
    for (size_t index = 0; index < dumps.size(); ++index) {
        SCOPED_TRACE(testing::Message() << "dump " << index);
        EXPECT_EQ(BuildArchive(archives[index]).bytes, dumps[index]);
    }
}

TEST(ArchiveFormatDocument, ShowsArchivesThatCanBeExtracted) {
    const std::vector<std::string> dumps = ReadDumps(VARNEX_SOURCE_DIR "/docs/archive-format.md");
    const std::vector<ArchiveDescription> archives = ShownArchives();
    ASSERT_EQ(archives.size(), dumps.size());
    for (size_t index = 0; index < dumps.size(); ++index) {
        SCOPED_TRACE(testing::Message() << "dump " << index);
        const TemporaryFolder folder;
        WriteFile(folder / "a.zarvo", dumps[index]);
        const auto [status, said] = RunVarnex({"a.zarvo"}, folder.Path());
        EXPECT_EQ(0, status) << said;
        FolderTree expected = Output(archives[index].entries);
        expected["a.zarvo"] = Brief(dumps[index]);
        expected.erase("a.zarvo_data/d"); // not an empty folder, so the tree does not list it
        EXPECT_EQ(expected, ReadFolderTree(folder.Path()));
    }
}

} // namespace
