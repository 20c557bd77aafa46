// What the macOS back end does in its own way, over its stand-in. Each test works in a fresh folder, which is HOME too,
// and starts without faults.
#include "PlatformDependent/OSX/Platform.h"
#include "PlatformDependent/OSX/Standin/Faults.h"
#include "PlatformDependent/OSX/StringConversions.h"
#include "Runtime/Utilities/FileUtilities.h"
#include "Tests/Runtime/VirtualFileSystem/LocalDiskTest.h"

#include <filesystem>

extern "C" void __tsan_init() __attribute__((weak)); // defined only under the thread sanitizer

class LocalFileSystemOSXTest : public LocalDiskTest {
protected:
    LocalFileSystemOSXTest() { setenv("HOME", folder.Path().c_str(), 1); }

    LocalFileSystemHandler& mac = local;
    const ScopedFaults m_Faults;
    const AutoreleasePool m_Pool;
};

TEST_F(LocalFileSystemOSXTest, AQueryTellsTheFileFlag) {
    constexpr UInt32 kStatus = kFileEntryQueryDirectory | kFileEntryQuerySize | kFileEntryQueryLastModified;
    Run("touch plain shy");
    EXPECT_EQ(0, chflags("shy", UF_HIDDEN));
    struct {
        const char* name;
        UInt32 query, answer;
        int flagsBefore, flags;
    } const kCases[] = {
        {"plain", kFileEntryQueryHidden, kFileEntryQueryHidden, kHidden, 0},
        {"shy", kFileEntryQueryHidden, kFileEntryQueryHidden, 0, kHidden},
        {"shy", kFileEntryQueryHidden | kFileEntryQuerySize, kFileEntryQueryHidden | kStatus, 0, kHidden},
        {"none", kFileEntryQueryHidden, kFileEntryQueryNone, 0, 0},
    };
    for (const auto& c : kCases) {
        SCOPED_TRACE(testing::Message() << c.name << ", query " << c.query);
        FileEntryInfo info;
        info.flags = static_cast<UInt8>(c.flagsBefore);
        EXPECT_EQ(c.answer, mac.GetFileEntryInfo(Entry(c.name), info, FileEntryInfoQueryFlags(c.query)));
        EXPECT_EQ(c.flags, info.flags);
        EXPECT_EQ(c.flags != 0, mac.IsHidden(Entry(c.name)));
    }
}

TEST_F(LocalFileSystemOSXTest, FiltersLookAtTheFileFlagAlone) {
    Run("mkdir -p d/.sub d/shut/in; touch d/a d/.dot d/shy");
    EXPECT_EQ(0, chflags("d/shy", UF_HIDDEN));
    EXPECT_EQ(0, chflags("d/shut", UF_HIDDEN));
    const std::vector<Listed> kExpected = {
        {.path = "d/.dot", .flags = kHidden}, {.path = "d/.sub", .flags = kFolder | kHidden}, {.path = "d/a"}};
    EXPECT_EQ(kExpected, List("d", kFileEnumerationSkipHiddenFiles | kFileEnumerationSkipHiddenFolders).entries);
}

TEST_F(LocalFileSystemOSXTest, ThereIsNoListingWithoutAPath) {
    EXPECT_FALSE(mac.Enumerate(nullptr, nullptr, false, nullptr, kFileEnumerationAll));
}

