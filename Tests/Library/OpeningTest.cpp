#include "PlatformDependent/Linux/FileDescriptor.h"
#include "Tests/Library/LibraryTest.h"
#include "Tests/Support/ArchiveBuilder.h"
#include "Tests/Support/TemporaryFolder.h"

#include <fcntl.h>
#include <stdexcept>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr char kText[] = "the text of the file";

std::string SmallArchive() {
    return BuildArchive({.entries = {{.path = "folder/text", .bytes = kText}}, .type = kCompressionLz4}).bytes;
}

// Why opening fails.
struct Refusal {
    zarvo_code code = ZARVO_OK;
    std::string text = {};

    friend bool operator==(const Refusal&, const Refusal&) = default;
    friend std::ostream& operator<<(std::ostream& out, const Refusal& refusal) {
        return out << refusal.code << " " << refusal.text;
    }
};

template <typename From>
Refusal Refuse(From&& from, zarvo::open_options options = {}) {
    const auto opened = zarvo::archive::open(std::forward<From>(from), std::move(options));
    return {opened.error().code(), std::string(opened.error().text())};
}

} // namespace

TEST(Opening, EverySourceGivesTheSameArchive) {
    const std::string bytes = "bytes in front of it" + SmallArchive();
    const zarvo::open_options options{.offset = 20};
    const TemporaryFolder folder;
    WriteFile(folder / "archive", bytes);
    const int descriptor = open((folder / "archive").c_str(), O_RDONLY);
    lseek(descriptor, 3, SEEK_SET);

    std::vector<zarvo::archive> archives;
    archives.push_back(*zarvo::archive::open(folder / "archive", options));
    archives.push_back(*zarvo::archive::open(descriptor, options));
    archives.push_back(*zarvo::archive::open(BytesOf(bytes), options));
    archives.push_back(*zarvo::archive::open(std::make_unique<CountingSource>(bytes), options));
    EXPECT_EQ(3, lseek(descriptor, 0, SEEK_CUR));
    close(descriptor);
    for (zarvo::archive& archive : archives) {
        EXPECT_EQ(Delivered{kText}, Read(archive, 0, 0, 100));
        EXPECT_EQ(bytes.size() - 20, archive.info().file_size);
    }
}

TEST(Opening, LegacyLayoutsBeginAtTheirOffsetToo) {
    for (const ArchiveLayout layout : {ArchiveLayout::kWeb, ArchiveLayout::kRaw, ArchiveLayout::kArchive}) {
        const std::string bytes = std::string(777, 'x') +
                                  BuildArchive({.layout = layout, .entries = {{.path = "text", .bytes = kText}}}).bytes;
        zarvo::archive archive = OpenBytes(bytes, {.offset = 777});
        EXPECT_EQ(Delivered{kText}, Read(archive, 0, 0, 100)) << static_cast<int>(layout);
    }
}

TEST(Opening, WhatIsNoArchiveIsRefusedWithTheReason) {
    const TemporaryFolder folder;
    const std::string archive = SmallArchive();
    WriteFile(folder / "text", "ZarvoFT");
    WriteFile(folder / "empty", "");
    WriteFile(folder / "cut", archive.substr(0, 60));
    WriteFile(folder / "archive", archive);
    ASSERT_EQ(0, mkfifo((folder / "pipe").c_str(), 0600));
    const std::string noRandomAccess = "Illegal seek: an archive must be a file that can be read at any place";
    EXPECT_EQ((Refusal{ZARVO_ERROR_SYSTEM, "No such file or directory"}), Refuse(folder / "missing"));
    EXPECT_EQ((Refusal{ZARVO_ERROR_SYSTEM, "Is a directory"}), Refuse(folder.Path()));
    EXPECT_EQ((Refusal{ZARVO_ERROR_SYSTEM, noRandomAccess}), Refuse(folder / "pipe"));
    EXPECT_EQ((Refusal{ZARVO_ERROR_SYSTEM, noRandomAccess}), Refuse("/dev/null"));
    EXPECT_EQ((Refusal{ZARVO_ERROR_SYSTEM, "Bad file descriptor"}), Refuse(-1));
    EXPECT_EQ((Refusal{ZARVO_ERROR_NOT_AN_ARCHIVE, "not a Zarvo archive"}), Refuse(folder / "text"));
    EXPECT_EQ((Refusal{ZARVO_ERROR_NOT_AN_ARCHIVE, "not a Zarvo archive"}), Refuse(folder / "empty"));
    EXPECT_EQ((Refusal{ZARVO_ERROR_NOT_AN_ARCHIVE, "the archive's header or directory is damaged"}),
              Refuse(folder / "cut"));
    EXPECT_EQ((Refusal{ZARVO_ERROR_NOT_AN_ARCHIVE, "the offset is past the end"}),
              Refuse(folder / "archive", {.offset = archive.size() + 1}));
}

