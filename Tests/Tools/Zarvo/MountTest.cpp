// Archives mounted for real, and read as any program would. Skipped where this process can't mount.
#include "Tests/Tools/Zarvo/ZarvoTest.h"
#include <zarvo.hpp>

#include <dirent.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <thread>

namespace {

constexpr size_t kPage = 4'096;

// A mount on the folder "m" in the foreground, in a process of its own, which has ended when the object goes.
class Mount {
public:
    explicit Mount(const std::string& archive, const std::vector<std::string>& options = {}) {
        std::vector<std::string> arguments = {"zarvo", "mount", "-f", archive, "m"};
        arguments.insert(arguments.end() - 2, options.begin(), options.end());
        m_Process = fork();
        if (m_Process == 0) {
            std::vector<char*> list;
            for (std::string& argument : arguments)
                list.push_back(argument.data());
            list.push_back(nullptr);
            dup2(m_Error.Descriptor(), STDERR_FILENO);
            execv(VARNEX_BINARY, list.data());
            _exit(kStatusNotStarted);
        }
        while (!IsMounted() && waitpid(m_Process, &m_Status, WNOHANG) == 0)
            usleep(1'000);
    }
    ~Mount() {
        if (IsMounted()) (void)Unmount("-uz");
        if (!m_HasEnded) kill(m_Process, SIGKILL);
        if (!m_HasEnded) waitpid(m_Process, nullptr, 0);
    }
    Mount(const Mount&) = delete;
    Mount& operator=(const Mount&) = delete;

    static bool IsMounted() {
        struct stat own = {}, parent = {};
        const bool isThere = stat("m", &own) == 0 && stat("m/..", &parent) == 0;
        return errno == ENOTCONN || (isThere && own.st_dev != parent.st_dev);
    }
    static Transcript Unmount(const char* how = "-u") { return RunProgram("/bin/fusermount3", {how, "m"}); }

    pid_t Process() const { return m_Process; }
    std::string Said() const { return m_Error.Read(); }

    // The status of waitpid.
    int Wait() {
        waitpid(m_Process, &m_Status, 0);
        m_HasEnded = true;
        return m_Status;
    }

private:
    const Scratch m_Error;
    pid_t m_Process;
    int m_Status = 0;
    bool m_HasEnded = false;
};

// What a read of a page gives: its bytes, or the error.
struct PageRead {
    int error = 0;
    std::string bytes = {};
    bool operator==(const PageRead&) const = default;
    friend std::ostream& operator<<(std::ostream& stream, const PageRead& read) {
        return stream << (read.error != 0 ? strerror(read.error) : Brief(read.bytes));
    }
};

class ZarvoMount : public ZarvoTest {
protected:
    void SetUp() override {
        fs::create_directory("m");
        const int device = open("/dev/fuse", O_RDWR | O_CLOEXEC);
        if (device < 0) GTEST_SKIP() << "/dev/fuse: " << strerror(errno);
        close(device);
        if (!fs::exists("/bin/fusermount3")) GTEST_SKIP() << "there is no fusermount3";
        const Mount mount(MakeSmallArchive());
        if (!Mount::IsMounted()) GTEST_SKIP() << "this process can't mount: " << mount.Said();
    }

    static std::string MakeSmallArchive() {
        MakeArchive("small.zarvo", Archive("a:1 d/b:xy"));
        return "small.zarvo";
    }