TEST_F(LocalFileSystemOSXTest, ARelativeListingIsRelativeAgain) {
    const std::string top = folder / "", fromRoot = top.substr(1) + "docs";
    Run("mkdir -p docs do; touch docs/x; mkdir -p \"$(printf '\\377')/docs\"; touch \"$(printf '\\377')/docs/x\"");
    const struct {
        std::string workingDirectory, currentDirectory, path, listed;
    } kCases[] = {
        {.workingDirectory = top, .currentDirectory = folder.Path(), .path = "docs/", .listed = "docs/x"},
        {.workingDirectory = top, .currentDirectory = top + "do", .path = "docs", .listed = top + "docs/x"},
        {.workingDirectory = top + "docs", .currentDirectory = top + "docs", .path = ".", .listed = "./x"},
        {.workingDirectory = top, .currentDirectory = "", .path = "\xFF/docs", .listed = "\xFF/docs/x"},
        {.workingDirectory = top + "\xFF", .currentDirectory = top + "\xFF", .path = "docs", .listed = "docs/x"},
        {.workingDirectory = "/", .currentDirectory = "/", .path = fromRoot, .listed = fromRoot + "/x"},
        {.workingDirectory = "/", .currentDirectory = "", .path = fromRoot, .listed = fromRoot + "/x"},
    };
    for (const auto& c : kCases) {
        WorkIn(c.workingDirectory, c.currentDirectory);
        EXPECT_EQ((std::vector<Listed>{{.path = c.listed}}), List(c.path).entries)
            << c.path << " in " << c.workingDirectory << ", current " << c.currentDirectory;
    }
}

// A folder of which one entry, with a name that is long enough for its record never to count as too short, is altered.
class ListingFaultsTest : public LocalFileSystemOSXTest {
protected:
    ListingFaultsTest() {
        Run("mkdir -p d/sub; printf 1 > d/a; printf 12 > d/sub/in; printf 1234 > d/" + altered);
        EXPECT_EQ(0, chflags(("d/" + altered).c_str(), UF_HIDDEN));
    }

    std::vector<Listed> Others() const {
        return {{.path = "d/a", .size = 1}, {.path = "d/sub", .flags = kFolder}, {.path = "d/sub/in", .size = 2}};
    }
    std::vector<Listed> OthersAnd(const Listed& entry) const {
        std::vector<Listed> entries = Others();
        entries.push_back(entry);
        return entries;
    }

    const std::string altered = std::string(30, 'z');
    const Listed whole = {.path = "d/" + altered, .size = 4, .flags = kHidden};
};

TEST_F(ListingFaultsTest, AnErrorIsPrintedAndEndsItsFolderAlone) {
    const struct {
        int recordsBefore, error;
        bool answer;
        std::vector<Listed> entries;
        std::string printed;
    } kCases[] = {
        {.recordsBefore = 0,
         .error = EIO,
         .answer = false,
         .entries = {},
         .printed = "Error (Input/output error) occured whilst enumerating d\n"},
        {.recordsBefore = 0,
         .error = EINTR,
         .answer = false,
         .entries = {},
         .printed = "Error (Interrupted system call) occured whilst enumerating d\n"},
        {.recordsBefore = 4,
         .error = EIO,
         .answer = true,
         .entries = OthersAnd(whole),
         .printed = "Error (Input/output error) occured whilst enumerating d/sub\n"},
    };
    for (const auto& c : kCases) {
        gStandinFaults = {.recordsBeforeListingError = c.recordsBefore, .listingError = c.error};
        const Listing listing = List("d");
        EXPECT_EQ(c.answer, listing.answer) << c.printed;
        EXPECT_EQ(c.entries, listing.entries) << c.printed;
        EXPECT_EQ(c.printed, listing.printed);
    }
}

TEST_F(ListingFaultsTest, TheBufferGrowsUntilARecordFits) {
    gStandinFaults = {.callsTooSmall = 10};
    const Listing listing = List("d");
    EXPECT_EQ(OthersAnd(whole), listing.entries);
    EXPECT_EQ("", listing.printed);
}

TEST_F(ListingFaultsTest, TheBufferStopsGrowingAtItsLimit) {
    if (__tsan_init != nullptr) GTEST_SKIP() << "a gigabyte is too much under the thread sanitizer";
    gStandinFaults = {.callsTooSmall = 100};
    const Listing listing = List("d");
    EXPECT_FALSE(listing.answer);
    EXPECT_EQ("Error (Numerical result out of range) occured whilst enumerating d\n", listing.printed);
    EXPECT_EQ(100 - 19, gStandinFaults.callsTooSmall) << "one call with 4,096 bytes, and one per doubling to 2^30";
}

