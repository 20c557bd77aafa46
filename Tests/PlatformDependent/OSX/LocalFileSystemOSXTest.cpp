// The macOS back end, each test in a fresh folder that it works in and that is HOME too, with a pool, a stand-in that
// fails nothing unless told, and as many open descriptors at its end as at its start. Files and answers are words.
#include "PlatformDependent/OSX/Platform.h"
#include "PlatformDependent/OSX/Standin/Faults.h"
#include "PlatformDependent/OSX/StringConversions.h"
#include "Runtime/Utilities/FileUtilities.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/TemporaryFolder.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <numeric>
#include <set>
#include <sstream>
#include <unistd.h>

extern "C" void __tsan_init() __attribute__((weak)); // there under the thread sanitizer alone
using Text = const std::string&;

struct LocalFileSystemOSXTest : testing::Test {
    LocalFileSystemOSXTest() {
        setenv("HOME", m_Folder.Path().c_str(), 1);
        WorkIn(m_Folder.Path(), m_Folder.Path());
    }
    ~LocalFileSystemOSXTest() override {
        EXPECT_TRUE(seteuid(getuid()) == 0 && chdir("/") == 0);
        EXPECT_EQ(CountOpenDescriptors(), m_DescriptorsBefore);
    }

    // In the process's working directory, and with the file system's current directory.
    static void WorkIn(Text workingDirectory, Text currentDirectory) {
        ASSERT_EQ(chdir(workingDirectory.c_str()), 0);
        GetFileSystem()->SetCurrentDirectory(currentDirectory.c_str());
    }

    // Without the rights of root, for whom modes count nothing, until the test ends.
    static void WorkAsOther() { ASSERT_TRUE(chmod(".", 0777) == 0 && (geteuid() != 0 || seteuid(65534) == 0)); }

    static FileSystemEntry Entry(Text path) { return FileSystemEntry(path.c_str()); }

    // Makes files that hold their own word, "link>target" and "folder/", with the folders above.
    static void Make(Text words) {
        std::istringstream stream(words);
        for (std::string word; stream >> word;) {
            const size_t arrow = word.find('>');
            const std::filesystem::path path = word.substr(0, arrow);
            std::filesystem::create_directories(("./" / path).parent_path());
            if (arrow != std::string::npos) std::filesystem::create_symlink(word.substr(arrow + 1), path);
            if (arrow == std::string::npos && word.back() != '/') WriteFile(path, word);
        }
    }

    // Does something with each word, and gives the words back: with "!" for the answer false, and "=path" where the
    // entry has another path then, or the target's; "/" is the test's folder.
    std::string Try(Text what, Text words) const {
        std::istringstream stream(words);
        std::string text;
        for (std::string word; stream >> word;) {
            const size_t arrow = word.find('>'); // of copies
            FileSystemEntry entry = Entry(word.substr(0, arrow)), to = Entry(word.substr(arrow + 1));
            const bool answer = what == "create"   ? m_Handler->CreateAsFile(entry)
                                : what == "trash"  ? m_Handler->MoveToTrash(entry)
                                : what == "target" ? m_Handler->Target(entry, entry)
                                                   : m_Handler->Copy(entry, to);
            const std::string path = entry.path;
            const size_t top = path.starts_with(m_Folder.Path()) ? m_Folder.Path().size() : 0;
            text += (answer ? "" : "!") + word + (path == word.substr(0, arrow) ? " " : "=" + path.substr(top) + " ");
        }
        return text;
    }

