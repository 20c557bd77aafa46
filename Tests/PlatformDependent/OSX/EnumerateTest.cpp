#include "MacTest.h"

#include "Tests/Support/ConsoleCapture.h"

#include <cerrno>
#include <fcntl.h>
#include <map>
#include <unistd.h>
#include <vector>

namespace {

// What a listing answers, adds and prints.
struct Listing {
    bool answer = false;
    std::vector<std::string> order; // paths, without the listed one and its "/"
    std::map<std::string, FileEntryInfo> entries;
    UInt64 sum = 0;
    std::string printed;

    std::set<std::string> Names() const { return {order.begin(), order.end()}; }
};

class EnumerateTest : public MacTest {
protected:
    static Listing ListPath(const std::string& path, bool recursive, UInt32 flags = 0) {
        Listing listing;
        ConsoleCapture console;
        dynamic_block_array<FileEntryInfo, 32> out(kMemLabelFileList);
        void* counter = &listing.sum;
        listing.answer =
            Mac().Enumerate(path.c_str(), &out, recursive, &counter, static_cast<FileEnumerationFlag>(flags));
        const std::string prefix = path.empty() || path.back() == '/' ? path : path + "/";
        for (size_t i = 0; i < out.size(); ++i) {
            const std::string full = out[i].path;
            const std::string name = full.compare(0, prefix.size(), prefix) == 0 ? full.substr(prefix.size()) : full;
            listing.order.push_back(name);
            listing.entries[name] = out[i];
        }
        listing.printed = console.Text();
        return listing;
    }
    Listing List(const std::string& name, bool recursive = false, UInt32 flags = 0) const {
        return ListPath(Path(name), recursive, flags);
    }

