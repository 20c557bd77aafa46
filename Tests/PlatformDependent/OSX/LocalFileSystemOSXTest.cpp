// The macOS back end over its stand-in. Each test works in a fresh folder, which is HOME too, and starts without
// faults.
#include "PlatformDependent/OSX/Platform.h"
#include "PlatformDependent/OSX/Standin/Faults.h"
#include "PlatformDependent/OSX/StringConversions.h"
#include "Runtime/Utilities/FileUtilities.h"
#include "Tests/Runtime/VirtualFileSystem/LocalDiskTest.h"
#include "Tests/Support/ConsoleCapture.h"

#include <algorithm>
#include <filesystem>
#include <unistd.h>

extern "C" void __tsan_init() __attribute__((weak)); // defined only under the thread sanitizer

constexpr int kFolder = kFileEntryIsDirectory;
constexpr int kLink = kFileEntryIsSymLink;
constexpr int kHidden = kFileEntryIsHidden;

class LocalFileSystemOSXTest : public LocalDiskTest {
protected:
    LocalFileSystemOSXTest() {
        setenv("HOME", folder.Path().c_str(), 1);
        WorkIn(folder.Path(), folder.Path());
    }
    ~LocalFileSystemOSXTest() override {
        EXPECT_EQ(0, seteuid(getuid()));
        EXPECT_EQ(0, chdir("/"));
    }

    static void WorkIn(const std::string& workingDirectory, const std::string& currentDirectory) {
        ASSERT_EQ(0, chdir(workingDirectory.c_str()));
        GetFileSystem()->SetCurrentDirectory(currentDirectory.c_str());
    }

    // Gives up root's rights, which ignore modes, until the test ends.
    static void WorkAsAnyUser() {
        ASSERT_EQ(0, chmod(".", 0777));
        ASSERT_EQ(0, geteuid() == 0 ? seteuid(65534) : 0);
    }

    struct Listing {
        bool answer;
        std::vector<Listed> entries; // sorted by path
        std::string printed;
    };
    Listing List(const std::string& path, UInt32 flags = kFileEnumerationAll, bool recursive = true) {
        const ConsoleCapture console;
        dynamic_block_array<FileEntryInfo, 32> out(kMemLabelFileList);
        Listing listing;
        listing.answer = mac.Enumerate(path.c_str(), &out, recursive, &m_Counter, FileEnumerationFlag(flags));
        for (size_t index = 0; index < out.size(); ++index)
            listing.entries.push_back({out[index].path, out[index].size, out[index].flags});
        std::sort(listing.entries.begin(), listing.entries.end(),
                  [](const Listed& a, const Listed& b) { return a.path < b.path; });
        listing.printed = console.Text();
        return listing;
    }

    LocalFileSystemHandler& mac = *static_cast<LocalFileSystemHandler*>(GetFileSystem()->GetHandlerForPath("/"));
    UInt64 m_Sum = 0;
    void* m_Counter = &m_Sum;
    const ScopedFaults m_Faults;
    const AutoreleasePool m_Pool;
};

TEST_F(LocalFileSystemOSXTest, AQueryFillsWhatItReports) {
    constexpr UInt32 kStatus = kFileEntryQueryDirectory | kFileEntryQuerySize | kFileEntryQueryLastModified;
    constexpr UInt32 kAll =
        kStatus | kFileEntryQuerySymLink | kFileEntryQueryHidden | kFileEntryQueryReadOnly | kFileEntryQueryExists;
    Run("touch a shy closed; ln -s a link; chmod 444 closed");
    EXPECT_EQ(0, chflags("shy", UF_HIDDEN));
    struct {
        const char* name;
        UInt32 query, answer;
        int flags; // of an info that was marked as hidden
    } const kCases[] = {
        {".", kFileEntryQueryExists | kFileEntryQueryDirectory, kFileEntryQueryExists | kStatus, kFolder | kHidden},
        {"none", kFileEntryQueryExists | kFileEntryQueryDirectory, kFileEntryQueryNone, kHidden},
        {"a", kFileEntryQueryNone, kFileEntryQueryNone, kHidden},
        {"a", kFileEntryQueryExists, kFileEntryQueryExists, kHidden},
        {"a", kFileEntryQueryHidden, kFileEntryQueryHidden, 0},
        {"shy", kFileEntryQueryHidden, kFileEntryQueryHidden, kHidden},
        {"link", kAll, kAll, kLink},
        {"closed", kFileEntryQueryReadOnly, kStatus | kFileEntryQueryReadOnly, kFileEntryIsReadOnly | kHidden},
    };
    for (const auto& c : kCases) {
        FileEntryInfo info;
        info.flags = kHidden;
        EXPECT_EQ(c.answer, mac.GetFileEntryInfo(Entry(c.name), info, FileEntryInfoQueryFlags(c.query)))
            << c.name << ", query " << c.query;
        EXPECT_EQ(c.flags, info.flags) << c.name << ", query " << c.query;
    }
}