    // The answer and the sorted entries of a listing, as "path:size:flags", with "!" where the time is not the file's.
    // A folder's size is 0 or 1, and it has to come before what it holds.
    std::string List(Text path, bool recursive = false, UInt32 flags = 0) {
        const ConsoleCapture console;
        dynamic_block_array<FileEntryInfo, 32> out(kMemLabelFileList);
        const bool answer = m_Handler->Enumerate(path.c_str(), &out, recursive, &m_Counter, FileEnumerationFlag(flags));
        std::multiset<std::string> sorted;
        for (size_t i = 0; i < out.size(); ++i) {
            const FileEntryInfo& info = out[i];
            const std::string name = info.path, size = std::to_string(info.flags & 1 ? info.size > 0 : info.size);
            const auto after = sorted.lower_bound(" " + name + "/");
            EXPECT_TRUE(after == sorted.end() || !after->starts_with(" " + name + "/")) << name << " comes too late";
            const SInt64 time = m_Handler->LastModified(Entry(name)).ticks;
            const bool isTimeRight = (info.flags & 2) != 0 || info.lastModified.ticks == time; // links have their own
            sorted.insert(" " + name + ":" + size + ":" + std::to_string(info.flags) + (isTimeRight ? "" : "!"));
        }
        m_Printed = console.Text();
        return std::accumulate(sorted.begin(), sorted.end(), std::string(answer ? "true" : "false"));
    }
    bool HasPrinted(Text text) const { return m_Printed.find(text) != std::string::npos; }
    std::string m_Printed;
    UInt64 m_Sum = 0;
    void* m_Counter = &m_Sum;

    FileSystemHandler* m_Handler = GetFileSystem()->GetHandlerForPath("/"); // under test: the registry's
    const size_t m_DescriptorsBefore = CountOpenDescriptors();
    const TemporaryFolder m_Folder;
    const ScopedFaults m_Faults;
    const AutoreleasePool m_Pool;
};

TEST_F(LocalFileSystemOSXTest, DiffersFromThePosixOneInTheseAndNoOtherAnswers) {
    LocalFileSystemPosix posix;
    const auto compare = [&](Text what, Text words, UInt32 flags, Text posixAnswer, Text macAnswer) {
        for (const bool isMac : {true, false}) {
            m_Handler = isMac ? GetFileSystem()->GetHandlerForPath("/") : &posix;
            Make("d/a d/.dot d/shy d/closed d/sub/ d/link>a d/way>sub d/lost>none");
            chflags("d/shy", UF_HIDDEN);
            chmod("d/closed", 0444);
            FileEntryInfo info;
            info.flags = 0xF4;
            const auto query = static_cast<FileEntryInfoQueryFlags>(flags);
            std::ostringstream text;
            text << std::hex << m_Handler->GetFileEntryInfo(Entry(words), info, query) << " " << +info.flags;
            std::string answer = what == "list" ? List(words, true, flags) : text.str();
            if (what == "target" || what == "copy") answer = Try(what, words);
            EXPECT_EQ(answer, isMac ? macAnswer : posixAnswer) << what << " " << words << " " << flags;
            std::filesystem::remove_all("d");
        }
    };
    compare("info", "d", 0x90, "1d4 f1", "194 f5");
    compare("info", "none", 0x90, "0 f4", "0 f4");
    compare("info", "d/a", 0, "40 f0", "0 f4");
    compare("info", "d/a", 0x80, "c0 f0", "80 f4");
    compare("info", "d/a", 0x40, "40 f0", "40 f0");
    compare("info", "d/shy", 0x40, "40 f0", "40 f4");
    compare("info", "d/link", 0x3F4, "3f4 f2", "3f4 f2");
    compare("info", "d/closed", 0x200, "354 f8", "314 fc");
    compare("list", "none", 0, "false", "true");
    compare("list", "d", 0x12, "true d/a:3:0 d/closed:8:8 d/link:3:2 d/lost:0:2 d/shy:5:0",
            "true d/.dot:6:4 d/a:3:0 d/closed:8:0 d/link:1:2 d/lost:4:2");
    compare("list", "d", 0x08, "true d/.dot:6:4 d/sub:1:1 d/way:1:3", "true d/shy:5:4 d/sub:0:1 d/way:0:3");
    compare("target", "d/link d/lost", 0, "d/link=/d/a !d/lost ", "d/link=d/a d/lost=d/none ");
    compare("copy", "d/a>d/shy d/sub>d/new", 0, "d/a>d/shy !d/sub>d/new ", "!d/a>d/shy d/sub>d/new ");
    Make("shut/closed/in");
    chmod("shut/closed", 0);
    WorkAsOther();
    compare("list", "shut", 0, "false shut/closed:1:9", "true shut/closed:0:1");
}

