// The subcommands that read whole archives and write nothing: test and sum.
#include "Tests/Tools/Zarvo/ZarvoTest.h"

namespace {

constexpr const char* kDigestOf1 = "6b86b273ff34fce19d6b804eff5a3f5747ada4eaa22f1d49c01e52ddb7875b4b";

class ZarvoTestCommand : public ZarvoTest {
protected:
    // Block 1, which holds the end of "bad" and the start of "worse", can't be decoded.
    static void MakeDamagedArchive(const std::string& path) {
        ArchiveDescription archive = Archive("good:1 bad:abcdef worse\xFF:ghi folder|");
        archive.blocks = {{.size = 4}, {.size = 4, .type = kCompressionLz4, .stored = std::string(3, '\xFF')}};
        MakeArchive(path, archive);
    }
};

TEST_F(ZarvoTestCommand, IsSilentOfAWholeArchive) {
    MakeArchive("a.zarvo", Archive("lz4 chunk=1000 a:c70000 b: d|"));
    EXPECT_EQ((Heard{0, "", ""}), Zarvo({"test", "a.zarvo"}));
}

TEST_F(ZarvoTestCommand, PrintsDamagedFilesAndSaysDamagedBlocks) {
    MakeDamagedArchive("a.zarvo");
    const std::string said = "zarvo: a.zarvo: block 1 is damaged\n";
    EXPECT_EQ((Heard{1, "bad\nworse\xFF\n", said}), Zarvo({"test", "a.zarvo"}));
    EXPECT_EQ((Heard{1, std::string("bad\0worse\xFF\0", 11), said}), Zarvo({"test", "-0", "a.zarvo"}));
}

TEST_F(ZarvoTestCommand, SaysDamagedBlocksThatNoFileUses) {
    ArchiveDescription archive = Archive("a:1 ?:22");
    archive.blocks = {{.size = 1}, {.size = 2, .type = kCompressionLz4, .stored = std::string(1, '\xFF')}};
    MakeArchive("a.zarvo", archive);
    EXPECT_EQ((Heard{1, "", "zarvo: a.zarvo: block 1 is damaged\n"}), Zarvo({"test", "a.zarvo"}));
}

TEST_F(ZarvoTestCommand, NamesTheArchiveOfSeveral) {
    MakeArchive("whole.zarvo", Archive("a:1"));
    MakeDamagedArchive("a.zarvo");
    EXPECT_EQ((Heard{1, "a.zarvo: bad\na.zarvo: worse\xFF\n",
                     "zarvo: a.zarvo: block 1 is damaged\nzarvo: none: No such file or directory\n"}),
              Zarvo({"test", "whole.zarvo", "a.zarvo", "none"}));
    EXPECT_EQ((Heard{2, "", "zarvo: none: No such file or directory\n"}), Zarvo({"test", "none"}));
}

TEST_F(ZarvoTestCommand, PrintsAnObjectALineAsJson) {
    MakeDamagedArchive("a.zarvo");
    EXPECT_EQ((Heard{1,
                     "{\"archive\":\"a.zarvo\",\"path\":\"bad\",\"size\":6,\"readable\":3}\n"
                     "{\"archive\":\"a.zarvo\",\"path\":\"worse\xEF\xBF\xBD\",\"pathBytes\":\"d29yc2X/\",\"size\":3,"
                     "\"readable\":0}\n",
                     "zarvo: a.zarvo: block 1 is damaged\n"}),
              Zarvo({"test", "--json", "a.zarvo"}));
}

TEST_F(ZarvoTestCommand, SaysWhatWasDoneBeforeASignal) {
    MakeArchive("a.zarvo", Archive("a:1"));
    EXPECT_EQ((Heard{1, "", "zarvo: ended by SIGINT after 0 bytes of data\n"}),
              Zarvo({"test", "a.zarvo"}, {.signal = SIGINT}));
}

class ZarvoSum : public ZarvoTest {};

TEST_F(ZarvoSum, PrintsWhatTheSystemsProgramsPrint) {
    MakeArchive("a.zarvo", {.entries = {{.path = "b", .bytes = "1"},
                                        {.path = "/d//a b", .bytes = Bytes("c3000000")},
                                        {.path = "-x\r", .bytes = "2"},
                                        {.path = "d\\new\nline", .bytes = "3"},
                                        {.path = "\xFF\x1B", .bytes = ""},
                                        {.path = "e", .flags = kFolderEntry}},
                            .chunkSize = 100'000,
                            .type = kCompressionLz4});
    EXPECT_EQ(0, Zarvo({"extract", "-q", "-o", "out", "a.zarvo"}).status);
    const std::pair<const char*, const char*> kCases[] = {{"sha256", "sha256sum"},
                                                          {"sha1", "sha1sum"},
                                                          {"md5", "md5sum"},
                                                          {"sha512", "sha512sum"},
                                                          {"blake2b512", "b2sum"}};
    for (const auto& [algorithm, program] : kCases) {
        const std::string line =
            "cd out && " + std::string(program) + " b 'd/a b' $'./-x\\r' $'d/new\\nline' $'\\xFF\\x1B'";
        const Transcript expected = RunProgram("/bin/bash", {"-c", line});
        for (const char* const threads : {"1", "2", "8"})
            EXPECT_EQ((Heard{0, expected.second, ""}), Zarvo({"sum", "-j", threads, "-a", algorithm, "a.zarvo"}));
    }
}

// The last entry's bytes come first, so that all others wait.
TEST_F(ZarvoSum, KeepsTheArchivesOrder) {
    constexpr size_t kCount = 1'100;
    ArchiveDescription archive;
    for (size_t index = 0; index < kCount; ++index) {
        const std::string number = std::to_string(10'000 + index);
        archive.entries.push_back({.path = number, .bytes = number});
        archive.fields["node[" + std::to_string(index) + "].offset"] = (kCount - 1 - index) * number.size();
    }
    MakeArchive("a.zarvo", archive);
    EXPECT_EQ(0, Zarvo({"extract", "-q", "-o", "out", "a.zarvo"}).status);
    const Transcript expected = RunProgram("/bin/bash", {"-c", "cd out && sha256sum *"});
    for (const char* const threads : {"1", "8"})
        EXPECT_EQ((Heard{0, expected.second, ""}), Zarvo({"sum", "-j", threads, "a.zarvo"})) << threads;
}

TEST_F(ZarvoSum, IsTakenByTheProgramThatChecks) {
    MakeArchive("a.zarvo", {.entries = {{.path = "-", .bytes = "1"}, {.path = "a\r\nb", .bytes = "2"}}});
    EXPECT_EQ(0, Zarvo({"extract", "-q", "a.zarvo"}).status);
    WriteFile("sums", Zarvo({"sum", "a.zarvo"}).output);
    EXPECT_EQ(Transcript(0, "./-: OK\n\\a\\r\\nb: OK\n"),
              RunProgram("/bin/bash", {"-c", "cd a.zarvo_data && sha256sum -c ../sums"}));
}

TEST_F(ZarvoSum, SaysOfOtherFilesWhatIsWrong) {
    ArchiveDescription archive = Archive("a:1 bad:abcdef ../b:x a/c:x d|");
    archive.blocks = {{.size = 4}, {.size = 3, .type = kCompressionLz4, .stored = std::string(2, '\xFF')}};
    MakeArchive("a.zarvo", archive);
    EXPECT_EQ((Heard{1, std::string(kDigestOf1) + "  a\n",
                     "zarvo: a.zarvo: bad: block 1 is damaged\n"
                     "zarvo: a.zarvo: ../b: the path has a component \"..\"\n"
                     "zarvo: a.zarvo: a/c: an entry before it in the archive has its place\n"}),
              Zarvo({"sum", "a.zarvo"}));
}

TEST_F(ZarvoSum, SaysNamesThatNoDiskTakes) {
    const std::string name(256, 'n');
    MakeArchive("a.zarvo", {.entries = {{.path = name + "/a", .bytes = "x"},
                                        {.path = "b/" + name, .bytes = "x"},
                                        {.path = std::string(255, 'n'), .bytes = "1"},
                                        {.path = "", .bytes = "x"}}});
    const Heard heard = Zarvo({"sum", "a.zarvo"});
    EXPECT_EQ((Heard{1, std::string(kDigestOf1) + "  " + std::string(255, 'n') + "\n",
                     "zarvo: a.zarvo: " + name + "/a: File name too long\n" + "zarvo: a.zarvo: b/" + name +
                         ": File name too long\n" + "zarvo: a.zarvo: '': the path is empty\n"}),
              heard);
    EXPECT_EQ(heard.error, Zarvo({"extract", "-q", "a.zarvo"}).error);
}

TEST_F(ZarvoSum, TakesPatterns) {
    MakeArchive("a.zarvo", Archive("a:1 b:2 c:1"));
    EXPECT_EQ(
        (Heard{1, std::string(kDigestOf1) + "  a\n" + kDigestOf1 + "  c\n", "zarvo: a.zarvo: none: matches nothing\n"}),
        Zarvo({"sum", "--files-from=-", "-0", "a.zarvo", "a", "none"}, {.input = std::string("c\0", 2)}));
}

TEST_F(ZarvoSum, EscapesNamesOnTerminals) {
    MakeArchive("a.zarvo", {.entries = {{.path = "a\x1b\n", .bytes = "1"}}});
    EXPECT_EQ((Heard{0, "\\" + std::string(kDigestOf1) + "  a\\x1b\\n\n", ""}),
              Zarvo({"sum", "a.zarvo"}, {.isOutputTerminal = true}));
}

} // namespace