TEST_F(LocalFileSystemOSXTest, AListingTellsKindsAndSizes) {
    Run("mkdir -p d/sub; cd d; printf 123 > a; touch .dot shy closed; chmod 444 closed");
    Run("cd d; ln -s a link; ln -s sub way; ln -s none lost");
    EXPECT_EQ(0, chflags("d/shy", UF_HIDDEN));
    const std::vector<Listed> kExpected = {
        {.path = "d/.dot", .flags = kHidden},
        {.path = "d/a", .size = 3},
        {.path = "d/closed"},
        {.path = "d/link", .size = 1, .flags = kLink},
        {.path = "d/lost", .size = 4, .flags = kLink},
        {.path = "d/shy", .flags = kHidden},
        {.path = "d/sub", .flags = kFolder},
        {.path = "d/way", .flags = kFolder | kLink},
    };
    const Listing listing = List("d");
    EXPECT_EQ(kExpected, listing.entries);
    EXPECT_TRUE(listing.answer);
    EXPECT_EQ("", listing.printed);
}

TEST_F(LocalFileSystemOSXTest, AListingTellsTimes) {
    Run("mkdir -p d/sub; touch -d 2001-02-03 d/sub d/file");
    dynamic_block_array<FileEntryInfo, 32> out(kMemLabelFileList);
    EXPECT_TRUE(mac.Enumerate("d", &out, false, nullptr, kFileEnumerationAll));
    EXPECT_EQ(2u, out.size());
    for (size_t index = 0; index < out.size(); ++index)
        EXPECT_EQ(mac.LastModified(Entry(out[index].path)).ticks, out[index].lastModified.ticks) << out[index].path;
}

TEST_F(LocalFileSystemOSXTest, AFolderIsListedBeforeItsContents) {
    Run("mkdir -p d/d/d");
    dynamic_block_array<FileEntryInfo, 32> out(kMemLabelFileList);
    EXPECT_TRUE(mac.Enumerate("d", &out, true, nullptr, kFileEnumerationAll));
    ASSERT_EQ(2u, out.size());
    EXPECT_STREQ("d/d", out[0].path);
    EXPECT_STREQ("d/d/d", out[1].path);
}

TEST_F(LocalFileSystemOSXTest, FiltersLookAtTheFileFlagAlone) {
    Run("mkdir -p d/sub; touch d/a d/.dot d/shy");
    EXPECT_EQ(0, chflags("d/shy", UF_HIDDEN));
    const std::vector<Listed> kVisibleFiles = {{.path = "d/.dot", .flags = kHidden}, {.path = "d/a"}};
    EXPECT_EQ(kVisibleFiles, List("d", kFileEnumerationSkipHiddenFiles | kFileEnumerationSkipFolders).entries);
    const std::vector<Listed> kOthers = {{.path = "d/shy", .flags = kHidden}, {.path = "d/sub", .flags = kFolder}};
    EXPECT_EQ(kOthers, List("d", kFileEnumerationSkipFiles).entries);
}