    // The results of reading a file page by page, after all of it was read in large pieces, for which the kernel reads
    // ahead.
    static std::vector<PageRead> ReadPages(const std::string& path) {
        const int file = open(path.c_str(), O_RDONLY);
        std::string bytes(fs::file_size(path), '\0');
        for (size_t offset = 0; offset < bytes.size(); offset += 50'000)
            (void)!pread(file, bytes.data(), 300'000 < bytes.size() ? 300'000 : bytes.size(), off_t(offset));
        std::vector<PageRead> pages;
        for (size_t offset = 0; offset < bytes.size(); offset += kPage) {
            std::string page(kPage, '\0');
            const ssize_t count = pread(file, page.data(), kPage, off_t(offset));
            pages.push_back({.error = count < 0 ? errno : 0, .bytes = page.substr(0, count < 0 ? 0 : size_t(count))});
        }
        close(file);
        return pages;
    }

    // What a library that knows no pages says of each of them: all its bytes can be read, or it can't be.
    static std::vector<PageRead> ReadPagesOfArchive(const std::string& path, const std::string& name) {
        zarvo::result<zarvo::archive> archive = zarvo::archive::open(path);
        const uint64_t index = *archive->find(name);
        std::vector<PageRead> pages;
        const size_t size = archive->entries()[index].size();
        for (size_t offset = 0; offset < size; offset += kPage) {
            std::string page(std::min(kPage, size - offset), '\0');
            const zarvo::read_result read = archive->read(index, offset, std::as_writable_bytes(std::span(page)));
            pages.push_back(read.error ? PageRead{.error = EIO} : PageRead{.bytes = page});
        }
        return pages;
    }

    // How many bytes a process has asked the system for, those of its archive among them.
    static size_t CountBytesRead(pid_t process) {
        std::istringstream text(ReadFile("/proc/" + std::to_string(process) + "/io"));
        std::string name;
        size_t count = 0;
        text >> name >> count;
        return name == "rchar:" ? count : 0;
    }
};

TEST_F(ZarvoMount, ShowsWhatExtractionWrites) {
    const char* const kArchives[] = {
        "lz4 chunk=1000 b:c70000 d/a:1 d/a:22 d/x| e/f/g:c3000 empty: \\q\\.\\r:1 //s/:x s/t:3 t/../u:4",
        "lzma streamed chunk=3000000 a:c2000000 d/b:c100000 d/c:r5000",
        "web levels=2 a:c70000 d/b:c100000",
        "raw a:c70000 d/b:1",
        "old lz4 a:c70000 d/b:c5000",
        // A file where a folder has to be, and the reverse: the first stays.
        "x:1 x/y:2 p/q:3 p:4 p/r:5 z:6 z| z:7 w| w:8 w/v:9 u:10 u|",
        "a:1 a/b/c:2 a/b:3 h/i/j:4 h/i:5 h:6 h/i/k:7 a:8 h/i/j/l:9 m/n:10 m/n/o:11 m/n|",
    };
    for (const char* const words : kArchives) {
        MakeArchive("a.zarvo", Archive(words));
        const Heard extraction = Zarvo({"extract", "-q", "-o", "out", "a.zarvo"});
        {
            Mount mount("a.zarvo");
            EXPECT_EQ(ReadFolderTree("out"), ReadFolderTree("m")) << words;
            const auto refused = std::count(extraction.error.begin(), extraction.error.end(), '\n');
            const std::string said =
                refused == 0 ? "" : "zarvo: a.zarvo: " + std::to_string(refused) + " entries can't be shown\n";
            EXPECT_EQ(said, mount.Said()) << words;
        }
        fs::remove_all("out");
    }
}

TEST_F(ZarvoMount, ReadsNoFileBeforeSomebodyDoes) {
    MakeArchive("a.zarvo", Archive("f:r4000000"));
    const Mount mount("a.zarvo");
    EXPECT_LT(CountBytesRead(mount.Process()), 2'000'000u);
}

TEST_F(ZarvoMount, ShowsNamesThatTheKernelTakes) {
    const std::string longest(1'024, 'n');
    MakeArchive("a.zarvo", {.entries = {{.path = "d/" + longest, .bytes = "1"}, {.path = "d/" + longest + "n"}}});
    const Mount mount("a.zarvo");
    EXPECT_EQ((FolderTree{{"d/" + longest, "1"}}), ReadFolderTree("m"));
    EXPECT_EQ("zarvo: a.zarvo: 1 entries can't be shown\n", mount.Said());
}

TEST_F(ZarvoMount, DescribesFilesAndFolders) {
    MakeArchive("a.zarvo", Archive("a:c5000 d/b:1 e|"));
    fs::last_write_time("a.zarvo", fs::file_time_type::clock::now() - std::chrono::hours(5));
    struct stat archive = {};
    ASSERT_EQ(0, stat("a.zarvo", &archive));
    std::map<std::string, ino_t> numbers;
    // In another order, in another process: the numbers are the same.
    for (const std::vector<const char*>& paths : {std::vector{"m/a", "m/d", "m/d/b", "m/e"}, {"m/e", "m/d/b", "m/a"}}) {
        const Mount mount("a.zarvo", {"-o", "r\\w"}); // "rw", as mount reads it
        for (const char* const path : paths) {
            struct stat found = {};
            ASSERT_EQ(0, stat(path, &found)) << path;
            const bool isFile = S_ISREG(found.st_mode);
            EXPECT_EQ(isFile ? S_IFREG | 0444u : S_IFDIR | 0555u, found.st_mode) << path;
            EXPECT_EQ(getuid(), found.st_uid) << path;
            EXPECT_EQ(archive.st_mtim.tv_sec, found.st_mtim.tv_sec) << path;
            EXPECT_EQ(archive.st_mtim.tv_nsec, found.st_mtim.tv_nsec) << path;
            EXPECT_EQ(numbers.emplace(path, found.st_ino).first->second, found.st_ino) << path;
        }
        struct statvfs statistics = {};
        EXPECT_EQ(0, statvfs("m", &statistics));
        EXPECT_EQ(2u, statistics.f_blocks);
        EXPECT_EQ(unsigned{ST_RDONLY}, statistics.f_flag & ST_RDONLY);
        EXPECT_EQ(0u, statistics.f_bavail);
        EXPECT_EQ(-1, open("m/a", O_RDWR));
        EXPECT_EQ(EROFS, errno);
    }
}

TEST_F(ZarvoMount, SpoilsOnlyThePagesOfDamage) {
    // Blocks that end inside pages, in several forms; some can't be decoded, at all or from some byte on.
    const std::string bytes = Bytes("c3000000");
    for (const CompressionType type : {kCompressionLz4, kCompressionLzma})
        for (const bool isStreamed : {false, true}) {
            if (isStreamed && type == kCompressionLz4) continue;
            ArchiveDescription archive = {.entries = {{.path = "before", .bytes = "x"}, {.path = "f", .bytes = bytes}},
                                          .chunkSize = isStreamed ? 1'300'000u : 100'000u,
                                          .type = type,
                                          .streamed = isStreamed};
            archive.fields["block[1].compressedSize"] = 20'000; // it ends early, so those after it are wrong, too
            MakeArchive("a.zarvo", archive);
            const Mount mount("a.zarvo");
            const std::vector<PageRead> expected = ReadPagesOfArchive("a.zarvo", "f"), found = ReadPages("m/f");
            ASSERT_EQ(expected.size(), found.size());
            EXPECT_LT(0, std::count(found.begin(), found.end(), PageRead{.error = EIO}));
            for (size_t page = 0; page < found.size(); ++page)
                EXPECT_EQ(expected[page], found[page]) << "page " << page << " of " << type << isStreamed;
            EXPECT_THAT(mount.Said(), testing::MatchesRegex("zarvo: a.zarvo: f: block [0-9]+ is damaged\n"));
        }
}

TEST_F(ZarvoMount, MapsTheGoodPagesOfADamagedFile) {
    ArchiveDescription archive = Archive("f:c40960");
    archive.blocks = {{.size = 3 * kPage}, {.size = 10, .type = kCompressionLz4, .stored = std::string(2, '\xFF')}};
    MakeArchive("a.zarvo", archive);
    const Mount mount("a.zarvo");
    const int file = open("m/f", O_RDONLY);
    const char* const mapped = static_cast<const char*>(mmap(nullptr, 10 * kPage, PROT_READ, MAP_SHARED, file, 0));
    close(file);
    ASSERT_NE(MAP_FAILED, mapped);
    const std::string bytes = Bytes("c40960");
    // In other processes, which a signal may end: they return the number of a page that is wrong.
    EXPECT_EQ(0, RunForked([&] {
                     for (const int page : {1, 2, 4, 5, 6, 7, 8, 9})
                         if (bytes.compare(size_t(page) * kPage, kPage, mapped + size_t(page) * kPage, kPage) != 0)
                             return page;
                     return 0;
                 }).first);
    EXPECT_EQ(kStatusOfSignal + SIGBUS, RunForked([&] {
                                            (void)signal(SIGBUS, SIG_DFL); // sanitizers have handlers of their own
                                            return *static_cast<const volatile char*>(mapped + 3 * kPage);
                                        }).first);
    munmap(const_cast<char*>(mapped), 10 * kPage);
}

TEST_F(ZarvoMount, ReadsStreamsInAnyOrderFromManyThreads) {
    // Three files in two streamed blocks, the second of which the last file shares.
    ArchiveDescription archive = Archive("lzma streamed chunk=4000000 a:c1500000 b:c1500000 c:c3000000");
    archive.lzma = {.level = 1,
                    .dictionarySize =
                        1 << 22}; // so large that the library keeps only one of its decoders while it is idle
    MakeArchive("a.zarvo", archive);
    const Mount mount("a.zarvo", {"-j", "4"});
    std::vector<std::thread> threads;
    std::atomic<int> wrong = 0;
    for (unsigned seed = 0; seed < 4; ++seed)
        threads.emplace_back([&, seed] {
            std::mt19937 random(seed);
            for (int count = 0; count < 20; ++count) {
                const ArchiveEntry& entry = archive.entries[random() % 3];
                std::string piece(random() % 200'000 + 1, '\0');
                const size_t offset = random() % entry.bytes.size();
                const int file = open(("m/" + entry.path).c_str(), O_RDONLY);
                const ssize_t got = pread(file, piece.data(), piece.size(), off_t(offset));
                close(file);
                if (got < 0 || piece.substr(0, size_t(got)) != entry.bytes.substr(offset, piece.size())) ++wrong;
            }
        });
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(0, wrong);
}

TEST_F(ZarvoMount, DecodesAStreamOnceForReadersInTurns) {
    ArchiveDescription archive = Archive("lzma streamed chunk=9000000 a:c3000000 b:c3000000 c:c3000000");
    archive.lzma = {.level = 1, .dictionarySize = 1 << 23};
    MakeArchive("a.zarvo", archive);
    const Mount mount("a.zarvo", {"-j", "4"});
    // Within the kernel's readahead, pieces come in another order, and in two files at a time.
    for (const auto& [first, second] : {std::pair("m/a", "m/b"), {"m/c", "m/c"}}) {
        const int files[] = {open(first, O_RDONLY), open(second, O_RDONLY)};
        std::string piece(300'000, '\0');
        for (off_t offset = 0; offset < 3'000'000; offset += off_t(piece.size()))
            for (const off_t part : {200'000, 0, 100'000})
                for (const int file : files)
                    EXPECT_EQ(100'000, pread(file, piece.data(), 100'000, offset + part));
        close(files[0]);
        close(files[1]);
    }
    // Each of the four readers may have to pass once over what another one has begun. Without a place to go on from,
    // each of the 90 reads would start anew.
    EXPECT_LT(CountBytesRead(mount.Process()), 5 * fs::file_size("a.zarvo"));
}

TEST_F(ZarvoMount, GoesToTheBackgroundUntilItIsUnmounted) {
    MakeSmallArchive();
    EXPECT_EQ(Transcript(0, ""), RunProgram(VARNEX_BINARY, {"mount", "small.zarvo", "m"}));
    EXPECT_EQ((FolderTree{{"a", "1"}, {"d/b", "xy"}}), ReadFolderTree("m"));
    EXPECT_EQ(Transcript(0, ""), Mount::Unmount());
    EXPECT_EQ(FolderTree{}, ReadFolderTree("m"));
}

TEST_F(ZarvoMount, EndsByUnmountingOrBySignals) {
    MakeSmallArchive();
    Mount unmounted("small.zarvo");
    EXPECT_EQ(Transcript(0, ""), Mount::Unmount());
    EXPECT_EQ(0, unmounted.Wait());
    EXPECT_EQ("", unmounted.Said());
    for (const auto& [signal, name] : {std::pair(SIGINT, "INT"), {SIGTERM, "TERM"}}) {
        Mount mount("small.zarvo");
        EXPECT_EQ("1", ReadFile("m/a"));
        kill(mount.Process(), signal);
        const int status = mount.Wait();
        EXPECT_TRUE(WIFSIGNALED(status)) << status;
        EXPECT_EQ(signal, WTERMSIG(status));
        EXPECT_EQ(std::string("zarvo: ended by SIG") + name + " after unmounting m\n", mount.Said());
        EXPECT_FALSE(Mount::IsMounted());
    }
}

TEST_F(ZarvoMount, DoesNotMountAfterASignal) {
    MakeSmallArchive();
    for (const char* const where : {"-f", "-q"}) {
        // In another process, which would go on until it is unmounted if it mounted.
        const Transcript transcript = RunForked([&] {
            alarm(20);
            printf("%s", Zarvo({"mount", where, "small.zarvo", "m"}, {.signal = SIGTERM}).error.c_str());
            return 0;
        });
        EXPECT_EQ(Transcript(0, "zarvo: ended by SIGTERM after opening small.zarvo\n"), transcript) << where;
        EXPECT_FALSE(Mount::IsMounted()) << where;
        (void)Mount::Unmount("-uz");
    }
}

TEST_F(ZarvoMount, ListsNothingAtPositionsOfOtherFolders) {
    MakeArchive("a.zarvo", Archive("a:1 b:2 d/x:3 c:4"));
    const Mount mount("a.zarvo");
    DIR* const folder = opendir("m/d");
    ASSERT_NE(nullptr, folder);
    for (long position = 3; position < 10; ++position) {
        seekdir(folder, position);
        const dirent* const found = readdir(folder);
        EXPECT_STREQ("none", found == nullptr ? "none" : found->d_name) << position;
    }
    closedir(folder);
}

TEST_F(ZarvoMount, FailsToReadOnceTheArchiveHasChanged) {
    MakeArchive("a.zarvo", Archive("lz4 chunk=100000 a:c100000 b:c100000 c:c100000"));
    const Mount mount("a.zarvo");
    EXPECT_EQ(Bytes("c100000"), ReadFile("m/a"));
    std::ofstream("a.zarvo", std::ios::app) << "more";
    for (const char* const path : {"m/b", "m/c"}) {
        char byte;
        const int file = open(path, O_RDONLY);
        EXPECT_EQ(-1, read(file, &byte, 1)) << path;
        EXPECT_EQ(EIO, errno) << path;
        close(file);
    }
    EXPECT_EQ("zarvo: a.zarvo: the archive's file has changed since it was opened\n", mount.Said());
}

TEST_F(ZarvoMount, SaysWhyItCannotMount) {
    MakeSmallArchive();
    WriteFile("file", "");
    fs::create_directories("full/d");
    const std::string help = "; see 'zarvo mount --help'\n";
    const struct {
        std::vector<std::string> arguments;
        std::string error;
    } kCases[] = {
        {{"small.zarvo", "none"}, "none: No such file or directory\n"},
        {{"small.zarvo", "file"}, "file: Not a directory\n"},
        {{"small.zarvo", "full"}, "full: Directory not empty\n"},
        {{"none", "m"}, "none: No such file or directory\n"},
        {{"file", "m"}, "file: not a Zarvo archive\n"},
        {{"small.zarvo"}, "no folder is named" + help},
        {{"small.zarvo", "m", "x"}, "'x' is one argument too many" + help},
        {{"-o", "ro,nonsense", "small.zarvo", "m"}, "-o OPTIONS: 'nonsense' is no option of a mount" + help},
        {{"-o", "noexec,rw", "small.zarvo", "m"}, "-o OPTIONS: 'rw' is no option of a mount" + help},
    };
    for (const auto& [arguments, error] : kCases)
        for (const char* const where : {"-f", "-q"}) {
            std::vector<std::string> list = {"mount", where};
            list.insert(list.end(), arguments.begin(), arguments.end());
            EXPECT_EQ(Transcript(2, "zarvo: " + error), RunProgram(VARNEX_BINARY, list)) << error;
        }
}

TEST_F(ZarvoMount, SaysThatItMayNotMount) {
    if (getuid() != 0) GTEST_SKIP() << "only root can become somebody who may not";
    const auto becomeSomebody = [] { return setuid(65'534) == 0; };
    if (RunProgram(VARNEX_BINARY, {"--version"}, ".", becomeSomebody).first != 0)
        GTEST_SKIP() << "others may not look into the folder of the build";
    MakeSmallArchive();
    fs::permissions(".", fs::perms::group_exec | fs::perms::others_exec, fs::perm_options::add);
    // Of the device or, where all may open it, of the folder, which fusermount3 looks at.
    EXPECT_THAT(
        RunProgram(VARNEX_BINARY, {"mount", "small.zarvo", "m"}, ".", becomeSomebody),
        testing::Pair(2, testing::MatchesRegex("zarvo: m: [^\n]*([Pp]ermission denied|no write access)[^\n]*\n")));
}

} // namespace