// A path longer than the runtime's limit, and with characters that the runtime would turn.
TEST(Opening, PathsAreTheSystemsOwn) {
    const TemporaryFolder folder;
    std::string deep = folder.Path();
    for (int level = 0; level < 12; ++level) {
        deep += "/" + std::string(200, 'd');
        ASSERT_EQ(0, mkdir(deep.c_str(), 0700));
    }
    for (const std::string& path : {deep + "/archive", folder / "a\\b", folder / "~"}) {
        WriteFile(path, SmallArchive());
        EXPECT_EQ(Refusal{}, Refuse(path)) << path;
    }
}

TEST(Opening, LimitsAreNamedWhenTheyAreReached) {
    ArchiveDescription description{.sectionType = kCompressionLz4};
    for (int number = 0; number < 100; ++number)
        description.entries.push_back({.path = "entry"});
    const std::string bytes = BuildArchive(description).bytes;
    description.layout = ArchiveLayout::kWeb;
    for (int number = 0; number < 10'000; ++number)
        description.entries.push_back({.path = "entry"});
    const std::string web = BuildArchive(description).bytes;
    EXPECT_EQ((Refusal{ZARVO_ERROR_LIMIT, "100 entries; the limit (max_entries) is 99"}),
              Refuse(BytesOf(bytes), {.max_entries = 99}));
    EXPECT_EQ(Refusal{}, Refuse(BytesOf(bytes), {.max_entries = 100}));
    EXPECT_EQ((Refusal{ZARVO_ERROR_LIMIT, "a directory of 2624 bytes; the limit (max_directory_bytes) is 1000"}),
              Refuse(BytesOf(bytes), {.max_directory_bytes = 1'000}));
    EXPECT_EQ((Refusal{ZARVO_ERROR_LIMIT,
                       "the directory does not end in 1000 bytes, which is the limit (max_directory_bytes)"}),
              Refuse(BytesOf(web), {.max_directory_bytes = 1'000}));
    description.entries.resize(100);
    description.entries[0].bytes = "xxx";
    description.chunkSize = 1; // blocks, of 24 bytes in their list
    for (const auto& [layout, size] :
         {std::pair(ArchiveLayout::kWeb, 1'400u), {ArchiveLayout::kRaw, 1'400u}, {ArchiveLayout::kArchive, 2'672u}}) {
        description.layout = layout;
        const std::string archive = BuildArchive(description).bytes;
        EXPECT_EQ(Refusal{}, Refuse(BytesOf(archive), {.max_directory_bytes = size})) << size;
        EXPECT_EQ(
            (Refusal{ZARVO_ERROR_LIMIT, "a directory of " + std::to_string(size) +
                                            " bytes; the limit (max_directory_bytes) is " + std::to_string(size - 1)}),
            Refuse(BytesOf(archive), {.max_directory_bytes = size - 1}));
    }
}

TEST(Opening, ChangedFileIsAnErrorFromThenOn) {
    const TemporaryFolder folder;
    WriteFile(folder / "archive", SmallArchive());
    zarvo::archive archive = *zarvo::archive::open(folder / "archive");
    EXPECT_EQ(Delivered{kText}, Read(archive, 0, 0, 100));
    const timespec times[2] = {{.tv_sec = 1, .tv_nsec = 1}, {.tv_sec = 1, .tv_nsec = 1}};
    ASSERT_EQ(0, utimensat(AT_FDCWD, (folder / "archive").c_str(), times, 0));
    EXPECT_EQ((Delivered{"", ZARVO_ERROR_CHANGED}), Read(archive, 0, 0, 100));
    EXPECT_EQ((Delivered{"", ZARVO_ERROR_CHANGED}), Read(archive, 0, 0, 100));
}

TEST(Opening, ReplacedFileIsReadOn) {
    const TemporaryFolder folder;
    WriteFile(folder / "archive", SmallArchive());
    zarvo::archive archive = *zarvo::archive::open(folder / "archive");
    WriteFile(folder / "new", "another one");
    ASSERT_EQ(0, rename((folder / "new").c_str(), (folder / "archive").c_str()));
    EXPECT_EQ(Delivered{kText}, Read(archive, 0, 0, 100));
}

TEST(Opening, DeletedFileThatIsWrittenToIsAnError) {
    const TemporaryFolder folder;
    const std::string path = folder / "archive";
    WriteFile(path, SmallArchive());
    const timespec longAgo[2] = {{.tv_sec = 1, .tv_nsec = 0}, {.tv_sec = 1, .tv_nsec = 0}};
    ASSERT_EQ(0, utimensat(AT_FDCWD, path.c_str(), longAgo, 0));
    zarvo::archive archive = *zarvo::archive::open(path);
    const FileDescriptor writer(open(path.c_str(), O_WRONLY));
    ASSERT_EQ(0, unlink(path.c_str()));
    EXPECT_EQ(Delivered{kText}, Read(archive, 0, 0, 100));
    ASSERT_EQ(1, pwrite(writer.Get(), "Z", 1, 0)); // the byte that is there
    EXPECT_EQ((Delivered{"", ZARVO_ERROR_CHANGED}), Read(archive, 0, 0, 100));
}

// Only its time of change tells, which is not that of a deletion.
TEST(Opening, UnnamedFileWithATimeSetBackIsAnError) {
    const TemporaryFolder folder;
    const std::string path = folder / "archive";
    WriteFile(path, SmallArchive());
    const FileDescriptor file(open(path.c_str(), O_RDONLY));
    ASSERT_EQ(0, unlink(path.c_str()));
    zarvo::archive archive = *zarvo::archive::open(file.Get());
    EXPECT_EQ(Delivered{kText}, Read(archive, 0, 0, 100));
    struct stat status;
    ASSERT_EQ(0, fstat(file.Get(), &status));
    usleep(20'000); // the system's times of files go in steps
    const timespec times[2] = {status.st_atim, status.st_mtim};
    ASSERT_EQ(0, futimens(file.Get(), times));
    EXPECT_EQ((Delivered{"", ZARVO_ERROR_CHANGED}), Read(archive, 0, 0, 100));
}

// Each read of the source fails once: opening or reading says so, and what is read afterwards is right.
TEST(Opening, EachFailingReadIsAnError) {
    const std::string text = SampleText(50'000);
    for (const ArchiveLayout layout : {ArchiveLayout::kBlockBased, ArchiveLayout::kWeb, ArchiveLayout::kRaw}) {
        const std::string bytes =
            BuildArchive({.layout = layout, .entries = {{.path = "text", .bytes = text}}, .type = kCompressionLzma})
                .bytes;
        bool isClean = false;
        for (int failing = 1; !isClean; ++failing) {
            SCOPED_TRACE(failing);
            ASSERT_LT(failing, 100);
            auto source = std::make_unique<CountingSource>(bytes);
            CountingSource& counts = *source;
            source->failingRead = failing;
            zarvo::result<zarvo::archive> opened = zarvo::archive::open(std::move(source));
            if (!opened) {
                EXPECT_EQ("Connection timed out", opened.error().text());
                continue;
            }
            const Delivered first = Read(*opened, 0, 0, text.size());
            isClean = counts.reads < failing;
            counts.failingRead = 0;
            EXPECT_EQ(isClean ? ZARVO_OK : ZARVO_ERROR_SYSTEM, first.code);
            EXPECT_EQ(Delivered{text}, Read(*opened, 0, 0, text.size()));
        }
    }
}

// The sanitizers look on.
TEST(Opening, SourceThatLiesAboutItsSizeDoesNoHarm) {
    const std::string bytes = SmallArchive();
    for (const int64_t claimed : {INT64_MAX, int64_t{0}, int64_t{61}, static_cast<int64_t>(bytes.size()) - 1}) {
        auto source = std::make_unique<CountingSource>(bytes);
        source->claimedSize = claimed;
        zarvo::result<zarvo::archive> opened = zarvo::archive::open(std::move(source));
        const Delivered got = opened ? Read(*opened, 0, 0, 100) : Delivered();
        EXPECT_EQ(std::string_view(kText).substr(0, got.bytes.size()), got.bytes) << "claimed " << claimed;
    }
}

TEST(Opening, ShortReadsOfASourceAreContinued) {
    auto oneByOne = std::make_unique<CountingSource>(SmallArchive());
    oneByOne->longestRead = 1;
    zarvo::archive archive = *zarvo::archive::open(std::move(oneByOne));
    EXPECT_EQ(Delivered{kText}, Read(archive, 0, 0, 100));
}

TEST(Opening, WhateverACallbackAnswersIsAnError) {
    struct Answers {
        const char* what;
        uint64_t size = 1'000;
        int sizeAnswer = 0;
        int64_t (*read)(size_t size) = [](size_t) { return INT64_MIN; };
        int systemCode = EIO;
    };
    const Answers cases[] = {
        {.what = "impossible size", .size = UINT64_MAX},
        {.what = "an errno instead of the size", .sizeAnswer = -ENOENT, .systemCode = ENOENT},
        {.what = "a positive number instead", .sizeAnswer = 1},
        {.what = "a number that is no errno", .sizeAnswer = INT32_MIN},
        {.what = "a number that is no errno, from a read"},
        {.what = "a byte too many", .read = [](size_t size) { return static_cast<int64_t>(size) + 1; }},
    };
    for (Answers row : cases) {
        zarvo_source source = ZARVO_SOURCE_INIT;
        source.context = &row;
        source.read_at = [](void* context, void*, size_t size, uint64_t) {
            return static_cast<Answers*>(context)->read(size);
        };
        source.get_size = [](void* context, uint64_t* size) {
            *size = static_cast<Answers*>(context)->size;
            return static_cast<Answers*>(context)->sizeAnswer;
        };
        zarvo_archive* opened = nullptr;
        zarvo_error* error = nullptr;
        EXPECT_EQ(ZARVO_ERROR_SYSTEM, zarvo_open_source(&source, nullptr, &opened, &error)) << row.what;
        EXPECT_EQ(row.systemCode, zarvo_error_errno(error)) << row.what;
        zarvo_error_free(error);
    }
}

TEST(Opening, ExceptionOfACallbackComesOutOfTheCall) {
    auto source = std::make_unique<CountingSource>(SmallArchive());
    source->beforeRead = [] { throw std::runtime_error("from the source"); };
    EXPECT_THROW((void)zarvo::archive::open(std::move(source)), std::runtime_error);
}

TEST(Opening, DescriptorsAreClosedOnEveryWayOut) {
    const TemporaryFolder folder;
    WriteFile(folder / "archive", SmallArchive());
    WriteFile(folder / "text", "text");
    const size_t before = CountOpenDescriptors();
    for (const std::string& path : {folder / "archive", folder / "text", folder / "missing", folder.Path()})
        (void)zarvo::archive::open(path);
    EXPECT_EQ(before, CountOpenDescriptors());
}
