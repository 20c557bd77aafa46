// Every example, in C and in C++, with archives that are whole, damaged, and none.
#include "Runtime/Utilities/Format.h"
#include "Tests/Support/ArchiveBuilder.h"
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"

namespace {

constexpr char kDamaged[] = ": block 4 ends after the archive's last byte\n";
constexpr char kNoArchive[] = "none: not a Zarvo archive\n";

} // namespace

class Examples : public testing::TestWithParam<const char*> {
protected:
    Examples() {
        while (m_Text.size() < 500'000)
            m_Text += std::to_string(m_Text.size()) + " ";
        m_Archive.entries = {{.path = "a/b", .bytes = m_Text.substr(0, 50'000)},
                             {.path = "empty"},
                             {.path = "large", .bytes = m_Text},
                             {.path = "last", .bytes = "the end"}};
        m_Archive.type = kCompressionLzma;
        WriteArchive(m_Archive, m_Folder / "whole");
        // Inside the last block, where "large" ends.
        WriteFile(m_Folder / "cut",
                  ReadFile(m_Folder / "whole").erase(std::filesystem::file_size(m_Folder / "whole") - 100));
        WriteFile(m_Folder / "none", m_Text);
    }

    Transcript Run(const std::string& example, const std::vector<std::string>& arguments) const {
        return RunProgram((EXAMPLES + example + GetParam()).c_str(), arguments, m_Folder.Path());
    }

    // A line of ReadInThreads.
    static std::string SumLine(const ArchiveEntry& entry) {
        UInt64 sum = 0xcbf29ce484222325;
        for (const char byte : entry.bytes)
            sum = (sum ^ static_cast<UInt8>(byte)) * 0x100000001b3;
        return Format("%016llx  %s\n", sum, entry.path.c_str()).c_str();
    }

    std::string m_Text;
    ArchiveDescription m_Archive;
    const TemporaryFolder m_Folder;
};

INSTANTIATE_TEST_SUITE_P(Languages, Examples, testing::Values("", "C"));

TEST_P(Examples, ListEntriesPrintsFoldersWithASlash) {
    m_Archive.entries.push_back({.path = "folder", .flags = kFolderEntry});
    WriteArchive(m_Archive, m_Folder / "folder");
    EXPECT_EQ(Transcript(0, "a/b\nempty\nlarge\nlast\nfolder/\n"), Run("ListEntries", {"folder"}));
    EXPECT_EQ(Transcript(1, kNoArchive), Run("ListEntries", {"none"}));
    EXPECT_EQ(Transcript(2, "Usage: ListEntries ARCHIVE\n"), Run("ListEntries", {}));
}

TEST_P(Examples, ReadOneFileWritesWhatCanBeRead) {
    for (const ArchiveEntry& entry : m_Archive.entries)
        EXPECT_EQ(Transcript(0, entry.bytes), Run("ReadOneFile", {"whole", entry.path}));
    EXPECT_EQ(Transcript(1, std::string("last") + kDamaged), Run("ReadOneFile", {"cut", "last"}));
    auto [status, output] = Run("ReadOneFile", {"cut", "large"});
    EXPECT_EQ(1, status);
    const std::string said = std::string("large") + kDamaged;
    ASSERT_NE(std::string::npos, output.find(said));
    output.erase(output.find(said), said.size());
    EXPECT_LE(4 * m_Archive.chunkSize - m_Archive.entries[0].bytes.size(), output.size());
    EXPECT_EQ(m_Text.substr(0, output.size()), output);
}

TEST_P(Examples, ReadOneFileSaysWhatIsNoFile) {
    EXPECT_EQ(Transcript(1, "a: a folder\n"), Run("ReadOneFile", {"whole", "a"}));
    EXPECT_EQ(Transcript(1, "b: no such entry\n"), Run("ReadOneFile", {"whole", "b"}));
    EXPECT_EQ(Transcript(1, kNoArchive), Run("ReadOneFile", {"none", "a/b"}));
    EXPECT_EQ(Transcript(2, "Usage: ReadOneFile ARCHIVE PATH\n"), Run("ReadOneFile", {"whole"}));
}

TEST_P(Examples, ReadInThreadsReadsEveryLayout) {
    std::string lines;
    for (const ArchiveEntry& entry : m_Archive.entries)
        lines += SumLine(entry);
    for (const ArchiveLayout layout : {ArchiveLayout::kWeb, ArchiveLayout::kRaw, ArchiveLayout::kBlockBased}) {
        m_Archive.layout = layout;
        WriteArchive(m_Archive, m_Folder / "whole");
        EXPECT_EQ(Transcript(0, lines), Run("ReadInThreads", {"whole"}));
    }
    EXPECT_EQ(Transcript(1, kNoArchive), Run("ReadInThreads", {"none"}));
    EXPECT_EQ(Transcript(2, "Usage: ReadInThreads ARCHIVE\n"), Run("ReadInThreads", {}));
}

TEST_P(Examples, ReadInThreadsNamesDamagedFiles) {
    const auto [status, output] = Run("ReadInThreads", {"cut"});
    EXPECT_EQ(1, status);
    EXPECT_EQ(std::string("large") + kDamaged + "last" + kDamaged + SumLine(m_Archive.entries[0]) +
                  SumLine(m_Archive.entries[1]),
              output);
}