TEST_F(LocalFileSystemOSXTest, SkippedNamesAreNeitherListedNorSummedNorDescendedInto) {
    Make("d/a d/back~ d/CVS/in d/shy/in d/sub/in");
    chflags("d/shy", UF_HIDDEN);
    EXPECT_EQ(List("d", true, 0x24), "true d/a:3:0 d/sub/in:8:0 d/sub:0:1");
    EXPECT_EQ(List("d", true, 0x24 | kFileEnumerationSumSizes), "true");
    EXPECT_TRUE(m_Sum == 11 && !HasPrinted("Assertion failed")) << m_Printed;
    EXPECT_TRUE(HasPrinted("Filesystem does not support storing size during enumeration outside of Zarvo Editor."));
    m_Counter = nullptr;
    EXPECT_EQ(List("d", false, kFileEnumerationSumSizes), "true");
    EXPECT_TRUE(HasPrinted("Assertion failed on expression: 'handlerData != NULL'"));
    EXPECT_TRUE(m_Handler->Enumerate("d", nullptr, false, nullptr, kFileEnumerationSumSizes));
}

TEST_F(LocalFileSystemOSXTest, PathsAreListedAsTheyLead) {
    const std::string top = m_Folder / "", fromRoot = top.substr(1) + "docs";
    Make("docs/x do/ \xFF/x \xFF/docs/x gone/");
    const auto list = [&](Text workingDirectory, Text currentDirectory, Text path) {
        WorkIn(workingDirectory, currentDirectory);
        return List(path) + m_Printed;
    };
    EXPECT_EQ(list(top, m_Folder.Path(), "docs/"), "true docs/x:6:0");
    EXPECT_EQ(list(top, top + "do", "docs"), "true " + top + "docs/x:6:0") << "which is another folder";
    EXPECT_EQ(list(top + "docs", top + "docs", "."), "true ./x:6:0");
    EXPECT_EQ(list(top, "", "\xFF/docs"), "true \xFF/docs/x:8:0");
    EXPECT_EQ(list(top + "\xFF", top + "\xFF", "docs"), "true docs/x:8:0");
    EXPECT_EQ(list("/", "/", fromRoot), "true " + fromRoot + "/x:6:0");
    EXPECT_EQ(list("/", "", fromRoot), "true " + fromRoot + "/x:6:0");
    EXPECT_FALSE(m_Handler->Enumerate(nullptr, nullptr, false, nullptr, kFileEnumerationAll));
    WorkIn(top + "gone", top);
    std::filesystem::remove(top + "gone");
    EXPECT_STREQ(NSURL_fileSystemRepresentation(NSURL_fileURLWithPath(NSString_stringWithUTF8String("x"))), "");
}

