#include "Tests/Tools/Zarvo/ZarvoTest.h"

#include <sys/resource.h>
#include <sys/wait.h>

namespace {

class ZarvoExtract : public ZarvoTest {
protected:
    // The command without its summary, which names a time.
    static Heard Extract(std::vector<std::string> arguments, const Stage& stage = {}) {
        arguments.insert(arguments.begin(), {"extract", "-q"});
        return Zarvo(arguments, stage);
    }

    // An archive whose file "bad" can't be read after its first 4 bytes.
    static void MakeDamagedArchive() {
        ArchiveDescription archive = Archive("good:wxyz bad:abcdefgh");
        archive.blocks = {{.size = 8}, {.size = 4, .type = kCompressionLz4, .stored = std::string(3, '\xFF')}};
        MakeArchive("a.zarvo", archive);
    }
};

TEST_F(ZarvoExtract, WritesBesideTheArchiveByDefault) {
    fs::create_directory("in");
    MakeArchive("in/a.zarvo", Archive("d/a:1 d/b| c:c70000"));
    EXPECT_EQ((Heard{0, "", ""}), Extract({"in/a.zarvo"}));
    EXPECT_EQ((FolderTree{{"d/a", "1"}, {"d/b", kFolder}, {"c", Brief(Bytes("c70000"))}}),
              ReadFolderTree("in/a.zarvo_data"));
}

TEST_F(ZarvoExtract, TakesWhatIsWantedAndNotExcluded) {
    MakeArchive("a.zarvo", Archive("d/a:1 d/b:2 e/a:3 e/b:4 f:5"));
    EXPECT_EQ(
        (Heard{1, "d/a\nf\n", "zarvo: a.zarvo: none: matches nothing\n"}),
        Extract({"-v", "-x", "**/b", "-x", "nothing", "--files-from=-", "a.zarvo", "d", "none"}, {.input = "f\n"}));
    EXPECT_EQ((FolderTree{{"d/a", "1"}, {"f", "5"}}), ReadFolderTree("a.zarvo_data"));
}

TEST_F(ZarvoExtract, TakesNothingFromAnEmptyListOfNames) {
    MakeArchive("a.zarvo", Archive("a:1"));
    EXPECT_EQ((Heard{0, "", ""}), Extract({"-v", "--files-from=-", "a.zarvo"}));
}

TEST_F(ZarvoExtract, StripsComponents) {
    MakeArchive("a.zarvo", Archive("/d//a:1 b:2 e/a:3 d\\c/d:4"));
    EXPECT_EQ((Heard{0, "e/a\nd\\c/d\n", ""}), Extract({"-v", "--strip", "1", "a.zarvo"}));
    EXPECT_EQ((FolderTree{{"a", "3"}, {"c/d", "4"}}), ReadFolderTree("a.zarvo_data"));
}

TEST_F(ZarvoExtract, SaysInADryRunWhatItWouldSay) {
    MakeArchive("a.zarvo", Archive("a:1 ../b:2 d| /:3"));
    const std::string problems = "zarvo: a.zarvo: ../b: the path has a component \"..\"\n"
                                 "zarvo: a.zarvo: /: the path is empty\n";
    EXPECT_EQ((Heard{1, "a\nd/\n", problems}), Extract({"--dry-run", "a.zarvo"}));
    EXPECT_FALSE(fs::exists("a.zarvo_data"));
    fs::create_directories("a.zarvo_data/a");
    const Heard heard = Extract({"--dry-run", "a.zarvo"});
    EXPECT_EQ((Heard{1, "d/\n", "zarvo: a.zarvo: a: Is a directory: a folder is in the place of a file\n" + problems}),
              heard);
    EXPECT_EQ(heard, Extract({"-v", "a.zarvo"}));
}

TEST_F(ZarvoExtract, OverwritesAsAsked) {
    MakeArchive("a.zarvo", Archive("a:new b:2"));
    const struct {
        const char* when;
        Heard heard;
        const char* left;
    } kCases[] = {
        {"--overwrite=never", {0, "b\n", ""}, "old"},
        {"--overwrite=fail", {1, "b\n", "zarvo: a.zarvo: a: File exists\n"}, "old"},
        {"--overwrite=always", {0, "a\nb\n", ""}, "new"},
    };
    for (const auto& [when, heard, left] : kCases) {
        fs::create_directory("out");
        WriteFile("out/a", "old");
        EXPECT_EQ(heard, Extract({when, "-v", "-o", "out", "a.zarvo"})) << when;
        EXPECT_EQ((FolderTree{{"a", left}, {"b", "2"}}), ReadFolderTree("out")) << when;
        fs::remove_all("out");
    }
}

TEST_F(ZarvoExtract, KeepsBrokenFilesOnRequest) {
    MakeDamagedArchive();
    EXPECT_EQ((Heard{1, "good\nbad\n", "zarvo: a.zarvo: bad: block 1 is damaged\n"}),
              Extract({"-v", "--keep-broken", "a.zarvo"}));
    EXPECT_EQ((FolderTree{{"good", "wxyz"}, {"bad", "abcd"}}), ReadFolderTree("a.zarvo_data"));
}

TEST_F(ZarvoExtract, NamesTheFolderThatCannotBeMade) {
    MakeArchive("a.zarvo", Archive("a:1 b:2"));
    WriteFile("file", "");
    const std::string refusal = "zarvo: file/out: Not a directory\n";
    EXPECT_EQ((Heard{1, "", refusal}), Extract({"-o", "file/out", "a.zarvo"}));
    EXPECT_THAT(Zarvo({"extract", "-o", "file/out", "a.zarvo"}).error,
                testing::StartsWith(refusal + "zarvo: a.zarvo: 0 files, 0 bytes, 2 failures, "));
}

TEST_F(ZarvoExtract, EndsWithASummary) {
    MakeDamagedArchive();
    const Heard heard = Zarvo({"extract", "a.zarvo"});
    EXPECT_EQ(1, heard.status);
    EXPECT_THAT(heard.error, testing::MatchesRegex("zarvo: a.zarvo: bad: block 1 is damaged\n"
                                                   "zarvo: a.zarvo: 1 files, 4 bytes, 1 failures, [0-9.]+ seconds\n"));
}

TEST_F(ZarvoExtract, SaysWhatWasDoneBeforeASignal) {
    MakeArchive("a.zarvo", Archive("a:1 b:22"));
    const Heard heard = Zarvo({"extract", "a.zarvo"}, {.signal = SIGTERM});
    EXPECT_EQ(1, heard.status);
    // The signal is seen while the files are written or, on most machines, after that.
    EXPECT_THAT(heard.error,
                testing::MatchesRegex("zarvo: ended by SIGTERM after [0-2] files, [0-3] bytes, 0 failures\n"));
}

// The most memory that the program takes to try an extraction, in KiB; 0 when it fails.
long PeakOfDryRun(const char* archive) {
    const pid_t process = fork();
    if (process == 0) {
        if (freopen("/dev/null", "w", stdout) != nullptr)
            execl(VARNEX_BINARY, "zarvo", "extract", "--dry-run", "-q", "-j1", archive, nullptr);
        _exit(kStatusNotStarted);
    }
    int status = 0;
    rusage usage = {};
    EXPECT_EQ(process, wait4(process, &status, 0, &usage));
    return status == 0 ? usage.ru_maxrss : 0;
}

TEST_F(ZarvoExtract, TakesLittleMemoryForEachEntry) {
    if (VARNEX_SANITIZED) GTEST_SKIP() << "sanitizers take memory of their own";
    constexpr long kEntries = 300'000, kBytesPerEntry = 64, kMebibyte = 1'024;
    // Made in a process that ends: a program begins with the peak of the process that starts it.
    const auto make = [] {
        ArchiveDescription archive;
        for (int number = 0; number < kEntries; ++number)
            archive.entries.push_back({.path = std::to_string(number), .bytes = "0123456789"});
        MakeArchive("a.zarvo", archive);
        return 0;
    };
    ASSERT_EQ(0, RunForked(make).first);
    const long peak = PeakOfDryRun("a.zarvo");
    EXPECT_LT(kEntries * kBytesPerEntry / 1'024, peak);
    EXPECT_GT(16 * kMebibyte + kEntries * kBytesPerEntry / 1'024, peak);
}

} // namespace
