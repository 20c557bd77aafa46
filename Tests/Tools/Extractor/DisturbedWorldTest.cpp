// The road run in process, while the file system below it fails, falls short, changes or dies.
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/FaultyFileSystem.h"
#include "Tests/Tools/Extractor/ExtractorTest.h"
#include "Tools/Extractor/Extractor.h"

#include <csignal>
#include <filesystem>
#include <sys/wait.h>
#include <unistd.h>

namespace {

namespace fs = std::filesystem;

// A folder with an archive in it, and the working directory for as long as it lives.
class Workplace {
public:
    explicit Workplace(const ArchiveDescription& description)
        : m_Before(fs::current_path()), m_Bytes(BuildArchive(description).bytes), m_Tree(TreeOf(description.entries)) {
        fs::current_path(folder.Path());
        GetFileSystem()->SetCurrentDirectory(folder.Path().c_str());
        WriteFile("a.zarvo", m_Bytes);
    }
    ~Workplace() {
        GetFileSystem()->SetCurrentDirectory("");
        fs::current_path(m_Before);
    }

    void StartAnew() {
        fs::remove_all("a.zarvo_data");
        WriteFile("a.zarvo", m_Bytes);
    }

    // Runs the road and holds what must be true whatever happens: a success is whole; a failure says so, and what it
    // leaves is the start of what should be there, and nothing else.
    bool Run() {
        ConsoleCapture capture;
        const bool isAllOk = ExtractArchive("a.zarvo");
        const std::string output = capture.Text();
        FolderTree tree = ReadFolderTree(folder.Path());
        tree.erase("a.zarvo");
        EXPECT_EQ(isAllOk, output.ends_with(kAllOk)) << output;
        EXPECT_EQ(isAllOk, output.find("ERROR: ") == std::string::npos) << output;
        EXPECT_EQ("", isAllOk ? Differences(m_Tree, tree) : "");
        for (const auto& [path, content] : tree) {
            const auto expected = m_Tree.find(path);
            EXPECT_TRUE(expected != m_Tree.end() && expected->second.starts_with(content)) << path << " in\n" << output;
        }
        return isAllOk;
    }

    const TemporaryFolder folder;

private:
    fs::path m_Before;
    std::string m_Bytes;
    FolderTree m_Tree;
};

std::vector<ArchiveDescription> SmallArchives() {
    ArchiveDescription mixed;
    mixed.entries = {{.path = "one.txt", .bytes = Compressible(700)},
                     {.path = "folder", .flags = kFolderEntry},
                     {.path = "a/b/two", .bytes = Compressible(900, 2)},
                     {.path = "empty"}};
    mixed.sectionType = kCompressionLz4;
    mixed.blocks = {{.size = 300, .type = kCompressionLz4},
                    {.size = 500, .type = kCompressionLzma, .streamed = true},
                    {.size = 400}};
    mixed.type = kCompressionLzma;
    ArchiveDescription plain = mixed; // its section is read field by field
    plain.sectionType = kCompressionNone;
    ArchiveDescription old = plain;
    old.layout = ArchiveLayout::kArchive;
    ArchiveDescription web;
    web.layout = ArchiveLayout::kWeb;
    web.entries = {{.path = "x/one", .bytes = Compressible(66'000)}, {.path = "two", .bytes = "2"}};
    ArchiveDescription raw = web;
    raw.layout = ArchiveLayout::kRaw;
    return {mixed, plain, old, web, raw};
}

constexpr int kManyCalls = 2'000;

} // namespace

TEST(DisturbedWorld, AnyCallMayFailOnceOrFromThenOnOrFallShort) {
    for (const ArchiveDescription& description : SmallArchives()) {
        Workplace workplace(description);
        FaultyFileSystem faults;
        const size_t descriptors = CountOpenDescriptors();
        for (FaultKind kind : {FaultKind{false, false}, FaultKind{true, false}, FaultKind{false, true}}) {
            int n = 0;
            bool isAllOk = false;
            do {
                SCOPED_TRACE(testing::Message() << "layout " << static_cast<int>(description.layout) << ", call "
                                                << n + 1 << (kind.isLasting ? " and all after it" : "")
                                                << (kind.isShort ? " falls short" : " fails"));
                workplace.StartAnew();
                faults.Arm(++n, kind);
                isAllOk = workplace.Run();
                EXPECT_EQ(descriptors, CountOpenDescriptors());
            } while (faults.HasStruck() && n < kManyCalls && !testing::Test::HasFailure());
            EXPECT_TRUE(isAllOk);
            EXPECT_LT(4, n);
        }
    }
}

TEST(DisturbedWorld, TheArchiveMayShrinkOrGoWhileItIsRead) {
    for (const ArchiveDescription& description : SmallArchives()) {
        Workplace workplace(description);
        FaultyFileSystem faults;
        for (bool isRemoved : {false, true}) {
            faults.action = [&] {
                if (isRemoved)
                    fs::remove("a.zarvo");
                else
                    fs::resize_file("a.zarvo", fs::file_size("a.zarvo") / 2);
            };
            int n = 0;
            bool isAllOk = false;
            do {
                SCOPED_TRACE(testing::Message() << (isRemoved ? "removed" : "cut") << " before call " << n + 1);
                workplace.StartAnew();
                faults.Arm(++n, {false, false});
                isAllOk = workplace.Run();
            } while (faults.HasStruck() && n < kManyCalls && !testing::Test::HasFailure());
            EXPECT_TRUE(isAllOk);
        }
    }
}

// Whenever a run is killed, the next one makes everything whole.
TEST(DisturbedWorld, AnInterruptedRunIsMadeGoodByTheNext) {
    const ArchiveDescription description = SmallArchives()[0];
    Workplace workplace(description);
    int status = 0;
    int n = 0;
    do {
        workplace.StartAnew();
        const pid_t child = fork();
        ASSERT_NE(-1, child);
        if (child == 0) {
            FaultyFileSystem faults;
            faults.action = [] { raise(SIGKILL); };
            faults.Arm(++n, {false, false});
            ConsoleCapture silenced;
            _exit(ExtractArchive("a.zarvo") ? 0 : 1);
        }
        ++n;
        ASSERT_EQ(child, waitpid(child, &status, 0));
        EXPECT_TRUE(workplace.Run()) << "killed at call " << n;
    } while (WIFSIGNALED(status) && n < kManyCalls && !testing::Test::HasFailure());
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
    EXPECT_LT(20, n);
}
