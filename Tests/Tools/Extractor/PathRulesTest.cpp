#include "Tests/Tools/Extractor/ExtractorTest.h"

#include <filesystem>

namespace {

const std::string kFolderFailed = "ERROR: failed to create directory ";
const std::string kFileFailed = "ERROR: failed to create file ";

ArchiveDescription OneNode(const std::string& path, bool isFolder) {
    ArchiveDescription archive;
    archive.entries = {{.path = path, .bytes = isFolder ? "" : "text", .flags = isFolder ? kFolderEntry : 0}};
    return archive;
}

// The last node is there to show that the run goes on.
Outcome ExtractNode(const std::string& path, bool isFolder, UInt64* size) {
    ArchiveDescription archive = OneNode(path, isFolder);
    archive.entries.push_back({.path = "last", .bytes = "last"});
    const std::string bytes = BuildArchive(archive).bytes;
    *size = bytes.size();
    return Extract(bytes);
}

TEST(NodePath, IsRefusedWithAParentComponentAndKeptBelowTheOutputFolder) {
    struct {
        std::string path;
        FolderTree file;   // what a file node of the path makes
        FolderTree folder; // what a folder node of it makes
    } const rows[] = {
        {"..", {}, {}},
        {"../x", {}, {}},
        {"a/../b", {}, {}},
        {"a/..", {}, {}},
        {"..\\x", {}, {}},
        {"a\\..\\b", {}, {}},
        {"a/..\\b", {}, {}},
        {"/..", {}, {}},
        {"//../x", {}, {}},
        {"../", {}, {}},
        {"..a", {{"..a", "text"}}, {{"..a", kFolder}}},
        {"a..", {{"a..", "text"}}, {{"a..", kFolder}}},
        {"...", {{"...", "text"}}, {{"...", kFolder}}},
        {"a.../b", {{"a.../b", "text"}}, {{"a.../b", kFolder}}},
        {"/x", {{"x", "text"}}, {{"x", kFolder}}},
        {"//x", {{"x", "text"}}, {{"x", kFolder}}},
        {"a//b", {{"a/b", "text"}}, {{"a/b", kFolder}}},
        {"./x", {{"x", "text"}}, {{"x", kFolder}}},
        {"~a", {{"~a", "text"}}, {{"~a", kFolder}}},
        {"~/a", {{"~/a", "text"}}, {{"~/a", kFolder}}},
        {std::string("a\tb\xFF\x1B[1m"), {{"a\tb\xFF\x1B[1m", "text"}}, {{"a\tb\xFF\x1B[1m", kFolder}}},
    };
    for (const auto& row : rows) {
        for (const bool isFolder : {false, true}) {
            SCOPED_TRACE((isFolder ? "folder " : "file ") + row.path);
            FolderTree contents = isFolder ? row.folder : row.file;
            const bool isMade = !contents.empty();
            contents["last"] = "last";
            UInt64 size = 0;
            const Outcome outcome = ExtractNode(row.path, isFolder, &size);
            const std::string failure = (isFolder ? kFolderFailed : kFileFailed) + row.path + "\n";
            ExpectOutcome(isMade ? 0 : 1, Report(7, size, isMade ? kAllOk : failure), OutputTree(contents), outcome);
        }
    }
}

TEST(NodePath, ThatNamesAFolderFailsAsAFile) {
    struct {
        std::string path;
        FolderTree folder;
    } const rows[] = {{"", {}}, {"/", {}}, {".", {}}, {"a/", {{"a", kFolder}}}};
    for (const auto& row : rows) {
        SCOPED_TRACE("path \"" + row.path + "\"");
        UInt64 size = 0;
        FolderTree contents = {{"last", "last"}};
        Outcome outcome = ExtractNode(row.path, false, &size);
        ExpectOutcome(1, Report(7, size, kFileFailed + row.path + "\n"), OutputTree(contents), outcome);

        contents.insert(row.folder.begin(), row.folder.end());
        outcome = ExtractNode(row.path, true, &size);
        ExpectOutcome(0, Report(7, size), OutputTree(contents), outcome);
    }
}

TEST(NodePath, BackslashesSeparateButImplyNoFolder) {
    ArchiveDescription archive;
    archive.entries = {
        {.path = "a\\b", .bytes = "1"}, {.path = "a", .flags = kFolderEntry}, {.path = "a\\b", .bytes = "2"}};
    const std::string bytes = BuildArchive(archive).bytes;
    ExpectOutcome(1, Report(7, bytes.size(), kFileFailed + "a\\b\n"), OutputTree({{"a/b", "2"}}), Extract(bytes));
}

TEST(NodePath, RepeatedPathIsWrittenAgainAndAFileInTheWayOfAFolderStays) {
    ArchiveDescription archive;
    archive.entries = {
        {.path = "a", .bytes = "first, longer"}, {.path = "a", .bytes = "second"},
        {.path = "a", .flags = kFolderEntry},    {.path = "a/b", .bytes = "text"},
        {.path = "a/b/c", .bytes = "text"},      {.path = "d", .flags = kFolderEntry},
        {.path = "d", .flags = kFolderEntry},    {.path = "d", .bytes = "text"},
    };
    const std::string bytes = BuildArchive(archive).bytes;
    const std::string messages = kFolderFailed + "a\n" + kFolderFailed + "a\n" + kFileFailed + "a/b\n" + kFolderFailed +
                                 "a/b\n" + kFileFailed + "a/b/c\n" + kFileFailed + "d\n";
    ExpectOutcome(1, Report(7, bytes.size(), messages), OutputTree({{"a", "second"}, {"d", kFolder}}), Extract(bytes));
}

TEST(NodePath, FolderThatTheSystemRefusesIsReportedTwice) {
    const TemporaryFolder folder;
    const std::string name(256, 'n'); // one more than a component may have
    const std::string bytes = BuildArchive(OneNode(name, true)).bytes;
    const std::string messages =
        FolderRefused(folder / "a.zarvo_data/" + name, ENAMETOOLONG, folder.Path()) + kFolderFailed + name + "\n";
    ExpectOutcome(1, Report(7, bytes.size(), messages), OutputTree({}), Extract(folder, bytes));
}

TEST(NodePath, MayMakeTheWholePathAsLongAsAnEntryHolds) {
    for (const bool isAbsolute : {false, true}) {
        for (const bool isFolder : {false, true}) {
            for (const size_t wholeLength : std::vector<size_t>{1'038, 1'039, 1'040, 1'041, 5'000}) {
                SCOPED_TRACE(testing::Message() << (isAbsolute ? "absolute" : "relative") << " archive path, "
                                                << (isFolder ? "folder, " : "file, ") << wholeLength);
                const TemporaryFolder folder;
                const std::string prefix = folder / "a.zarvo_data/";
                const std::string path = PathOfLength(wholeLength - prefix.size());
                const std::string bytes = BuildArchive(OneNode(path, isFolder)).bytes;
                WriteFile(folder / "a.zarvo", bytes);

                const std::string archivePath = (isAbsolute ? folder / "" : "") + "a.zarvo";
                const Transcript transcript = RunVarnex({archivePath}, {.workingDirectory = folder.Path()});
                const bool isMade = wholeLength <= 1'039;
                std::string report =
                    Report(7, bytes.size(), isMade ? kAllOk : (isFolder ? kFolderFailed : kFileFailed) + path + "\n");
                report.replace(report.find("a.zarvo'"), 7, archivePath);
                report.replace(report.find("a.zarvo_data'"), 7, archivePath);
                EXPECT_EQ((Transcript{.status = isMade ? 0 : 1, .output = report}), transcript);
                FolderTree tree = isMade ? OutputTree({{path, isFolder ? kFolder : "text"}}) : OutputTree({});
                tree["a.zarvo"] = bytes;
                EXPECT_EQ("", Differences(tree, ReadFolderTree(folder.Path())));
            }
        }
    }
}

TEST(ArchivePath, IsNeverCut) {
    const std::string bytes = BuildArchive(OneNode("a.txt", false)).bytes;
    // The output folder's path is 5 characters longer than the archive's, and the entry's 6 more.
    struct {
        size_t length;
        bool isRead;
    } const rows[] = {{1'039, true}, {1'040, false}, {1'041, false}, {3'000, false}};
    for (const auto& row : rows) {
        SCOPED_TRACE(row.length);
        const TemporaryFolder folder;
        WriteFile(folder / "a.zarvo", bytes);
        std::string path = row.length % 2 == 0 ? ".//a.zarvo" : "./a.zarvo";
        while (path.size() < row.length)
            path.insert(0, "./");
        const std::string start = "Extracting file '" + path + "'...\n";
        const std::string report = start + Report(7, bytes.size(), kFileFailed + "a.txt\n").substr(kStarting.size());
        std::string output = row.isRead ? report : start + kCantRead;
        if (row.isRead) output.replace(output.find("a.zarvo_data"), 7, path);
        EXPECT_EQ((Transcript{.status = 1, .output = output}), RunVarnex({path}, {.workingDirectory = folder.Path()}));
        EXPECT_EQ("", Differences({{"a.zarvo", bytes}}, ReadFolderTree(folder.Path())));

        // Without entries, the folder itself is what can't be made.
        WriteFile(folder / "a.zarvo", BuildArchive({}).bytes);
        const std::string message = "ERROR: failed to create directory " + path + "_data\n";
        const Transcript empty = RunVarnex({path}, {.workingDirectory = folder.Path()});
        EXPECT_EQ(row.isRead, empty.output.ends_with(message)) << empty;
    }
}

TEST(ArchivePath, InAWorkingDirectoryThatWouldBeCutGetsNoEntries) {
    const TemporaryFolder folder;
    std::string deep = folder.Path();
    deep += "/" + PathOfLength(1'040);
    std::error_code error;
    std::filesystem::create_directories(deep, error);
    ASSERT_FALSE(error);
    const std::string bytes = BuildArchive(OneNode("a.txt", false)).bytes;
    WriteFile(deep + "/a.zarvo", bytes);
    const Transcript transcript = RunVarnex({"a.zarvo"}, {.workingDirectory = deep});
    EXPECT_EQ((Transcript{.status = 1, .output = Report(7, bytes.size(), kFileFailed + "a.txt\n")}), transcript);
    EXPECT_EQ("", Differences({{"a.zarvo", bytes}, {"a.zarvo_data", kFolder}}, ReadFolderTree(deep)));
}

TEST(ArchivePath, ThatStartsWithATildeIsNotInTheHomeFolder) {
    for (const std::string path : {"~a.zarvo", "~", "~/a.zarvo", "~root"}) {
        SCOPED_TRACE(path);
        const TemporaryFolder folder, home;
        std::error_code error;
        if (path == "~/a.zarvo") std::filesystem::create_directory(folder / "~", error);
        const ArchiveDescription archive = {.entries = {{.path = "folder/a.txt", .bytes = "text"},
                                                        {.path = "inner", .flags = kFolderEntry},
                                                        {.path = "..", .bytes = "text"}}};
        const std::string bytes = BuildArchive(archive).bytes;
        WriteFile(folder / path, bytes);
        const Transcript transcript =
            RunVarnex({path}, {.workingDirectory = folder.Path(), .environment = {{"HOME", home.Path()}}});

        std::string report = Report(7, bytes.size(), kFileFailed + "..\n");
        report.replace(report.find("a.zarvo'"), 7, path);
        report.replace(report.find("a.zarvo_data'"), 7, path);
        EXPECT_EQ((Transcript{.status = 1, .output = report}), transcript);
        FolderTree tree = {{path, bytes},
                           {path + "_data", kFolder},
                           {path + "_data/folder", kFolder},
                           {path + "_data/folder/a.txt", "text"},
                           {path + "_data/inner", kFolder}};
        if (path == "~/a.zarvo") tree["~"] = kFolder;
        EXPECT_EQ("", Differences(tree, ReadFolderTree(folder.Path())));
        EXPECT_EQ("", Differences({}, ReadFolderTree(home.Path())));
    }
}

} // namespace
