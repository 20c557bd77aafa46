#include "Tests/Tools/Extractor/ExtractorTest.h"

#include <filesystem>
#include <unistd.h>

namespace {

ArchiveDescription TwoFiles() {
    ArchiveDescription archive;
    archive.entries = {{.path = "a.bin", .bytes = Incompressible(150'000)},
                       {.path = "folder", .flags = kFolderEntry},
                       {.path = "folder/b.txt", .bytes = "text"}};
    archive.type = kCompressionLz4;
    return archive;
}

TEST(Command, WithoutAnArgumentOnlySaysHowItIsUsed) {
    const TemporaryFolder folder;
    EXPECT_EQ((Transcript{.status = 1, .output = "Usage: Varnex <zarvowebfile>\n"}),
              RunVarnex({}, {.workingDirectory = folder.Path()}));
    EXPECT_EQ("", Differences({}, ReadFolderTree(folder.Path())));
}

TEST(Command, LooksAtItsFirstArgumentOnly) {
    const TemporaryFolder folder;
    const BuiltArchive built = BuildArchive(TwoFiles());
    for (const char* const name : {"a.zarvo", "b.zarvo"})
        WriteFile(folder / name, built.bytes);
    EXPECT_EQ((Transcript{.status = 0, .output = Report(7, built.bytes.size())}),
              RunVarnex({"a.zarvo", "b.zarvo", "--help", ""}, {.workingDirectory = folder.Path()}));
    FolderTree tree = TreeOf(TwoFiles().entries);
    tree["a.zarvo"] = tree["b.zarvo"] = built.bytes;
    EXPECT_EQ("", Differences(tree, ReadFolderTree(folder.Path())));
}

TEST(Command, WithAnEmptyArgumentFindsNoFile) {
    const TemporaryFolder folder;
    EXPECT_EQ((Transcript{.status = 1, .output = "Extracting file ''...\nUnable to open archive file: \n" + kCantRead}),
              RunVarnex({""}, {.workingDirectory = folder.Path()}));
    EXPECT_EQ("", Differences({}, ReadFolderTree(folder.Path())));
}

TEST(Command, RunAgainRewritesWhatItMadeAndLeavesTheRest) {
    const TemporaryFolder folder;
    const std::string bytes = BuildArchive(TwoFiles()).bytes;
    const FolderTree tree = TreeOf(TwoFiles().entries);
    ExpectOutcome(0, Report(7, bytes.size()), tree, Extract(folder, bytes));
    ExpectOutcome(0, Report(7, bytes.size()), tree, Extract(folder, bytes));

    // As after a run that was interrupted, and with something else in the folder.
    const std::string output = folder / "a.zarvo_data/";
    WriteFile(output + "a.bin", "cut");
    WriteFile(output + "folder/b.txt", Incompressible(100'000));
    WriteFile(output + "other", "other");
    FolderTree withOther = tree;
    withOther["a.zarvo_data/other"] = "other";
    ExpectOutcome(0, Report(7, bytes.size()), withOther, Extract(folder, bytes));
}

// The last node fails while its file is open, which is when a message could land in that file.
TEST(Command, WithClosedStandardDescriptorsKeepsItsMessagesOutOfTheFiles) {
    ArchiveDescription archive = TwoFiles();
    archive.entries.push_back({.path = "past the end"});
    archive.fields = {{"node[3].size", 1}};
    const std::string bytes = BuildArchive(archive).bytes;
    const std::string report = Report(7, bytes.size(), "ERROR: failed to decompress file past the end\n");
    struct {
        std::vector<int> closed;
        std::string output;
    } const rows[] = {
        {{0}, report}, {{1}, ""}, {{2}, report}, {{0, 1}, ""}, {{0, 2}, report}, {{1, 2}, ""}, {{0, 1, 2}, ""},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(testing::PrintToString(row.closed));
        ExpectOutcome(1, row.output, TreeOf(archive.entries), Extract(bytes, {.closedDescriptors = row.closed}));
    }
}

TEST(Command, GoesOnWhenNobodyTakesItsMessages) {
    const std::string bytes = BuildArchive(TwoFiles()).bytes;
    const FolderTree tree = TreeOf(TwoFiles().entries);
    ExpectOutcome(0, "", tree, Extract(bytes, {.readsOutput = false}));
    ExpectOutcome(0, "", tree, Extract(bytes, {.outputFile = "/dev/full"}));
}

TEST(DisturbedOutput, SomethingElseStandsWhereTheOutputGoes) {
    const std::string bytes = BuildArchive(TwoFiles()).bytes;
    const TemporaryFolder folder;
    const std::string output = folder / "a.zarvo_data";
    WriteFile(output, "file");
    ExpectOutcome(1,
                  Report(7, bytes.size(),
                         "ERROR: failed to create directory \nERROR: failed to create file a.bin\n"
                         "ERROR: failed to create directory folder\n"
                         "ERROR: failed to create directory folder\nERROR: failed to create file folder/b.txt\n"),
                  {{"a.zarvo_data", "file"}}, Extract(folder, bytes));

    std::filesystem::remove(output);
    std::filesystem::create_directories(output + "/a.bin");
    WriteFile(output + "/folder", "file");
    ExpectOutcome(1,
                  Report(7, bytes.size(),
                         "ERROR: failed to create file a.bin\nERROR: failed to create directory folder\n"
                         "ERROR: failed to create directory folder\nERROR: failed to create file folder/b.txt\n"),
                  OutputTree({{"a.bin", kFolder}, {"folder", "file"}}), Extract(folder, bytes));
}

TEST(DisturbedOutput, WritesThatFailEndTheirFileOnly) {
    const std::string bytes = BuildArchive(TwoFiles()).bytes;
    const std::string report = Report(7, bytes.size(), "ERROR: failed to write file a.bin\n");
    // A file may grow to fewer bytes than it has: a write in the middle is short, or the last one is.
    for (const size_t largest : std::vector<size_t>{100'000, 149'999}) {
        SCOPED_TRACE(largest);
        ExpectOutcome(1, report,
                      OutputTree({{"a.bin", Incompressible(150'000).substr(0, largest)}, {"folder/b.txt", "text"}}),
                      Extract(bytes, {.largestFile = static_cast<long long>(largest)}));
    }

    if (access("/dev/full", W_OK) != 0) GTEST_SKIP() << "no full device here";
    const TemporaryFolder folder;
    std::filesystem::create_directory(folder / "a.zarvo_data");
    std::filesystem::create_symlink("/dev/full", folder / "a.zarvo_data/a.bin");
    ExpectOutcome(1, report, OutputTree({{"a.bin", "<link to /dev/full>"}, {"folder/b.txt", "text"}}),
                  Extract(folder, bytes));
}

// As another user when this one is not stopped by any permission.
TEST(DisturbedOutput, PermissionsAreRespected) {
    using std::filesystem::perms;
    const std::string bytes = BuildArchive(TwoFiles()).bytes;
    const TemporaryFolder folder;
    const std::string path = folder.Path(), output = path + "/a.zarvo_data";
    const RunOptions options = {.workingDirectory = path, .unprivileged = true};
    std::filesystem::permissions(path, perms::all);
    if (RunVarnex({}, options).status != 1) GTEST_SKIP() << "the program can't be run by another user here";

    // A file that can't be written, in a folder that can.
    WriteFile(path + "/a.zarvo", bytes);
    std::filesystem::create_directory(output);
    WriteFile(output + "/a.bin", "kept");
    std::filesystem::permissions(output, perms::all);
    std::filesystem::permissions(output + "/a.bin", perms::owner_read | perms::others_read);
    FolderTree tree = OutputTree({{"a.bin", "kept"}, {"folder/b.txt", "text"}});
    tree["a.zarvo"] = bytes;
    EXPECT_EQ((Transcript{.status = 1, .output = Report(7, bytes.size(), "ERROR: failed to create file a.bin\n")}),
              RunVarnex({"a.zarvo"}, options));
    EXPECT_EQ("", Differences(tree, ReadFolderTree(path)));

    // No output folder can be made.
    std::filesystem::remove_all(output);
    std::filesystem::permissions(path, perms::owner_all | perms::others_read | perms::others_exec);
    if (geteuid() != 0) std::filesystem::permissions(path, perms::owner_read | perms::owner_exec);
    const std::string refused = FolderRefused(output, EACCES, path);
    const std::string messages =
        refused + "ERROR: failed to create directory \nERROR: failed to create file a.bin\n" + refused +
        "ERROR: failed to create directory folder\n" + refused +
        "ERROR: failed to create directory folder\nERROR: failed to create file folder/b.txt\n";
    EXPECT_EQ((Transcript{.status = 1, .output = Report(7, bytes.size(), messages)}), RunVarnex({"a.zarvo"}, options));
    EXPECT_EQ("", Differences({{"a.zarvo", bytes}}, ReadFolderTree(path)));

    // The archive can't be read.
    std::filesystem::permissions(path + "/a.zarvo", perms::none);
    EXPECT_EQ((Transcript{.status = 1, .output = kStarting + "Unable to open archive file: a.zarvo\n" + kCantRead}),
              RunVarnex({"a.zarvo"}, options));
    std::filesystem::permissions(path, perms::owner_all);
}

} // namespace