TEST_F(LocalFileSystemOSXTest, FaultsAreReportedAndTheRestIsListed) {
    const std::string name(30, 'z'); // long enough for no record to be reported as too short besides
    Make("d/a d/sub/in d/" + name);
    chflags(("d/" + name).c_str(), UF_HIDDEN);
    const std::string rest = "true d/a:3:0 d/sub/in:8:0 d/sub:0:1", named = rest + " d/" + name, all = named + ":32:4";
    const std::string end = ") occured whilst enumerating d", lacks = "'entry.returned.commonattr & ATTR_CMN_";
    const auto expect = [&](const StandinFaults& faults, Text listed, Text printed) {
        gStandinFaults = faults;
        EXPECT_EQ(List("d", true), listed) << printed;
        EXPECT_TRUE(HasPrinted(printed) && m_Printed.empty() == printed.empty()) << m_Printed;
    };
    expect({.recordsBeforeListingError = 0, .listingError = EIO}, "false", "Error (Input/output error" + end + "\n");
    expect({.recordsBeforeListingError = 0, .listingError = EINTR}, "false", "Error (Interrupted system call" + end);
    expect({.recordsBeforeListingError = 4, .listingError = EIO}, all, end + "/sub\n");
    expect({.callsTooSmall = 10}, all, ""); // the buffer grows until a record fits
    if (__tsan_init == nullptr) {           // which makes much more of it
        expect({.callsTooSmall = 100}, "false", "Error (Numerical result out of range" + end);
        EXPECT_EQ(gStandinFaults.callsTooSmall, 100 - 19) << "calls with 4,096 bytes, and 18 times twice as much";
    }
    expect({.entryErrorName = name}, rest, end + "\n");
    expect({.alteredName = name, .missingCommon = ATTR_CMN_NAME}, rest, lacks + "NAME'");
    expect({.alteredName = name, .movedName = 0x40000000}, rest, lacks + "NAME'");
    expect({.alteredName = name, .movedName = -0x40000000}, rest, lacks + "NAME'");
    expect({.alteredName = name, .missingCommon = ATTR_CMN_OBJTYPE}, all, lacks + "OBJTYPE'");
    expect({.alteredName = name, .missingCommon = ATTR_CMN_MODTIME}, all + "!", lacks + "MODTIME'");
    expect({.alteredName = name, .missingCommon = ATTR_CMN_FLAGS}, named + ":32:0", lacks + "FLAGS'");
    expect({.alteredName = name, .missingFile = ATTR_FILE_TOTALSIZE}, named + ":0:4", "");
    List("d", true, kFileEnumerationSumSizes); // the last fault still holds
    EXPECT_TRUE(m_Sum == 11 && HasPrinted("'entry.returned.fileattr & ATTR_FILE_TOTALSIZE'")) << m_Printed;
}

// A cut record is used as far as it goes, and the next one is found behind it.
TEST_F(LocalFileSystemOSXTest, RecordsOfAnyLengthAreHandled) {
    Make("d/a d/b d/c");
    for (UInt32 length = 0; length <= 72; ++length) { // of a whole record, whose name is at 64
        gStandinFaults = {.alteredName = "b", .cut = true, .cutLength = length};
        const std::string b = length > 64 ? " d/b:3:0" : "";
        EXPECT_TRUE(List("d") == "true d/a:3:0" + b + " d/c:3:0" || length < sizeof(length)) << length;
        EXPECT_EQ(HasPrinted("Trying to copy too much data from getattrlistbulk attribute buffer"), length < 60);
        EXPECT_EQ(HasPrinted("ATTR_CMN_NAME"), length >= sizeof(length) && length <= 64) << length;
    }
    gStandinFaults.cutLength = UINT32_MAX; // leads out of the buffer
    EXPECT_NE(List("d").find("d/b:3"), std::string::npos);
}

