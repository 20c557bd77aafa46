// What the local back ends have in common: each test runs over the POSIX one, and in another program over the macOS one
// with its stand-in.
#include "Tests/Runtime/VirtualFileSystem/LocalDiskTest.h"
#include "Tests/Support/ReportRecorder.h"

class LocalFileSystemTest : public LocalDiskTest {
protected:
    bool DeleteTree(const char* name, bool isRecursive = true) const {
        return GetFileSystem()->Delete((folder / name).c_str(), isRecursive);
    }
};

TEST_F(LocalFileSystemTest, AQueryFillsWhatItReports) {
    constexpr UInt32 kAlways = kIsMac ? kFileEntryQueryNone : kFileEntryQueryHidden;
    constexpr UInt32 kStatus = kFileEntryQueryDirectory | kFileEntryQuerySize | kFileEntryQueryLastModified;
    constexpr int kForeignBits = 0xF0;              // not the operation's
    constexpr int kLeftBits = kIsMac ? kHidden : 0; // by a query for other flags
    Run("printf 12345 > file; chmod 444 file; ln -s file link; ln -s nowhere dangling");
    struct {
        const char* name;
        UInt32 query, answer;
        int flags; // without the foreign and the left bits
    } const kCases[] = {
        {".", kFileEntryQueryExists | kFileEntryQueryDirectory, kAlways | kStatus | kFileEntryQueryExists, kFolder},
        {".", kFileEntryQueryDirectory, kAlways | kStatus, kFolder},
        {".", kFileEntryQueryExists, kAlways | kFileEntryQueryExists, 0},
        {".", kFileEntryQueryNone, kAlways, 0},
        {"file", kFileEntryQuerySize, kAlways | kStatus, 0},
        {"file", kFileEntryQuerySymLink, kAlways | kStatus | kFileEntryQuerySymLink, 0},
        {"file", kFileEntryQueryReadOnly, kAlways | kStatus | kFileEntryQueryReadOnly, kFileEntryIsReadOnly},
        {"link", kFileEntryQuerySymLink | kFileEntryQueryReadOnly,
         kAlways | kStatus | kFileEntryQuerySymLink | kFileEntryQueryReadOnly, kLink | kFileEntryIsReadOnly},
        {"none", kFileEntryQueryExists | kFileEntryQueryDirectory, kFileEntryQueryNone, kHidden},
        {"none", kFileEntryQueryDirectory, kAlways, 0},
        {"dangling", kFileEntryQuerySymLink | kFileEntryQueryReadOnly, kAlways, 0},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(testing::Message() << c.name << ", query " << c.query);
        FileEntryInfo info;
        info.flags = kForeignBits | kHidden;
        const FileSystemEntry entry = Entry(c.name);
        EXPECT_EQ(c.answer, local.GetFileEntryInfo(entry, info, FileEntryInfoQueryFlags(c.query)));
        EXPECT_EQ(kForeignBits | kLeftBits | c.flags, info.flags);
        const bool isFilled = (c.answer & kFileEntryQuerySize) != 0;
        EXPECT_EQ(isFilled ? local.Size(entry) : VFS::FileSize(), info.size);
        EXPECT_EQ(isFilled ? local.LastModified(entry) : DateTime(), info.lastModified);
    }
}

TEST_F(LocalFileSystemTest, CreateAsFileLeavesWhatExists) {
    Run("printf data > file; ln -s none/x lost");
    struct {
        const char* name;
        bool isCreated;
    } const kCases[] = {{"new", true}, {"file", false}, {".", false}, {"lost", false}, {"none/x", false}};
    for (const auto& c : kCases) {
        FileSystemEntry entry = Entry(c.name);
        EXPECT_EQ(c.isCreated, local.CreateAsFile(entry)) << c.name;
    }
    EXPECT_EQ("", ReadFile(folder / "new"));
    EXPECT_EQ("data", ReadFile(folder / "file"));
}

// On a Mac, what a link leads to need not exist.
TEST_F(LocalFileSystemTest, TargetResolvesEveryLink) {
    Run("mkdir sub; ln -s sub/../second first; ln -s sub second; ln -s nowhere dangling");
    struct {
        const char *name, *target;
        bool isThere;
    } const kCases[] = {
        {.name = "first/./", .target = "sub", .isThere = true},
        {.name = "dangling", .target = "nowhere", .isThere = false},
        {.name = "none", .target = "none", .isThere = false},
    };
    for (const auto& c : kCases) {
        FileSystemEntry target("/unchanged");
        const bool isResolved = c.isThere || kIsMac;
        EXPECT_EQ(isResolved, local.Target(Entry(c.name), target)) << c.name;
        EXPECT_EQ(isResolved ? folder / c.target : "/unchanged", target.Path()) << c.name;
    }
}