TEST_F(LocalFileSystemOSXTest, ASkippedFolderIsNeitherListedNorSummed) {
    Run("mkdir -p d/CVS d/shy d/sub; for f in back~ CVS/in shy/in sub/in; do printf 1 > d/$f; done");
    EXPECT_EQ(0, chflags("d/shy", UF_HIDDEN));
    constexpr FileEnumerationFlag kSkip = kFileEnumerationSkipHiddenFolders | kFileEnumerationSkipByName;
    const std::vector<Listed> kExpected = {{.path = "d/sub", .flags = kFolder}, {.path = "d/sub/in", .size = 1}};
    EXPECT_EQ(kExpected, List("d", kSkip).entries);
    EXPECT_EQ(std::vector<Listed>(), List("d", kSkip | kFileEnumerationSumSizes).entries);
    EXPECT_EQ(1u, m_Sum);
}

TEST_F(LocalFileSystemOSXTest, SummingIsReported) {
    Run("mkdir d; touch d/a");
    const std::string printed = List("d", kFileEnumerationSumSizes).printed;
    EXPECT_NE(std::string::npos, printed.find("Filesystem does not support storing size during enumeration outside "
                                              "of Zarvo Editor."))
        << printed;
}

TEST_F(LocalFileSystemOSXTest, SummingWithoutACounterIsReported) {
    Run("mkdir d; touch d/a");
    for (void** const handlerData : {static_cast<void**>(nullptr), &m_Counter}) {
        m_Counter = nullptr;
        const ConsoleCapture console;
        EXPECT_TRUE(mac.Enumerate("d", nullptr, false, handlerData, kFileEnumerationSumSizes));
        EXPECT_NE(std::string::npos, console.Text().find("Assertion failed on expression: 'handlerData != NULL'"))
            << console.Text();
    }
}