TEST_F(ListingFaultsTest, AnEntryWithoutANameIsReportedAndLeftOut) {
    const std::string kError = ") occured whilst enumerating d\n",
                      kNoName = "'entry.returned.commonattr & ATTR_CMN_NAME'";
    const struct {
        StandinFaults faults;
        std::string printed;
    } kCases[] = {
        {{.entryErrorName = altered}, kError},
        {{.alteredName = altered, .missingCommon = ATTR_CMN_NAME}, kNoName},
        {{.alteredName = altered, .movedName = 0x40000000}, kNoName}, // out of the record
        {{.alteredName = altered, .movedName = -0x40000000}, kNoName},
    };
    for (const auto& c : kCases) {
        gStandinFaults = c.faults;
        const Listing listing = List("d");
        EXPECT_TRUE(listing.answer);
        EXPECT_EQ(Others(), listing.entries) << c.printed << c.faults.movedName;
        EXPECT_NE(std::string::npos, listing.printed.find(c.printed)) << c.faults.movedName << ": " << listing.printed;
    }
}

TEST_F(ListingFaultsTest, AMissingAttributeIsReported) {
    const struct {
        uint32_t attribute;
        const char* reported;
        Listed entry;
    } kCases[] = {
        {ATTR_CMN_OBJTYPE, "'entry.returned.commonattr & ATTR_CMN_OBJTYPE'", whole},
        {ATTR_CMN_MODTIME, "'entry.returned.commonattr & ATTR_CMN_MODTIME'", whole},
        {ATTR_CMN_FLAGS, "'entry.returned.commonattr & ATTR_CMN_FLAGS'", {.path = whole.path, .size = whole.size}},
    };
    for (const auto& c : kCases) {
        gStandinFaults = {.alteredName = altered, .missingCommon = c.attribute};
        const Listing listing = List("d");
        EXPECT_EQ(OthersAnd(c.entry), listing.entries) << c.reported;
        EXPECT_NE(std::string::npos, listing.printed.find(c.reported)) << listing.printed;
    }
}

TEST_F(ListingFaultsTest, AMissingSizeIsReportedWhenSumming) {
    gStandinFaults = {.alteredName = altered, .missingFile = ATTR_FILE_TOTALSIZE};
    const Listing listing = List("d");
    EXPECT_EQ(OthersAnd({.path = whole.path, .flags = kHidden}), listing.entries);
    EXPECT_EQ("", listing.printed);
    const Listing summed = List("d", kFileEnumerationSumSizes);
    EXPECT_EQ(3u, m_Sum);
    EXPECT_NE(std::string::npos, summed.printed.find("'entry.returned.fileattr & ATTR_FILE_TOTALSIZE'"))
        << summed.printed;
}

// A cut record is used as far as it goes. The next one is found after it, unless the length can't be true.
TEST_F(LocalFileSystemOSXTest, RecordsOfAnyLengthAreHandled) {
    constexpr UInt32 kLengthSize = 4, kFixedSize = 60, kNameAt = 64, kWholeSize = 72;
    Run("mkdir d; cd d; touch a b c");
    for (UInt32 length = 0; length <= kWholeSize; ++length) {
        SCOPED_TRACE(length);
        gStandinFaults = {.alteredName = "b", .cut = true, .cutLength = length};
        const Listing listing = List("d");
        std::vector<Listed> expected = {{.path = "d/a"}, {.path = "d/c"}};
        if (length > kNameAt) expected.insert(expected.begin() + 1, {.path = "d/b"});
        if (length >= kLengthSize) {
            EXPECT_EQ(expected, listing.entries);
        }
        const auto reports = [&](const char* text) { return listing.printed.find(text) != std::string::npos; };
        EXPECT_EQ(length < kFixedSize, reports("Trying to copy too much data from getattrlistbulk attribute buffer"));
        EXPECT_EQ(length >= kLengthSize && length <= kNameAt, reports("ATTR_CMN_NAME"));
    }
}

