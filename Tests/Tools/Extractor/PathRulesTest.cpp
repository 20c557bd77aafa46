// Where entries may be written, and where the archive may lie.
#include "Tests/Tools/Extractor/ExtractorTest.h"

namespace {

// As a file and as a folder; the entry after it is extracted in any case.
void ExpectRefused(const std::string& path) {
    Expect({.archive = path + ":1 last:2", .messages = "file:" + path, .output = "last:2"});
    Expect({.archive = path + "| last:2", .messages = "folder:" + path, .output = "last:2"});
}

TEST(NodePath, LeadsNowhereOutsideTheOutputFolder) {
    for (const char* const path :
         {"..", "../x", "a/../b", "a/..", "..\\x", "a\\..\\b", "a/..\\b", "/..", "//../x", "../"})
        ExpectRefused(path);
}

TEST(NodePath, IsKeptAsItIs) {
    for (const std::string path : {"..a", "a..", "...", "a.../b", "~a", "~/a", "a\x01\xFF\x1B[1m"}) {
        Expect({.archive = path + ":1"});
        Expect({.archive = path + "|"});
    }
}

TEST(NodePath, MayHoldRedundantSeparators) {
    struct Row {
        std::string path;
        std::string made;
    };
    for (const auto& [path, made] : {Row{.path = "/x", .made = "x"}, Row{.path = "//x", .made = "x"},
                                     Row{.path = "./x", .made = "x"}, Row{.path = "a//b", .made = "a/b"}}) {
        Expect({.archive = path + ":1", .output = made + ":1"});
        Expect({.archive = path + "|", .output = made + "|"});
    }
    Expect({.archive = "x/| last:2", .output = "x| last:2"});
    Expect({.archive = "x/:1 last:2", .messages = "file:x/", .output = "last:2"}); // only a folder ends in "/"
}

TEST(NodePath, MayNameTheOutputFolderAsAFolder) {
    for (const std::string path : {"", "/", "."}) {
        Expect({.archive = path + "| last:2", .output = "last:2"});
        Expect({.archive = path + ":1 last:2", .messages = "file:" + path, .output = "last:2"});
    }
}

TEST(NodePath, MayRepeat) { Expect({.archive = "a:longer a:short d| d|", .output = "a:short d|"}); }

TEST(NodePath, FailsWhereAnotherKindStands) {
    Expect({.archive = "a:file a| a/b/c:text d| d:text",
            .messages = "folder:a folder:a/b file:a/b/c file:d",
            .output = "a:file d|"});
}

TEST(NodePath, HasNoFoldersMadeForBackslashes) {
    Expect({.archive = "a\\b:1 a| a\\b:2", .messages = "file:a\\b", .output = "a/b:2"});
}

// A path in components that a file system accepts.
std::string MakePath(size_t length) {
    std::string path(length, 'p');
    for (size_t index = 199; index + 1 < length; index += 200)
        path[index] = '/';
    return path;
}

TEST(NodePath, MayMakeTheWholePath1039BytesLong) {
    for (const size_t length : {1'038u, 1'039u, 1'040u, 5'000u}) {
        const TemporaryFolder folder, other; // their paths have the same length
        const std::string path = MakePath(length - (folder / "a.zarvo_data/").size());
        const bool isMade = length <= 1'039;
        Expect({.archive = path + ":text",
                .messages = isMade ? "ok" : "file:" + path,
                .output = isMade ? "all" : "",
                .folder = folder.Path()});
        Expect({.archive = path + "|",
                .messages = isMade ? "ok" : "folder:" + path,
                .output = isMade ? "all" : "",
                .folder = other.Path()});
    }
}

TEST(NodePath, IsReportedWhenTheSystemRefusesIt) {
    const TemporaryFolder folder;
    const std::string name(256, 'n'); // one byte more than a file system accepts
    Expect({.archive = name + "| last:text",
            .messages = "refused:" + folder.Path() + "/a.zarvo_data/" + name + " folder:" + name,
            .output = "last:text",
            .folder = folder.Path()});
}

// The output folder's path is 5 bytes longer than the archive's; that of the entry "file" is 5 bytes longer still.
TEST(ArchivePath, IsNeverCut) {
    for (const size_t length : {1'034u, 1'035u, 1'039u, 1'040u, 3'000u}) {
        std::string path = length % 2 == 0 ? ".//a.zarvo" : "./a.zarvo";
        while (path.size() < length)
            path.insert(0, "./");
        const bool isRead = length <= 1'039, hasFolder = length <= 1'034;
        const std::string output = hasFolder ? "" : "none";
        Expect({.archive = "file:text", .messages = isRead ? "file:file" : "unread", .output = output, .path = path});
        Expect({.messages = hasFolder ? "ok"
                            : isRead  ? "folder:" + path + "_data"
                                      : "unread",
                .output = output,
                .path = path});
    }
}

TEST(ArchivePath, LeavesNoRoomForEntriesInADeepFolder) {
    const TemporaryFolder folder;
    Expect({.archive = "file:text",
            .messages = "file:file",
            .output = "",
            .folder = folder / MakePath(1'040 - folder.Path().size())});
}

TEST(ArchivePath, WithATildeIsNotInTheHomeFolder) {
    for (const char* const path : {"~a.zarvo", "~", "~/a.zarvo", "~root"})
        Expect({.archive = "a/b:text inner| ..:text",
                .messages = "file:..",
                .output = "a/b:text inner|",
                .path = path,
                .prepare = [] { return setenv("HOME", "/", 1) == 0; }});
}

} // namespace