TEST_F(LocalFileSystemOSXTest, TreesAreListedCopiedAndDeletedWhole) {
    std::string words = "d/" + std::string(255, 'n') + " d/\xFF\xFE/\xFF d/lost>none d/self>. d";
    for (int depth = 0; depth < 200; ++depth)
        words += "/d";
    for (int file = 0; file < 10'000; ++file)
        words += " d/many/" + std::to_string(file);
    Make(words);
    const std::string listed = List("d", true);
    EXPECT_EQ(std::count(listed.begin(), listed.end(), ':') / 2, 10'000 + 200 + 6);
    EXPECT_EQ(Try("copy", "d>e"), "d>e ");
    EXPECT_TRUE(DeleteFileOrDirectory("d") && rename("e", "d") == 0 && List("d", true) == listed);
    // Below e/c/a the folder a is listed once more, but not c, which e/c/a lies in.
    Make("e/a/x e/a/c>../c e/c/a>../a e/loop>loop");
    EXPECT_EQ(List("e", true),
              "true e/a/c/a:0:3 e/a/c:0:3 e/a/x:5:0 e/a:0:1 e/c/a/c:0:3 e/c/a/x:5:0 e/c/a:0:3 e/c:0:1 e/loop:4:2");
}

TEST_F(LocalFileSystemOSXTest, PathsThatDoNotFitAreCutAndNothingIsDeletedByThem) {
    const std::string x(200, 'x'), folder = m_Folder / "d/" + x + "/" + x + "/" + x + "/" + x;
    const std::string whole = folder + "/" + std::string(kMaxPathLength - folder.size(), 'n');
    const std::string cut = whole.substr(0, kMaxPathLength), shown = cut.substr(m_Folder.Path().size());
    Make(whole + " " + cut + " way>" + whole);
    std::string listed = List(folder);
    std::erase(listed, '!'); // the time of the file whose path is cut is asked of the other one
    EXPECT_EQ(listed, "true " + cut + ":1039:0 " + cut + ":1040:0");
    EXPECT_EQ(Try("target", "way"), "way=" + shown + " ");
    EXPECT_EQ(Try("trash", "way"), "!way=" + shown + " ");
    EXPECT_FALSE(DeleteFileOrDirectory("d"));
}

TEST_F(LocalFileSystemOSXTest, HiddenMarkIsAFileFlag) {
    WorkAsOther();
    Make("file closed");
    mkfifo("pipe", 0644); // no attribute for flags can be written, as with what is closed to its owner
    chflags("closed", UF_HIDDEN);
    chmod("closed", 0444);
    for (const char* name : {"file", "closed", "pipe"}) {
        FileSystemEntry entry = Entry(name);
        EXPECT_EQ(chflags(name, 1), 0); // a flag that stays
        const UInt32 kSteps[][3] = {{0, 0, 0}, {4, 4, 1}, {0, 0, 1}, {11, 2, 1}, {4, 0, 0}, {0, 4, 1}, {255, 0, 0}};
        for (const auto& [mask, flags, isHidden] : kSteps) {
            PlatformStatus status = {};
            EXPECT_TRUE(m_Handler->SetFlags(entry, mask, flags) && PlatformStat(name, &status) == 0) << name;
            EXPECT_EQ(status.st_flags, isHidden * UF_HIDDEN + 1) << name << " " << mask << " " << flags;
            EXPECT_EQ(m_Handler->IsHidden(entry), isHidden != 0) << name;
        }
    }
    FileSystemEntry file = Entry("file"), none = Entry("none");
    EXPECT_FALSE(m_Handler->SetFlags(none, 0, 0) || m_Handler->IsHidden(none));
    gStandinFaults.chflagsError = EPERM;
    ConsoleCapture console;
    EXPECT_TRUE(m_Handler->SetFlags(file, 4, 0) && !m_Handler->SetFlags(file, 4, 4)) << "unchanged is not set";
    EXPECT_NE(console.Text().find("Failed to change file flags for 'file'. errno: 1"), std::string::npos);
}

TEST_F(LocalFileSystemOSXTest, FilesAreMadeWhereThereAreNone) {
    Make("file lost>none/x");
    EXPECT_EQ(Try("create", "new file . lost none/x \xFF"), "new !file !. !lost !none/x !\xFF ");
    EXPECT_EQ(List("."), "true ./file:4:0 ./lost:6:2 ./new:0:0");
    ConsoleCapture console;
    EXPECT_FALSE(CreateDirectory("/none/x"));
    EXPECT_TRUE(console.Text().starts_with("CreateDirectory '/none/x' failed: No such file or directory"));
}

TEST_F(LocalFileSystemOSXTest, TrashTakesWhatThePathLeadsTo) {
    Make("a/name b/name folder/sub/file target \xFF x\\y x/y link>target lost>none way>x\\y p/\xFF out>p/\xFF");
    EXPECT_EQ(
        Try("trash", "a/name b/name folder link none lost way out \xFF"),
        "a/name=/a/name b/name=/b/name folder=/folder link=/target !none=/none !lost=/none !way=/x\\y !out=/p/\xFF "
        "!\xFF= ");
    EXPECT_EQ(List(".Trash"), "true .Trash/folder:0:1 .Trash/name 2:6:0 .Trash/name:6:0 .Trash/target:6:0");
    gStandinFaults.trashRefuses = true; // what is still there then is deleted
    EXPECT_EQ(Try("trash", "b link /proc/version"), "b=/b !link=/target !/proc/version ") << "the last for nobody";
    EXPECT_EQ(
        List("."),
        "true ./.Trash:0:5 ./a:0:1 ./link:6:2 ./lost:4:2 ./out:3:2 ./p:0:1 ./way:3:2 ./x:0:1 ./x\\y:3:0 ./\xFF:1:0");
}

TEST_F(LocalFileSystemOSXTest, CopyTakesFoldersWholeAndReplacesNothing) {
    Make("from/file from/\xFF from/sub/in from/link>file from/lost>none pipes/file there way>from");
    mkfifo("pipes/pipe", 0644); // can't be copied
    EXPECT_EQ(Try("copy", "way>to"), "way>to ");
    for (const char* copy : {"from/file>there", "there>there", "there>from/lost", "there>none/x", "none>new",
                             "from/\xFF>new", "there>\xFF", "pipes>new", "from>from/sub/new", "/>new"})
        EXPECT_EQ(Try("copy", copy), "!" + std::string(copy) + " ");
    EXPECT_EQ(List("."), "true ./from:0:1 ./pipes:0:1 ./there:5:0 ./to:0:1 ./way:0:3");
    EXPECT_EQ(List("to", true), "true to/file:9:0 to/link:4:2 to/lost:4:2 to/sub/in:11:0 to/sub:0:1 to/\xFF:6:0");
    WorkIn(m_Folder.Path(), m_Folder / "to");
    EXPECT_EQ(Try("copy", "file>new"), "file>new ") << "relative to the file system's current directory";
}

// The application path is kept until the process ends: nothing else here may ask for it.
TEST_F(LocalFileSystemOSXTest, FoldersOfUserAndApplication) {
    const auto& mac = *static_cast<LocalFileSystemHandler*>(m_Handler);
    const auto program = std::filesystem::read_symlink("/proc/self/exe"), bundle = program.parent_path();
    EXPECT_EQ(mac.GetUserAppDataFolder().c_str(), m_Folder / "Library/Zarvo");
    EXPECT_EQ(mac.GetUserAppCacheFolder().c_str(), m_Folder / "Library/Caches/com.zarvo3d.ZarvoEditor");
    EXPECT_EQ(mac.GetSharedApplicationDataFolder(), "/Library/Application Support");
    EXPECT_EQ(List("."), "true") << "not made";
    EXPECT_EQ(mac.GetExecutablePath().c_str(), program);
    gStandinFaults.emptyBundlePath = true;
    EXPECT_EQ(mac.GetApplicationContentsPath(), "Contents");
    gStandinFaults.emptyBundlePath = false;
    EXPECT_EQ(mac.GetApplicationPath().c_str(), bundle) << "asked for until it is known";
    gStandinFaults.emptyBundlePath = true;
    EXPECT_EQ(mac.GetApplicationManagedPath().c_str(), bundle / "Contents/Managed") << "and kept";
    EXPECT_EQ(mac.GetApplicationFolder().c_str(), bundle.parent_path());
}

TEST_F(LocalFileSystemOSXTest, TextsComeBackAsTheyWereOrEmpty) {
    const char* const kTexts[] = {"a", "\xC3\xA9", "\xF4\x8F\xBF\xBF", "", "\x80", "\xC1\xBF", "\xED\xA0\x80"};
    for (size_t i = 0; i < std::size(kTexts); ++i) {
        const std::string longer = kTexts[i] + std::string("x");
        const core::string_ref view(longer.c_str(), longer.size() - 1);
        for (NSString* string : {MakeNSString(kTexts[i]), MakeNSString(core::string(kTexts[i])), MakeNSString(view)})
            EXPECT_STREQ(NSString_UTF8String(string), i < 3 ? kTexts[i] : "") << i;
    }
    EXPECT_EQ(MakeString(nullptr).get_memory_label(), kMemLabelPathString);
    EXPECT_TRUE(MakeString(nullptr).empty() && MakeString(MakeNSString(static_cast<const char*>(nullptr))).empty());
}