TEST_F(LocalFileSystemOSXTest, ARecordThatLeadsOutOfTheBufferIsTheLast) {
    Run("mkdir d; touch d/b");
    gStandinFaults = {.alteredName = "b", .cut = true, .cutLength = UINT32_MAX};
    EXPECT_EQ((std::vector<Listed>{{.path = "d/b"}}), List("d").entries);
}

TEST_F(LocalFileSystemOSXTest, AResolvedPathThatIsCutIsNotTrashed) {
    const std::string x(200, 'x'), deep = folder / "d/" + x + "/" + x + "/" + x + "/" + x;
    const std::string tooLong = deep + "/" + std::string(kMaxPathLength - deep.size(), 'n');
    const std::string cut = tooLong.substr(0, kMaxPathLength);
    Run("mkdir -p " + deep + "; touch " + cut + " " + tooLong + "; ln -s " + tooLong + " way");
    FileSystemEntry target, way = Entry("way");
    EXPECT_TRUE(mac.Target(way, target));
    EXPECT_EQ(cut, target.Path());
    EXPECT_FALSE(mac.MoveToTrash(way));
    EXPECT_EQ(cut, way.Path());
    EXPECT_TRUE(IsThere(cut));
    EXPECT_FALSE(DeleteFileOrDirectory(tooLong.c_str()));
    EXPECT_TRUE(IsThere(cut));
    Run("test -e " + tooLong);
}

TEST_F(LocalFileSystemOSXTest, TheHiddenMarkIsAFileFlag) {
    constexpr UInt32 kOtherFlag = 1;
    // The flags of the last two can't be written to an attribute.
    Run("touch file closed; mkfifo pipe; chmod 444 closed; test $(id -u) != 0 || chown 65534 file closed pipe");
    WorkAsAnyUser();
    struct {
        UInt32 mask, flags;
        bool isHidden;
    } const kSteps[] = {
        {.mask = 0, .flags = 0, .isHidden = false},       {.mask = kHidden, .flags = kHidden, .isHidden = true},
        {.mask = 0, .flags = 0, .isHidden = true},        {.mask = 0x0B, .flags = 0x02, .isHidden = true},
        {.mask = kHidden, .flags = 0, .isHidden = false}, {.mask = 0, .flags = kHidden, .isHidden = true},
        {.mask = 0xFF, .flags = 0, .isHidden = false},
    };
    for (const char* name : {"file", "closed", "pipe"}) {
        FileSystemEntry entry = Entry(name);
        EXPECT_EQ(0, chflags(name, kOtherFlag));
        for (const auto& step : kSteps) {
            SCOPED_TRACE(testing::Message() << name << ", mask " << step.mask << ", flags " << step.flags);
            PlatformStatus status = {};
            EXPECT_TRUE(mac.SetFlags(entry, step.mask, step.flags));
            EXPECT_EQ(0, PlatformStat(name, &status));
            EXPECT_EQ(step.isHidden ? UF_HIDDEN | kOtherFlag : kOtherFlag, status.st_flags);
            EXPECT_EQ(step.isHidden, mac.IsHidden(entry));
        }
    }
}

TEST_F(LocalFileSystemOSXTest, FlagsThatCantBeSetAreReported) {
    Run("touch file");
    FileSystemEntry file("file"), none("none");
    gStandinFaults.chflagsError = EPERM;
    const ConsoleCapture console;
    EXPECT_TRUE(mac.SetFlags(file, kHidden, 0)) << "unchanged flags are not set";
    EXPECT_FALSE(mac.SetFlags(none, kHidden, kHidden)) << "it has none";
    EXPECT_EQ("", console.Text());
    EXPECT_FALSE(mac.SetFlags(file, kHidden, kHidden));
    EXPECT_NE(std::string::npos, console.Text().find("Failed to change file flags for 'file'. errno: 1"))
        << console.Text();
}