TEST_F(LocalFileSystemTest, AListingTellsKindsAndSizes) {
    // On a Mac, a link that leads to no folder has its own size, and nothing is marked as read-only.
    constexpr int kReadOnly = kIsMac ? 0 : kFileEntryIsReadOnly;
    const auto linkSize = [](size_t own, size_t targets) { return kIsMac ? own : targets; };
    Run("mkdir -p d/sub; cd d; printf 12345 > sub/file; chmod 444 sub/file; printf 1 > $(printf '\\377x')");
    Run("cd d; touch .hidden; ln -s nowhere dangling; ln -s sub/file link; ln -s self self");
    const std::vector<Listed> kExpected = {
        {.path = "d/.hidden", .flags = kHidden},
        {.path = "d/dangling", .size = linkSize(7, 0), .flags = kLink},
        {.path = "d/link", .size = linkSize(8, 5), .flags = kLink | kReadOnly},
        {.path = "d/self", .size = linkSize(4, 0), .flags = kLink},
        {.path = "d/sub", .flags = kFolder},
        {.path = "d/sub/file", .size = 5, .flags = kReadOnly},
        {.path = "d/\xFFx", .size = 1},
    };
    const Listing listing = List("d");
    EXPECT_EQ(kExpected, listing.entries);
    EXPECT_TRUE(listing.answer);
    EXPECT_EQ("", listing.printed);
}

TEST_F(LocalFileSystemTest, AListingTellsTimes) {
    Run("mkdir -p d/sub; touch -d 2001-02-03 d/sub d/file; ln -s file d/link; ln -s nowhere d/dangling");
    Run("touch -d 2004-05-06 likeLinks; touch -h -d 2004-05-06 d/link d/dangling");
    dynamic_block_array<FileEntryInfo, 32> list(kMemLabelFileList);
    EXPECT_TRUE(local.Enumerate("d", &list, false, nullptr, kFileEnumerationAll));
    EXPECT_EQ(4u, list.size());
    for (size_t index = 0; index < list.size(); ++index) {
        const bool isItsOwn = kIsMac && (list[index].flags & kLink) != 0;
        EXPECT_EQ(local.LastModified(Entry(isItsOwn ? "likeLinks" : list[index].path)).ticks,
                  list[index].lastModified.ticks)
            << list[index].path; // elsewhere 0 for the dangling link
    }
}

TEST_F(LocalFileSystemTest, AFolderIsListedBeforeItsContents) {
    Run("mkdir -p d/d/d");
    dynamic_block_array<FileEntryInfo, 32> list(kMemLabelFileList);
    EXPECT_TRUE(local.Enumerate("d/", &list, true, nullptr, kFileEnumerationAll));
    ASSERT_EQ(2u, list.size());
    EXPECT_STREQ("d/d", list[0].path);
    EXPECT_STREQ("d/d/d", list[1].path);
}

// One loop a listing: with two, a listing that does not end takes too long to fail.
TEST_F(LocalFileSystemTest, AListingFollowsLinksButNotIntoLoops) {
    const struct {
        const char* links;
        std::vector<Listed> entries;
    } kCases[] = {
        {.links = "ln -s . d/a/loop",
         .entries = {{.path = "d/a/loop", .flags = kFolder | kLink}, {.path = "d/c", .flags = kFolder}}},
        {.links = "ln -s .. d/a/loop",
         .entries = {{.path = "d/a/loop", .flags = kFolder | kLink}, {.path = "d/c", .flags = kFolder}}},
        {.links = "ln -s ../c d/a/c; ln -s ../a d/c/a",
         .entries = {{.path = "d/a/c", .flags = kFolder | kLink},
                     {.path = "d/a/c/a", .flags = kFolder | kLink}, // is d/a, which this listing is inside
                     {.path = "d/c", .flags = kFolder},
                     {.path = "d/c/a", .flags = kFolder | kLink},
                     {.path = "d/c/a/c", .flags = kFolder | kLink},
                     {.path = "d/c/a/x"}}},
    };
    for (const auto& c : kCases) {
        Run(std::string("rm -rf d; mkdir -p d/a d/c; touch d/a/x; ") + c.links);
        std::vector<Listed> expected = c.entries;
        expected.insert(expected.end(), {{.path = "d/a", .flags = kFolder}, {.path = "d/a/x"}});
        std::sort(expected.begin(), expected.end(), [](const Listed& a, const Listed& b) { return a.path < b.path; });
        EXPECT_EQ(expected, List("d").entries) << c.links;
    }
}

// A Mac lists a folder that can't be opened as empty.
TEST_F(LocalFileSystemTest, AListingKeepsWhatItHasWhenItFails) {
    Run("mkdir -p d/shut/in; chmod 200 d/shut");
    WorkAsAnyUser();
    const Listing shut = List("d"), none = List("none");
    EXPECT_EQ(kIsMac, shut.answer);
    EXPECT_EQ((std::vector<Listed>{{.path = "d/shut", .flags = kFolder}}), shut.entries);
    EXPECT_EQ(kIsMac, none.answer);
    EXPECT_EQ(std::vector<Listed>(), none.entries);
}