TEST_F(LocalFileSystemOSXTest, AFolderThatCantBeOpenedIsListedAsEmpty) {
    Run("mkdir -p d/shut/in; chmod 0 d/shut");
    WorkAsAnyUser();
    const Listing shut = List("d");
    EXPECT_TRUE(shut.answer);
    EXPECT_EQ((std::vector<Listed>{{.path = "d/shut", .flags = kFolder}}), shut.entries);
    const Listing none = List("none");
    EXPECT_TRUE(none.answer);
    EXPECT_EQ(std::vector<Listed>(), none.entries);
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

TEST_F(LocalFileSystemOSXTest, ARelativeUrlNeedsAWorkingDirectory) {
    Run("mkdir gone");
    WorkIn(folder / "gone", folder.Path());
    Run("rmdir gone");
    EXPECT_STREQ("", NSURL_fileSystemRepresentation(NSURL_fileURLWithPath(NSString_stringWithUTF8String("x"))));
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

TEST_F(ListingFaultsTest, AListingErrorIsPrinted) {
    const struct {
        int error;
        std::string printed;
    } kCases[] = {
        {.error = EIO, .printed = "Error (Input/output error) occured whilst enumerating d\n"},
        {.error = EINTR, .printed = "Error (Interrupted system call) occured whilst enumerating d\n"},
    };
    for (const auto& c : kCases) {
        gStandinFaults = {.recordsBeforeListingError = 0, .listingError = c.error};
        const Listing listing = List("d");
        EXPECT_FALSE(listing.answer) << c.printed;
        EXPECT_EQ(std::vector<Listed>(), listing.entries) << c.printed;
        EXPECT_EQ(c.printed, listing.printed);
    }
}

TEST_F(ListingFaultsTest, AnErrorDeeperDownEndsThatFolderAlone) {
    gStandinFaults = {.recordsBeforeListingError = 4, .listingError = EIO};
    const Listing listing = List("d");
    EXPECT_TRUE(listing.answer);
    EXPECT_EQ(OthersAnd(whole), listing.entries);
    EXPECT_EQ("Error (Input/output error) occured whilst enumerating d/sub\n", listing.printed);
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

TEST_F(ListingFaultsTest, AnEntryWithAnErrorIsLeftOut) {
    gStandinFaults = {.entryErrorName = altered};
    const Listing listing = List("d");
    EXPECT_TRUE(listing.answer);
    EXPECT_EQ(Others(), listing.entries);
    EXPECT_TRUE(listing.printed.ends_with(") occured whilst enumerating d\n")) << listing.printed;
}

TEST_F(ListingFaultsTest, AnEntryWithoutANameIsReported) {
    const StandinFaults kCases[] = {
        {.alteredName = altered, .missingCommon = ATTR_CMN_NAME},
        {.alteredName = altered, .movedName = 0x40000000}, // out of the record
        {.alteredName = altered, .movedName = -0x40000000},
    };
    for (const StandinFaults& faults : kCases) {
        gStandinFaults = faults;
        const Listing listing = List("d");
        EXPECT_EQ(Others(), listing.entries) << faults.movedName;
        EXPECT_NE(std::string::npos, listing.printed.find("'entry.returned.commonattr & ATTR_CMN_NAME'"))
            << faults.movedName << ": " << listing.printed;
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

TEST_F(LocalFileSystemOSXTest, ListsCopiesAndDeletesBigTrees) {
    Run("mkdir -p d$(printf '/d%.0s' $(seq 199)) d/many d/$(printf '\\377\\376'); cd d/many; seq 10000 | xargs touch");
    Run("touch d/$(printf %0255d 0); ln -s none d/lost; ln -s . d/self");
    const std::vector<Listed> entries = List("d").entries;
    EXPECT_EQ(199u + 2 + 10'000 + 3, entries.size());
    FileSystemEntry from = Entry("d"), to = Entry("e");
    EXPECT_TRUE(mac.Copy(from, to));
    EXPECT_TRUE(DeleteFileOrDirectory("d"));
    EXPECT_FALSE(IsThere("d"));
    Run("mv e d");
    EXPECT_TRUE(List("d").entries == entries) << "the copy differs"; // too many to print
}

TEST_F(LocalFileSystemOSXTest, AListingEndsInLoopsOfLinks) {
    Run("mkdir -p e/a e/c; touch e/a/x; ln -s ../c e/a/c; ln -s ../a e/c/a; ln -s loop e/loop");
    const std::vector<Listed> kExpected = {
        {.path = "e/a", .flags = kFolder},
        {.path = "e/a/c", .flags = kFolder | kLink},
        {.path = "e/a/c/a", .flags = kFolder | kLink}, // is e/a, which this listing is inside
        {.path = "e/a/x"},
        {.path = "e/c", .flags = kFolder},
        {.path = "e/c/a", .flags = kFolder | kLink},
        {.path = "e/c/a/c", .flags = kFolder | kLink},
        {.path = "e/c/a/x"},
        {.path = "e/loop", .size = 4, .flags = kLink},
    };
    EXPECT_EQ(kExpected, List("e").entries);
}

TEST_F(LocalFileSystemOSXTest, APathThatIsCutIsNotDeleted) {
    const std::string x(200, 'x'), deep = folder / "d/" + x + "/" + x + "/" + x + "/" + x;
    const std::string tooLong = deep + "/" + std::string(kMaxPathLength - deep.size(), 'n');
    const std::string cut = tooLong.substr(0, kMaxPathLength);
    Run("mkdir -p " + deep + "; printf 1 > " + cut + "; printf 12 > " + tooLong + "; ln -s " + tooLong + " way");
    std::vector<Listed> listed = List(deep).entries;
    std::sort(listed.begin(), listed.end(), [](const Listed& a, const Listed& b) { return a.size < b.size; });
    EXPECT_EQ((std::vector<Listed>{{.path = cut, .size = 1}, {.path = cut, .size = 2}}), listed);
    FileSystemEntry target, way = Entry("way");
    EXPECT_TRUE(mac.Target(way, target));
    EXPECT_EQ(cut, target.Path());
    EXPECT_FALSE(mac.MoveToTrash(way));
    EXPECT_EQ(cut, way.Path());
    EXPECT_TRUE(IsThere(cut));
    EXPECT_FALSE(DeleteFileOrDirectory("d"));
    Run("test -e " + tooLong);
}

TEST_F(LocalFileSystemOSXTest, TargetNeedNotExist) {
    Run("touch a; ln -s a link; ln -s none lost");
    struct {
        const char *name, *target;
    } const kCases[] = {{"link", "a"}, {"lost", "none"}, {"none", "none"}};
    for (const auto& c : kCases) {
        FileSystemEntry target;
        EXPECT_TRUE(mac.Target(FileSystemEntry(c.name), target)) << c.name;
        EXPECT_STREQ(c.target, target.Path()) << c.name;
    }
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

TEST_F(LocalFileSystemOSXTest, AMissingFileHasNoFlags) {
    FileSystemEntry none = Entry("none");
    EXPECT_FALSE(mac.SetFlags(none, 0, 0));
    EXPECT_FALSE(mac.IsHidden(none));
}

TEST_F(LocalFileSystemOSXTest, FlagsThatCantBeSetAreReported) {
    Run("touch file");
    FileSystemEntry file("file");
    gStandinFaults.chflagsError = EPERM;
    const ConsoleCapture console;
    EXPECT_TRUE(mac.SetFlags(file, kHidden, 0)) << "unchanged flags are not set";
    EXPECT_EQ("", console.Text());
    EXPECT_FALSE(mac.SetFlags(file, kHidden, kHidden));
    EXPECT_NE(std::string::npos, console.Text().find("Failed to change file flags for 'file'. errno: 1"))
        << console.Text();
}

TEST_F(LocalFileSystemOSXTest, CreateAsFileLeavesWhatExists) {
    Run("printf data > file; ln -s none/x lost");
    struct {
        const char* name;
        bool isCreated;
    } const kCases[] = {{"new", true},   {"file", false},   {".", false},
                        {"lost", false}, {"none/x", false}, {"\xFF", false}};
    for (const auto& c : kCases) {
        FileSystemEntry entry = Entry(c.name);
        EXPECT_EQ(c.isCreated, mac.CreateAsFile(entry)) << c.name;
    }
    EXPECT_EQ("", ReadFile(folder / "new"));
    EXPECT_EQ("data", ReadFile(folder / "file"));
}

TEST_F(LocalFileSystemOSXTest, AFailedCreationIsPrintedWithItsReason) {
    const ConsoleCapture console;
    EXPECT_FALSE(CreateDirectory("/none/x"));
    EXPECT_EQ("CreateDirectory '/none/x' failed: No such file or directory (current dir: " + folder.Path() + ")\n",
              console.Text());
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
    Run("mkdir -p from/sub; cd from; printf 12345 > file; touch sub/in $(printf '\\377'); ln -s file link");
    Run("ln -s none from/lost; ln -s from way");
    FileSystemEntry way = Entry("way"), to = Entry("to");
    EXPECT_TRUE(mac.Copy(way, to));
    const std::vector<Listed> kExpected = {
        {.path = "to/file", .size = 5},
        {.path = "to/link", .size = 4, .flags = kLink},
        {.path = "to/lost", .size = 4, .flags = kLink},
        {.path = "to/sub", .flags = kFolder},
        {.path = "to/sub/in"},
        {.path = "to/\xFF"},
    };
    EXPECT_EQ(kExpected, List("to").entries);
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
    } const kCases[] = {
        {"a", "a"},
        {"\xC3\xA9", "\xC3\xA9"},
        {"\xF4\x8F\xBF\xBF", "\xF4\x8F\xBF\xBF"}, // the last code point
        {"", ""},
        {"\x80", ""},         // a continuation alone
        {"\xC1\xBF", ""},     // overlong
        {"\xED\xA0\x80", ""}, // a surrogate
    };
    for (const auto& c : kCases) {
        const std::string longer = c.text + std::string("x");
        const core::string_ref view(longer.c_str(), longer.size() - 1);
        EXPECT_STREQ(c.converted, NSString_UTF8String(MakeNSString(c.text)));
        EXPECT_STREQ(c.converted, NSString_UTF8String(MakeNSString(core::string(c.text))));
        EXPECT_STREQ(c.converted, NSString_UTF8String(MakeNSString(view)));
    }
}

TEST_F(LocalFileSystemOSXTest, NilAndNullBecomeEmpty) {
    EXPECT_STREQ("", MakeString(nullptr).c_str());
    EXPECT_EQ(MemLabelId(kMemLabelPathString), MakeString(nullptr).get_memory_label());
    EXPECT_STREQ("", NSString_UTF8String(MakeNSString(static_cast<const char*>(nullptr))));
}