TEST_F(LocalFileSystemOSXTest, CreatesNoFileUnderAPathThatIsNotUtf8) {
    FileSystemEntry entry = Entry("\xFF");
    EXPECT_FALSE(mac.CreateAsFile(entry));
    EXPECT_EQ(std::vector<Listed>(), List(".").entries);
}

TEST_F(LocalFileSystemOSXTest, TheTrashTakesWhatThePathLeadsTo) {
    Run("mkdir -p a b folder/sub; touch a/name b/name folder/sub/file target; ln -s target link");
    struct {
        const char *name, *resolved;
    } const kCases[] = {{"a/name", "a/name"}, {"b/name", "b/name"}, {"folder", "folder"}, {"link", "target"}};
    for (const auto& c : kCases) {
        FileSystemEntry entry = Entry(c.name);
        EXPECT_TRUE(mac.MoveToTrash(entry)) << c.name;
        EXPECT_EQ(folder / c.resolved, entry.Path());
        EXPECT_FALSE(IsThere(c.resolved));
    }
    Run("cd .Trash; test -e name; test -e 'name 2'; test -e target; test -e folder/sub/file");
    EXPECT_TRUE(IsThere("link"));
}

TEST_F(LocalFileSystemOSXTest, TheTrashRefusesPathsThatCouldMislead) {
    Run("mkdir x; touch 'x\\y' x/y; ln -s none lost; ln -s 'x\\y' way");
    Run("mkdir p; touch p/$(printf '\\377') $(printf '\\377'); ln -s p/$(printf '\\377') out");
    struct {
        const char* name;
        std::string resolved; // also on failure
    } const kCases[] = {
        {.name = "none", .resolved = folder / "none"},
        {.name = "lost", .resolved = folder / "none"},
        {.name = "way", .resolved = folder / "x\\y"},
        {.name = "out", .resolved = folder / "p/\xFF"},
        {.name = "\xFF", .resolved = ""},
        {.name = "/", .resolved = "/"},
    };
    for (const auto& c : kCases) {
        FileSystemEntry entry = Entry(c.name);
        EXPECT_FALSE(mac.MoveToTrash(entry)) << c.name;
        EXPECT_EQ(c.resolved, entry.Path()) << c.name;
    }
    EXPECT_FALSE(IsThere(".Trash"));
    EXPECT_TRUE(IsThere("x/y"));
    EXPECT_TRUE(IsThere("p/\xFF"));
}

TEST_F(LocalFileSystemOSXTest, WhatTheTrashRefusesIsDeleted) {
    Run("mkdir b; touch b/file");
    gStandinFaults.trashRefuses = true;
    FileSystemEntry entry = Entry("b"), stays = Entry("/proc/version");
    EXPECT_TRUE(mac.MoveToTrash(entry));
    EXPECT_FALSE(IsThere("b"));
    EXPECT_FALSE(IsThere(".Trash"));
    EXPECT_FALSE(mac.MoveToTrash(stays)) << "nobody can delete it";
}

TEST_F(LocalFileSystemOSXTest, ACopyTakesAFolderWhole) {
    Run("mkdir -p from/sub/deeper from/$(printf '\\377\\376'); printf 12345 > from/file");
    Run("cd from; touch sub/in $(printf %0255d 0); ln -s file link; ln -s none lost; ln -s . self; ln -s from ../way");
    const std::vector<Listed> entries = List("from").entries;
    EXPECT_EQ(9u, entries.size());
    FileSystemEntry way = Entry("way"), to = Entry("to");
    EXPECT_TRUE(mac.Copy(way, to));
    Run("mv from gone; mv to from");
    EXPECT_EQ(entries, List("from").entries);
    EXPECT_EQ("12345", ReadFile(folder / "from/file"));
}