TEST_F(LocalFileSystemTest, ASkippedFolderIsNeitherListedNorSummed) {
    Run("mkdir -p d/CVS d/sub; for f in back~ CVS/in sub/in sub/n.tmp; do printf 1 > d/$f; done");
    constexpr UInt32 kSkip = kFileEnumerationSkipByName | kFileEnumerationSkipTemporary;
    const std::vector<Listed> kExpected = {{.path = "d/sub", .flags = kFolder}, {.path = "d/sub/in", .size = 1}};
    EXPECT_EQ(kExpected, List("d", kSkip).entries);
    EXPECT_EQ(std::vector<Listed>(), List("d", kSkip | kFileEnumerationSumSizes).entries);
    EXPECT_EQ(1u, m_Sum);
}

TEST_F(LocalFileSystemTest, SumsTheSizesOfFiles) {
    Run("mkdir -p d/sub; printf 12345 > d/sub/file; printf 12345 > d/file; ln -s nowhere d/dangling");
    ReportRecorder reports;
    EXPECT_TRUE(local.Enumerate("d", nullptr, true, &m_Counter, kFileEnumerationSumSizes));
    EXPECT_EQ(kIsMac ? 17u : 10u, m_Sum); // the link has a size on a Mac
    const std::vector<std::string> texts = reports.Take();
    EXPECT_EQ(kIsMac ? 1u : 2u, texts.size()) << "elsewhere one for each folder";
    for (const std::string& text : texts)
        EXPECT_TRUE(text.ends_with(": Filesystem does not support storing size during enumeration outside of Zarvo "
                                   "Editor."))
            << text;
}

TEST_F(LocalFileSystemTest, SummingWithoutACounterIsReported) {
    Run("mkdir d; touch d/file");
    m_Counter = nullptr;
    for (void** const handlerData : {static_cast<void**>(nullptr), &m_Counter}) {
        ReportRecorder reports;
        EXPECT_TRUE(local.Enumerate("d", nullptr, true, handlerData, kFileEnumerationSumSizes));
        const std::vector<std::string> texts = reports.Take();
        ASSERT_EQ(2u, texts.size());
        EXPECT_TRUE(texts[1].ends_with(": Assertion failed on expression: 'handlerData != NULL'")) << texts[1];
    }
}

TEST_F(LocalFileSystemTest, ListsBigTreesAndDeletesThemRecursively) {
    Run("mkdir -p tree$(printf '/d%.0s' $(seq 199)) tree/.sub/$(printf '\\377'); touch tree/.sub/$(printf %0255d 0)");
    Run("mkdir tree/wide; cd tree/wide; seq 300 | xargs touch");
    EXPECT_EQ(199u + 3 + 1 + 300, List("tree").entries.size());
    EXPECT_FALSE(DeleteTree("tree", false));
    EXPECT_TRUE(IsThere("tree/.sub"));
    EXPECT_TRUE(DeleteTree("tree"));
    EXPECT_FALSE(IsThere("tree"));
}

TEST_F(LocalFileSystemTest, DeletesLinksButNotTheirTargets) {
    Run("mkdir kept tree; touch kept/file; ln -s kept link");
    Run("ln -s ../kept tree/link; ln -s . tree/loop; ln -s nowhere tree/dangling");
    EXPECT_TRUE(DeleteTree("tree"));
    EXPECT_FALSE(IsThere("tree"));
    EXPECT_TRUE(DeleteTree("link/"));
    EXPECT_FALSE(IsThere("link"));
    EXPECT_TRUE(IsThere("kept/file"));
}

TEST_F(LocalFileSystemTest, DeletesNothingOutsideThroughABackslash) {
    Run("mkdir -p kept odd; touch kept/file 'odd/..\\kept'");
    EXPECT_FALSE(DeleteTree("odd"));
    EXPECT_TRUE(IsThere("kept/file"));
}

TEST_F(LocalFileSystemTest, DeletesWhatItCanOfAFolder) {
    Run("mkdir -p theirs/sub; touch theirs/file theirs/sub/file; chmod 777 theirs; chmod 555 theirs/sub");
    WorkAsAnyUser();
    EXPECT_FALSE(DeleteTree("theirs"));
    EXPECT_FALSE(IsThere("theirs/file"));
    EXPECT_TRUE(IsThere("theirs/sub/file"));
}

TEST_F(LocalFileSystemTest, LeavesChildrenWhosePathsAreCut) {
    struct {
        size_t room; // that the folder's path leaves in an entry
        bool isShortNameLeft;
    } const kCases[] = {
        {.room = 9, .isShortNameLeft = false}, // a separator and 8 characters
        {.room = 1, .isShortNameLeft = true},
        {.room = 0, .isShortNameLeft = true},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(c.room);
        std::string path = folder / "deep/";
        while (path.size() < kMaxPathLength - c.room)
            path += path.size() % 100 == 0 ? '/' : 'd';
        Run("mkdir -p " + path + "; touch " + path + "/12345678 " + path + "/123456789");
        EXPECT_FALSE(DeleteTree("deep"));
        Run("cd " + path + "; test -e 123456789; test " + (c.isShortNameLeft ? "" : "!") + " -e 12345678");
        Run("cd " + path + "; rm -f 12345678 123456789");
        EXPECT_TRUE(DeleteTree("deep"));
    }
}