    void WriteFiles(std::initializer_list<const char*> names) const {
        for (const char* name : names)
            WriteFile(name, "12345");
    }
};

bool Contains(const std::string& text, const std::string& part) { return text.find(part) != std::string::npos; }

TEST_F(EnumerateTest, EntriesSayKindSizeTimeAndMarks) {
    WriteFiles({"file", ".dot", "hidden", "folder/inside"});
    symlink("folder", Path("way").c_str());
    symlink("nowhere", Path("dangling").c_str());
    chmod(Path("file").c_str(), 0444);
    chflags(Path("hidden").c_str(), UF_HIDDEN);
    const timespec times[2] = {{0, 0}, {1'700'000'000, 999'999'999}};
    for (const char* name : {"file", ".dot", "hidden", "folder", "way", "dangling"})
        utimensat(AT_FDCWD, Path(name).c_str(), times, AT_SYMLINK_NOFOLLOW);
    const Listing listing = List("");
    EXPECT_TRUE(listing.answer);
    const struct {
        const char* name;
        UInt64 size;
        int flags;
    } kCases[] = {{"file", 5, 0},
                  {".dot", 5, kFileEntryIsHidden},
                  {"hidden", 5, kFileEntryIsHidden},
                  {"folder", 0, kFileEntryIsDirectory},
                  {"way", 0, kFileEntryIsDirectory | kFileEntryIsSymLink},
                  {"dangling", 7, kFileEntryIsSymLink}};
    ASSERT_EQ(listing.order.size(), std::size(kCases));
    for (const auto& [name, size, flags] : kCases) {
        ASSERT_EQ(listing.entries.count(name), 1u) << name;
        const FileEntryInfo& info = listing.entries.at(name);
        EXPECT_EQ(info.size, size) << name;
        EXPECT_EQ(info.flags, flags) << name;
        EXPECT_EQ(info.lastModified.ticks, 621'355'968'000'000'000 + 1'700'000'000 * 10'000'000LL) << name;
    }
}

TEST_F(EnumerateTest, FiltersTakeTheHiddenFlagForHidden) {
    WriteFiles({"file", "x.TMP", "back~", ".dot", "hidden", "CVS/in", ".git/in", "shy/in", "x.tmp/in"});
    chflags(Path("hidden").c_str(), UF_HIDDEN);
    chflags(Path("shy").c_str(), UF_HIDDEN);
    const std::set<std::string> kAll = {"file", "x.TMP", "back~", ".dot", "hidden", "CVS", ".git", "shy", "x.tmp"};
    const struct {
        UInt32 flags;
        std::set<std::string> skipped;
    } kCases[] = {{0x00, {}},
                  {0x02, {"hidden"}},
                  {0x04, {"shy"}},
                  {0x08, {"file", "x.TMP", "back~", ".dot"}},
                  {0x10, {"CVS", ".git", "x.tmp"}},
                  {0x20, {"back~", ".dot", "CVS", ".git"}},
                  {0x40, {"x.TMP"}}};
    for (const auto& [flags, skipped] : kCases) {
        std::set<std::string> expected = kAll;
        for (const std::string& name : skipped) {
            expected.erase(name);
            expected.erase(name + "/in");
        }
        EXPECT_EQ(List("", false, flags).Names(), expected) << flags;
    }
    EXPECT_EQ(List("", true, 0x04 | 0x08).Names(), (std::set<std::string>{"hidden", "CVS", ".git", "x.tmp"}))
        << "a skipped folder is not descended into";
}

TEST_F(EnumerateTest, FoldersComeBeforeWhatTheyHoldAndLoopsEnd) {
    WriteFiles({"a/b/file", "c/file"});
    symlink(".", Path("a/self").c_str());
    symlink(".", Path("a/self2").c_str());
    symlink("..", Path("a/b/up").c_str());
    symlink("../c", Path("a/c").c_str());
    symlink("../a", Path("c/a").c_str());
    symlink("endless", Path("endless").c_str());
    const Listing listing = List("", true);
    EXPECT_TRUE(listing.answer);
    // Below c/a the folder a is listed once more, but not c, which c/a lies in.
    EXPECT_EQ(listing.Names(), (std::set<std::string>{"a", "a/b", "a/b/file", "a/b/up", "a/self", "a/self2", "a/c",
                                                      "a/c/file", "a/c/a", "c", "c/file", "c/a", "c/a/b", "c/a/b/file",
                                                      "c/a/b/up", "c/a/self", "c/a/self2", "c/a/c", "endless"}));
    EXPECT_EQ(listing.order.size(), listing.Names().size());
    std::set<std::string> seen;
    for (const std::string& name : listing.order) {
        const std::string parent = std::filesystem::path(name).parent_path();
        EXPECT_TRUE(parent.empty() || seen.count(parent) == 1) << name;
        seen.insert(name);
    }
    EXPECT_EQ(listing.entries.at("endless").flags, kFileEntryIsSymLink);
}

TEST_F(EnumerateTest, WhatCannotBeOpenedIsEmpty) {
    WriteFiles({"file", "\xFF/in"});
    for (const char* name : {"missing", "\xFF"}) {
        const Listing listing = List(name, true);
        EXPECT_TRUE(listing.answer) << name;
        EXPECT_EQ(listing.Names(), std::set<std::string>()) << name;
        EXPECT_EQ(listing.printed, "") << name;
    }
    const Listing file = List("file");
    EXPECT_FALSE(file.answer);
    EXPECT_EQ(file.printed, "Error (Not a directory) occured whilst enumerating " + Path("file") + "\n");
    EXPECT_FALSE(Mac().Enumerate(nullptr, nullptr, false, nullptr, kFileEnumerationAll));
    EXPECT_EQ(List("", true).Names(), (std::set<std::string>{"file", "\xFF", "\xFF/in"}))
        << "met on the way they are no trouble";
}

TEST_F(EnumerateTest, RelativeListingsAreRelativeToTheCurrentDirectory) {
    WriteFiles({"work/docs/file", "wo/file"});
    const std::string absolute = Path("work/docs/file");
    const struct {
        const char* workingDirectory;
        std::string currentDirectory, path;
        std::set<std::string> listed;
    } kCases[] = {
        {"work", Path("work"), "docs", {"docs/file"}},
        {"work", Path("work") + "/", "docs/", {"docs/file"}},
        {"work/docs", Path("work/docs"), ".", {"./file"}},
        {"work", Path("wo"), "docs", {absolute}}, // a name that begins alike is another folder
        {"work", Path("wo/elsewhere"), "docs", {absolute}},
        {"work", "", "docs", {}}, // without its "/" the path leads nowhere from here
        {"work", Path("work"), "", {}},
        {"work", Path("wo"), Path("work/docs"), {absolute}},
    };
    for (const auto& [workingDirectory, currentDirectory, path, listed] : kCases) {
        WorkIn(workingDirectory);
        GetFileSystem()->SetCurrentDirectory(currentDirectory.c_str());
        dynamic_block_array<FileEntryInfo, 32> out(kMemLabelFileList);
        EXPECT_TRUE(Mac().Enumerate(path.c_str(), &out, false, nullptr, kFileEnumerationAll));
        std::set<std::string> names;
        for (size_t i = 0; i < out.size(); ++i)
            names.insert(out[i].path);
        EXPECT_EQ(names, listed) << path << " in " << currentDirectory;
    }
    WorkIn("/");
    const std::string path = Path("work/docs").substr(1);
    EXPECT_EQ(ListPath(path, false).Names(), (std::set<std::string>{"file"})) << "the root ends with a separator";
    GetFileSystem()->SetCurrentDirectory("");
    EXPECT_EQ(ListPath(path, false).Names(), (std::set<std::string>{"file"}));
}

TEST_F(EnumerateTest, SummingAddsTheSizesOfFiles) {
    WriteFiles({"a", "folder/b", "folder/c", "skipped~"});
    constexpr UInt32 kSum = kFileEnumerationSumSizes | kFileEnumerationSkipByName;
    const Listing listing = List("", true, kSum);
    EXPECT_TRUE(listing.answer);
    EXPECT_EQ(listing.sum, 15u);
    EXPECT_EQ(listing.Names(), std::set<std::string>());
    EXPECT_TRUE(Contains(listing.printed, "Filesystem does not support storing size during enumeration outside of "
                                          "Zarvo Editor."));
    EXPECT_FALSE(Contains(listing.printed, "handlerData"));

    void* noCounter = nullptr;
    for (void** handlerData : {static_cast<void**>(nullptr), &noCounter}) {
        ConsoleCapture console;
        EXPECT_TRUE(Mac().Enumerate(Path("folder").c_str(), nullptr, false, handlerData, kFileEnumerationSumSizes));
        EXPECT_TRUE(Contains(console.Text(), "Assertion failed on expression: 'handlerData != NULL'"));
    }
}

TEST_F(EnumerateTest, ErrorInTheMiddleKeepsWhatCameBefore) {
    WriteFiles({"other1", "folder/1", "folder/2", "folder/3", "folder/4", "other2"});
    gStandinFaults.listingError = EIO;
    gStandinFaults.recordsBeforeListingError = 3;
    const Listing listing = List("folder");
    EXPECT_FALSE(listing.answer);
    EXPECT_EQ(listing.order.size(), 3u);
    EXPECT_EQ(listing.printed, "Error (Input/output error) occured whilst enumerating " + Path("folder") + "\n");

    gStandinFaults.recordsBeforeListingError = 3;
    const Listing recursive = List("", true);
    EXPECT_TRUE(recursive.answer) << "a folder further down does not count";
    EXPECT_EQ(recursive.printed, listing.printed);
    EXPECT_EQ(recursive.Names().count("other1") + recursive.Names().count("other2"), 2u) << "the rest is listed";
}

TEST_F(EnumerateTest, EntryThatCannotBeReadIsPrintedAndLeftOut) {
    const std::string name(30, 'b'); // of a shorter one the record would be reported as too short besides
    WriteFiles({"a", name.c_str(), "c"});
    gStandinFaults.entryErrorName = name;
    const Listing listing = List("");
    EXPECT_TRUE(listing.answer);
    EXPECT_EQ(listing.Names(), (std::set<std::string>{"a", "c"}));
    EXPECT_TRUE(listing.printed.starts_with("Error (")) << listing.printed;
    EXPECT_TRUE(listing.printed.ends_with(") occured whilst enumerating " + Path("") + "\n")) << listing.printed;
}

TEST_F(EnumerateTest, BufferGrowsUntilARecordFits) {
    WriteFiles({"a", "b"});
    gStandinFaults.callsTooSmall = 10;
    const Listing listing = List("");
    EXPECT_TRUE(listing.answer);
    EXPECT_EQ(listing.Names(), (std::set<std::string>{"a", "b"}));
    EXPECT_EQ(listing.printed, "");
}

TEST_F(EnumerateTest, BufferGrowsToOneGibibyteAndNoFurther) {
#if defined(__has_feature)
#if __has_feature(thread_sanitizer)
    GTEST_SKIP() << "takes several times the memory here";
#endif
#endif
    WriteFiles({"a"});
    constexpr int kDoublings = 18; // from 4,096 bytes
    gStandinFaults.callsTooSmall = kDoublings;
    EXPECT_TRUE(List("").answer);
    gStandinFaults.callsTooSmall = kDoublings + 1;
    const Listing listing = List("");
    EXPECT_FALSE(listing.answer);
    EXPECT_EQ(listing.printed, "Error (Numerical result out of range) occured whilst enumerating " + Path("") + "\n");
}

TEST_F(EnumerateTest, MissingAttributesAreReported) {
    WriteFiles({"a", "b"});
    chflags(Path("a").c_str(), UF_HIDDEN);
    gStandinFaults.alteredName = "a";
    const struct {
        UInt32 common, file;
        const char* reported;
        UInt32 listingFlags;
        bool listed;
        UInt64 size;
        int flags;
    } kCases[] = {
        {ATTR_CMN_NAME, 0, "entry.returned.commonattr & ATTR_CMN_NAME", 0, false, 0, 0},
        {ATTR_CMN_OBJTYPE, 0, "entry.returned.commonattr & ATTR_CMN_OBJTYPE", 0, true, 5, kFileEntryIsHidden},
        {ATTR_CMN_MODTIME, 0, "entry.returned.commonattr & ATTR_CMN_MODTIME", 0, true, 5, kFileEntryIsHidden},
        {ATTR_CMN_FLAGS, 0, "entry.returned.commonattr & ATTR_CMN_FLAGS", 0, true, 5, 0},
        {0, ATTR_FILE_TOTALSIZE, "", 0, true, 0, kFileEntryIsHidden},
        {0, ATTR_FILE_TOTALSIZE, "entry.returned.fileattr & ATTR_FILE_TOTALSIZE", 0x80, false, 0, 0},
    };
    for (const auto& [common, file, reported, listingFlags, listed, size, flags] : kCases) {
        gStandinFaults.missingCommon = common;
        gStandinFaults.missingFile = file;
        const Listing listing = List("", false, listingFlags);
        EXPECT_TRUE(listing.answer) << reported;
        EXPECT_TRUE(Contains(listing.printed, reported)) << listing.printed;
        EXPECT_EQ(listing.sum, listingFlags ? 5u : 0u) << reported;
        EXPECT_EQ(listing.Names().count("b"), listingFlags ? 0u : 1u) << reported;
        EXPECT_EQ(listing.Names().count("a"), listed ? 1u : 0u) << reported;
        if (!listed) continue;
        EXPECT_EQ(listing.entries.at("a").size, size) << reported;
        EXPECT_EQ(listing.entries.at("a").flags, flags) << reported;
    }
}

// A cut record is used as far as it goes, and the next one is found behind it.
TEST_F(EnumerateTest, RecordsOfAnyLengthAreHandled) {
    constexpr UInt32 kNameOffset = 64, kWholeRecord = 72;
    WriteFiles({"a", "b", "c"});
    gStandinFaults.alteredName = "b";
    gStandinFaults.cut = true;
    for (UInt32 length = 0; length <= kWholeRecord; ++length) {
        gStandinFaults.cutLength = length;
        const Listing listing = List("");
        EXPECT_TRUE(listing.answer) << length;
        EXPECT_EQ(Contains(listing.printed, "Trying to copy too much data from getattrlistbulk attribute buffer"),
                  length < 60)
            << length;
        EXPECT_EQ(listing.Names().count("b"), length > kNameOffset ? 1u : 0u) << length;
        if (length < sizeof(UInt32)) {
            EXPECT_FALSE(Contains(listing.printed, "Assertion failed")) << length;
        }
        if (length >= sizeof(UInt32)) {
            EXPECT_EQ(listing.order.size(), length > kNameOffset ? 3u : 2u) << length;
        }
    }
    gStandinFaults.cutLength = 0xFFFFFFFF;
    EXPECT_EQ(List("").Names().count("b"), 1u) << "a length that leads out of the buffer";

    mkdir(Path("d").c_str(), 0755);
    gStandinFaults.alteredName = "d";
    gStandinFaults.cutLength = 58; // of a folder this is all but the padding
    const Listing listing = List("");
    EXPECT_EQ(listing.entries.at("d").flags, kFileEntryIsDirectory);
    EXPECT_TRUE(Contains(listing.printed, "Trying to copy too much data"));
}

TEST_F(EnumerateTest, PathsThatDoNotFitAreCutAndTerminated) {
    std::string folder = "folder";
    while (Path(folder).size() < 900)
        folder += "/" + std::string(100, 'x');
    const std::string name(1039 - Path(folder).size(), 'n'); // with its separator one character too long
    std::filesystem::create_directories(Path(folder));
    WriteFile(folder + "/" + name, "");
    WriteFile(folder + "/" + name.substr(1), "");
    const Listing listing = List(folder);
    EXPECT_EQ(listing.order, (std::vector<std::string>{name.substr(1), name.substr(1)}));

    FileSystemEntry entry = Entry("folder");
    EXPECT_FALSE(Mac().Delete(entry, true)) << "what has no name to delete it by stays";
    EXPECT_EQ(Tree(folder).count(name), 1u);
}

TEST_F(EnumerateTest, LargeTreesAreListedCopiedAndDeletedWhole) {
    constexpr int kFiles = 10'000, kDepth = 200;
    for (int i = 0; i < kFiles; ++i)
        WriteFile("tree/many/" + std::to_string(i), "");
    std::string deep = "tree";
    for (int i = 0; i < kDepth; ++i)
        deep += "/d";
    WriteFile(deep + "/end", "");
    WriteFile("tree/" + std::string(255, 'n'), "");
    WriteFile("tree/\xFF\xFE", "");
    symlink("nowhere", Path("tree/dangling").c_str());
    symlink(".", Path("tree/loop").c_str());

    const std::set<std::string> tree = Tree("tree");
    ASSERT_EQ(tree.size(), static_cast<size_t>(kFiles + kDepth + 6));
    const Listing listing = List("tree", true);
    EXPECT_TRUE(listing.answer);
    EXPECT_TRUE(listing.Names() == tree);
    EXPECT_EQ(listing.order.size(), tree.size());

    FileSystemEntry from = Entry("tree"), to = Entry("copy");
    EXPECT_TRUE(Mac().Copy(from, to));
    EXPECT_TRUE(Tree("copy") == tree);
    EXPECT_TRUE(Mac().Delete(from, true));
    EXPECT_FALSE(std::filesystem::exists(Path("tree")));
    EXPECT_TRUE(Tree("copy") == tree);
}

// However the folder's path is written, its listing's paths may be written in another way.
TEST_F(EnumerateTest, FoldersAreDeletedWholeAndNothingElseIs) {
    WorkIn("");
    for (const char* path : {"docs", "./docs", "docs///", "././docs"}) {
        SCOPED_TRACE(path);
        WriteFile("other", "");
        WriteFile("docs/a", "");
        WriteFile("docs/..\\other", "");
        FileSystemEntry entry{core::string_ref(path)};
        EXPECT_FALSE(Mac().Delete(entry, true)) << "the name with the backslash stays";
        EXPECT_EQ(Tree(""), (std::set<std::string>{"docs", "docs/..\\other", "other"}));
        std::filesystem::remove(Path("docs/..\\other"));
        WriteFile("docs/a", "");
        EXPECT_TRUE(Mac().Delete(entry, true));
        EXPECT_EQ(Tree(""), (std::set<std::string>{"other"}));
    }
}

} // namespace