TEST_F(LocalFileSystemOSXTest, ACopyReplacesNothingAndLeavesNoPart) {
    Run("mkdir from pipes; touch from/file from/$(printf '\\377') pipes/file; printf there > there; mkfifo pipes/pipe");
    Run("ln -s none from/lost");
    struct {
        const char *from, *to;
    } const kCases[] = {
        {"from/file", "there"}, {"there", "there"}, {"there", "from/lost"},   {"there", "none/x"},  {"none", "new"},
        {"/", "new"},           {"pipes", "new"},   {"from", "from/sub/new"}, {"from/\xFF", "new"}, {"there", "\xFF"},
    };
    for (const auto& c : kCases) {
        FileSystemEntry from = Entry(c.from), to = Entry(c.to);
        EXPECT_FALSE(mac.Copy(from, to)) << c.from << " to " << c.to;
        EXPECT_FALSE(IsThere("new")) << c.from << " to " << c.to;
    }
    EXPECT_EQ("there", ReadFile(folder / "there"));
}

TEST_F(LocalFileSystemOSXTest, ACopyIsRelativeToTheCurrentDirectory) {
    Run("mkdir sub; printf data > sub/file");
    WorkIn(folder.Path(), folder / "sub");
    FileSystemEntry from("file"), to("new");
    EXPECT_TRUE(mac.Copy(from, to));
    EXPECT_EQ("data", ReadFile(folder / "sub/new"));
}

TEST_F(LocalFileSystemOSXTest, UserFoldersAreNotCreated) {
    EXPECT_EQ(folder / "Library/Zarvo", mac.GetUserAppDataFolder().c_str());
    EXPECT_EQ(folder / "Library/Caches/com.zarvo3d.ZarvoEditor", mac.GetUserAppCacheFolder().c_str());
    EXPECT_STREQ("/Library/Application Support", mac.GetSharedApplicationDataFolder().c_str());
    EXPECT_EQ(std::vector<Listed>(), List(".").entries);
}

// The application path is kept until the process ends: no other test may ask for it.
TEST_F(LocalFileSystemOSXTest, TheBundleIsAskedForUntilItIsKnown) {
    const std::filesystem::path program = std::filesystem::read_symlink("/proc/self/exe");
    const std::filesystem::path bundle = program.parent_path();
    EXPECT_EQ(program, mac.GetExecutablePath().c_str());
    gStandinFaults.emptyBundlePath = true;
    EXPECT_STREQ("Contents", mac.GetApplicationContentsPath().c_str());
    gStandinFaults.emptyBundlePath = false;
    EXPECT_EQ(bundle, mac.GetApplicationPath().c_str());
    gStandinFaults.emptyBundlePath = true;
    EXPECT_EQ(bundle / "Contents/Managed", mac.GetApplicationManagedPath().c_str()) << "from the path that was kept";
    EXPECT_EQ(bundle.parent_path(), mac.GetApplicationFolder().c_str());
}

TEST_F(LocalFileSystemOSXTest, TextThatIsNotUtf8BecomesEmpty) {
    struct {
        const char *text, *converted;
    } const kCases[] = {{"a", "a"}, {"\xC3\xA9", "\xC3\xA9"}, {"", ""}, {"\xC3", ""}};
    for (const auto& c : kCases) {
        const std::string longer = c.text + std::string("x");
        const core::string_ref view(longer.c_str(), longer.size() - 1);
        EXPECT_STREQ(c.converted, NSString_UTF8String(MakeNSString(c.text)));
        EXPECT_STREQ(c.converted, NSString_UTF8String(MakeNSString(core::string(c.text))));
        EXPECT_STREQ(c.converted, NSString_UTF8String(MakeNSString(view)));
    }
    EXPECT_STREQ("", NSString_UTF8String(MakeNSString(static_cast<const char*>(nullptr))));
}

TEST_F(LocalFileSystemOSXTest, NilBecomesAnEmptyText) {
    EXPECT_STREQ("", MakeString(nullptr).c_str());
    EXPECT_EQ(MemLabelId(kMemLabelPathString), MakeString(nullptr).get_memory_label());
}
