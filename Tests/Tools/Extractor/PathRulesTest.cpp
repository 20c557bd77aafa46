// Where entries may go, and where the archive may lie.
#include "Tests/Tools/Extractor/ExtractorTest.h"

TEST(NodePath, NamesNothingOutsideTheOutputFolder) {
    const std::map<std::string, std::vector<std::string>> rows = {
        {"refused", {"..", "../x", "a/../b", "a/..", "..\\x", "a\\..\\b", "a/..\\b", "/..", "//../x", "../"}},
        {"the same", {"..a", "a..", "...", "a.../b", "~a", "~/a", "a\x01\xFF\x1B[1m"}},
        {"x", {"/x", "//x", "./x", "x/"}},
        {"a/b", {"a//b"}},
        {"", {"", "/", "."}}}; // the output folder itself
    for (const auto& [made, paths] : rows)
        for (const std::string& path : paths) {
            const std::string whole = made == "the same" ? path : made;
            const bool isMade = made != "refused", isFile = isMade && !made.empty() && !path.ends_with('/');
            Expect({path + ":1 last:2", isFile ? "ok" : "file:" + path, isFile ? whole + ":1 last:2" : "last:2"});
            const std::string folder = isMade && !made.empty() ? whole + "| last:2" : "last:2";
            Expect({path + "| last:2", isMade ? "ok" : "folder:" + path, folder});
        }
}

TEST(NodePath, MayRepeatAndStandInTheWayOfAnother) {
    Expect({"a:longer a:short a| a/b/c:text d| d| d:text", "folder:a folder:a/b file:a/b/c file:d", "a:short d|"});
    // Backslashes separate, but imply no folder.
    Expect({"a\\b:1 a| a\\b:2", "file:a\\b", "a/b:2"});
}

// In components that a file system takes.
static std::string MakePath(size_t length) {
    std::string path(length, 'p');
    for (size_t index = 199; index + 1 < length; index += 200)
        path[index] = '/';
    return path;
}

TEST(NodePath, MayMakeTheWholePathAsLongAsAnEntryHolds) {
    for (const size_t length : {1'038u, 1'039u, 1'040u, 5'000u}) {
        const TemporaryFolder folder, other; // of one length
        const std::string path = MakePath(length - (folder / "a.zarvo_data/").size());
        const bool isMade = length <= 1'039;
        Expect({path + ":text", isMade ? "ok" : "file:" + path, isMade ? "all" : "", {}, folder.Path()});
        Expect({path + "|", isMade ? "ok" : "folder:" + path, isMade ? "all" : "", {}, other.Path()});
    }
    const TemporaryFolder folder;
    const std::string name(256, 'n'), refused = "refused:" + folder.Path() + "/a.zarvo_data/"; // 1 more than may be
    Expect({name + "| last:text", refused + name + " folder:" + name, "last:text", {}, folder.Path()});
}

// The output folder's path is 5 characters longer, and that of an entry 5 more.
TEST(ArchivePath, IsNeverCut) {
    for (const size_t length : {1'034u, 1'035u, 1'039u, 1'040u, 3'000u}) {
        std::string path = length % 2 == 0 ? ".//a.zarvo" : "./a.zarvo";
        while (path.size() < length)
            path.insert(0, "./");
        const std::string output = length <= 1'034 ? "" : "none", folder = "folder:" + path + "_data";
        Expect({"file:text", length <= 1'039 ? "file:file" : "unread", output, {}, {}, path});
        Expect({"", length <= 1'034 ? "ok" : length <= 1'039 ? folder : "unread", output, {}, {}, path});
    }
    // In a working directory of that length there is no room for entries.
    const TemporaryFolder folder;
    Expect({"file:text", "file:file", "", {}, folder / MakePath(1'040 - folder.Path().size())});
}

TEST(ArchivePath, ThatStartsWithATildeIsNotInTheHomeFolder) {
    for (const char* path : {"~a.zarvo", "~", "~/a.zarvo", "~root"})
        Expect({"a/b:text inner| ..:text", "file:..", "a/b:text inner|", {}, "", path, [] {
                    return setenv("HOME", "/", 1) == 0;
                }});
}
