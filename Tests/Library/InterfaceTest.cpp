// What programs that are already compiled rely on: names, sizes and places.
#include "Tests/Library/LibraryTest.h"
#include "Tests/Support/ArchiveBuilder.h"
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"

#include <malloc.h>
#include <regex>
#include <set>
#include <sys/wait.h>

namespace {

// What the library asks for; the request that requestsLeft counts down to is refused. Those of a few hundred bytes are
// not counted: without them the process may end.
constexpr size_t kSmall = 512;
int s_RequestsLeft = -1;         // none
bool s_IsRefusalLasting = false; // those after it, too

constexpr char kDeclaredFunction[] = "ZARVO_API[^;(]*[ *](zarvo_\\w+)\\(";

std::set<std::string> NamesIn(const std::string& text, const char* pattern) {
    const std::regex names(pattern);
    std::set<std::string> found;
    for (std::sregex_iterator match(text.begin(), text.end(), names), end; match != end; ++match)
        found.insert((*match)[1]);
    return found;
}

} // namespace

extern "C" int posix_memalign(void** pointer, size_t align, size_t size) {
    if (size > kSmall && s_RequestsLeft > 0 && --s_RequestsLeft == 0) {
        if (s_IsRefusalLasting) s_RequestsLeft = 1;
        return ENOMEM;
    }
    *pointer = memalign(align, size);
    return *pointer != nullptr ? 0 : ENOMEM;
}

TEST(Interface, LibraryExportsWhatTheHeaderDeclares) {
    const std::string header = ReadFile(VARNEX_SOURCE_DIR "/Library/include/zarvo.h");
    const auto [status, symbols] = RunProgram("/usr/bin/nm", {"-D", "--defined-only", "--format=posix", ZARVO_LIBRARY});
    EXPECT_EQ(0, status);
    EXPECT_EQ(NamesIn(header, kDeclaredFunction), NamesIn(symbols, "(zarvo_\\w+)@?\\S* T"));
    EXPECT_EQ(std::set<std::string>{"ZARVO_0"}, NamesIn(symbols, "(?:^|\n)((?!zarvo_)\\w+)"));
}

TEST(Interface, WrapperCallsEveryFunctionOfTheHeader) {
    const std::string header = ReadFile(VARNEX_SOURCE_DIR "/Library/include/zarvo.h");
    const std::string wrapper = ReadFile(VARNEX_SOURCE_DIR "/Library/include/zarvo.hpp");
    EXPECT_EQ(NamesIn(header, kDeclaredFunction), NamesIn(wrapper, "\\b(zarvo_\\w+)\\("));
    EXPECT_EQ(zarvo_version(), zarvo::version());
}

TEST(Interface, StructuresAreWhereProgramsExpectThem) {
    EXPECT_EQ(40u, sizeof(zarvo_source));
    EXPECT_EQ(32u, offsetof(zarvo_source, close));
    EXPECT_EQ(64u, sizeof(zarvo_open_options));
    EXPECT_EQ(40u, offsetof(zarvo_open_options, cache_bytes));
    EXPECT_EQ(56u, offsetof(zarvo_open_options, log_context));
    EXPECT_EQ(160u, sizeof(zarvo_info));
    EXPECT_EQ(152u, offsetof(zarvo_info, file_bytes));
    EXPECT_EQ(56u, sizeof(zarvo_entry));
    EXPECT_EQ(48u, offsetof(zarvo_entry, flags));
    EXPECT_EQ(56u, sizeof(zarvo_item));
    EXPECT_EQ(48u, offsetof(zarvo_item, path_length));
    EXPECT_EQ(32u, sizeof(zarvo_block));
    EXPECT_EQ(28u, offsetof(zarvo_block, is_streamed));
    EXPECT_EQ(64u, sizeof(zarvo_summary));
    EXPECT_EQ(56u, offsetof(zarvo_summary, archive_bytes));
    EXPECT_EQ(48u, sizeof(zarvo_create_report));
    EXPECT_EQ(40u, offsetof(zarvo_create_report, text));
    EXPECT_EQ(72u, sizeof(zarvo_create_options));
    EXPECT_EQ(48u, offsetof(zarvo_create_options, force));
    EXPECT_EQ(64u, offsetof(zarvo_create_options, log));
    EXPECT_EQ(9, ZARVO_ERROR_NOT_FOUND);
}

// A program that was compiled with an older header gets what it knows, and no byte more.
TEST(Interface, OlderStructuresAreFilledAsFarAsTheyGo) {
    const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = "text"}}}).bytes;
    const zarvo::archive archive = OpenBytes(bytes);
    zarvo_entry entry;
    memset(&entry, 0x5A, sizeof(entry));
    entry.struct_size = offsetof(zarvo_entry, kind);
    EXPECT_EQ(ZARVO_OK, zarvo_get_entry(archive.get(), 0, &entry));
    EXPECT_EQ(std::string("a"), entry.path);
    EXPECT_EQ(1u, entry.path_length);
    EXPECT_EQ(0x5A5A5A5A, entry.kind);
    EXPECT_EQ(0x5A5A5A5Au, entry.flags);
}

// A structure whose caller has forgotten its size would say nothing.
TEST(Interface, StructuresWithoutTheirSizeAreRefused) {
    const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = "text"}}}).bytes;
    const zarvo::archive opened = OpenBytes(bytes);
    zarvo_archive* const archive = opened.get();
    for (const size_t size : {size_t{0}, sizeof(size_t)}) {
        SCOPED_TRACE(size);
        zarvo_open_options open = {};
        zarvo_source source = {};
        zarvo_info info = {};
        zarvo_entry entry = {};
        zarvo_item item = {};
        zarvo_block block = {};
        zarvo_run_options run = {};
        zarvo_extract_options extract = {};
        zarvo_test_options test = {};
        zarvo_visit_options visit = {};
        zarvo_summary summary = {};
        for (size_t* each : {&open.struct_size, &source.struct_size, &info.struct_size, &entry.struct_size,
                             &item.struct_size, &block.struct_size, &run.struct_size, &extract.struct_size,
                             &test.struct_size, &visit.struct_size, &summary.struct_size})
            *each = size;
        zarvo_source whole = ZARVO_SOURCE_INIT;
        whole.read_at = [](void*, void*, size_t, uint64_t) { return int64_t{0}; };
        whole.get_size = [](void*, uint64_t* count) { return static_cast<int>(*count = 0); };
        bool isClosed = false;
        whole.context = &isClosed;
        whole.close = [](void* context) { *static_cast<bool*>(context) = true; };
        zarvo_archive* none = nullptr;
        const zarvo_code codes[] = {
            zarvo_open_path("a", &open, &none, nullptr),
            zarvo_open_memory(bytes.data(), bytes.size(), &open, &none, nullptr),
            zarvo_open_source(&source, nullptr, &none, nullptr),
            zarvo_open_source(&whole, &open, &none, nullptr),
            zarvo_get_info(archive, &info),
            zarvo_get_entry(archive, 0, &entry),
            zarvo_get_item(archive, 0, &item, nullptr),
            zarvo_get_block(archive, 0, &block),
            zarvo_test(archive, &run, nullptr, nullptr, nullptr),
            zarvo_test(archive, nullptr, &test, nullptr, nullptr),
            zarvo_test(archive, nullptr, nullptr, &summary, nullptr),
            zarvo_visit(archive, nullptr, &visit, nullptr, nullptr),
            zarvo_extract(archive, "/dev/null/out", nullptr, &extract, nullptr, nullptr),
        };
        for (const zarvo_code& code : codes)
            EXPECT_EQ(ZARVO_ERROR_ARGUMENT, code) << "call " << &code - codes;
        EXPECT_EQ(true, isClosed);
    }
}

TEST(Interface, NullAndPastTheEndAreArgumentErrors) {
    const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = "text"}}}).bytes;
    zarvo::archive opened = OpenBytes(bytes);
    zarvo_archive* const archive = opened.get();
    zarvo_archive* none = nullptr;
    zarvo_info info = ZARVO_INFO_INIT;
    zarvo_entry entry = ZARVO_ENTRY_INIT;
    zarvo_item item = ZARVO_ITEM_INIT;
    zarvo_block block = ZARVO_BLOCK_INIT;
    zarvo_stream* stream = nullptr;
    uint64_t number = 0;
    size_t count = 0;
    char buffer[16];
    const zarvo_code codes[] = {
        zarvo_open_path(nullptr, nullptr, &none, nullptr),
        zarvo_open_path("a", nullptr, nullptr, nullptr),
        zarvo_open_descriptor(0, nullptr, nullptr, nullptr),
        zarvo_open_memory(nullptr, 1, nullptr, &none, nullptr),
        zarvo_open_source(nullptr, nullptr, &none, nullptr),
        zarvo_get_info(nullptr, &info),
        zarvo_get_info(archive, nullptr),
        zarvo_get_entry(archive, 1, &entry),
        zarvo_get_entry(archive, 0, nullptr),
        zarvo_find(archive, nullptr, 0, &number, nullptr),
        zarvo_find(nullptr, "a", 1, &number, nullptr),
        zarvo_get_item(archive, 1, &item, nullptr),
        zarvo_get_item(archive, ZARVO_NO_ITEM, &item, nullptr),
        zarvo_get_item_path(archive, 0, nullptr, nullptr),
        zarvo_read(archive, 1, 0, buffer, 1, &count, nullptr),
        zarvo_read(archive, 0, 0, nullptr, 1, &count, nullptr),
        zarvo_read(archive, 0, 0, buffer, 1, nullptr, nullptr),
        zarvo_get_readable(archive, 0, nullptr, nullptr),
        zarvo_stream_open(archive, 1, &stream, nullptr),
        zarvo_stream_read(nullptr, buffer, 1, &count, nullptr),
        zarvo_stream_seek(nullptr, 0),
        zarvo_get_block(archive, 1, &block),
        zarvo_read_block(archive, 0, nullptr, &count, nullptr),
        zarvo_patterns_new(nullptr, nullptr),
        zarvo_patterns_add(nullptr, "a", 1, nullptr),
        zarvo_create(nullptr, "a", nullptr, nullptr, nullptr, nullptr),
        zarvo_create("a", nullptr, nullptr, nullptr, nullptr, nullptr),
        zarvo_writer_new(nullptr, nullptr),
        zarvo_writer_add_memory(nullptr, "a", 1, "", 0, nullptr),
        zarvo_writer_add_source(nullptr, "a", 1, nullptr, nullptr),
        zarvo_writer_add_folder(nullptr, "a", 1, nullptr),
        zarvo_writer_write(nullptr, "a", nullptr, nullptr, nullptr, nullptr),
    };
    for (size_t call = 0; call < std::size(codes); ++call)
        EXPECT_EQ(ZARVO_ERROR_ARGUMENT, codes[call]) << "call " << call;
    EXPECT_EQ(0u, zarvo_entry_count(nullptr));
    zarvo_close(nullptr);
    zarvo_stream_free(nullptr);
    zarvo_patterns_free(nullptr);
    zarvo_writer_free(nullptr);
    zarvo_error_free(nullptr);
    EXPECT_EQ(std::string(""), zarvo_error_text(nullptr));
}

// A program may look at the count without looking at the code.
TEST(Interface, RefusedReadsDeliverNothing) {
    const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = "text"}}}).bytes;
    const zarvo::archive archive = OpenBytes(bytes);
    char buffer[4];
    size_t count = 77;
    EXPECT_EQ(ZARVO_ERROR_ARGUMENT, zarvo_read(archive.get(), 1, 0, buffer, 4, &count, nullptr));
    EXPECT_EQ(0u, std::exchange(count, 77));
    EXPECT_EQ(ZARVO_ERROR_ARGUMENT, zarvo_stream_read(nullptr, buffer, 4, &count, nullptr));
    EXPECT_EQ(0u, std::exchange(count, 77));
    EXPECT_EQ(ZARVO_ERROR_ARGUMENT, zarvo_read_block(archive.get(), 1, buffer, &count, nullptr));
    EXPECT_EQ(0u, count);
}

// Each request of the library is refused once: an error that says so, or right bytes, and no crash.
TEST(Interface, EachRefusedRequestForMemoryIsAnError) {
    const std::string text = SampleText(30'000);
    const std::pair<const char*, ArchiveDescription> kForms[] = {
        {"LZ4HC", {.type = kCompressionLz4HC, .sectionType = kCompressionLzma}},
        {"LZMA streams", {.type = kCompressionLzma, .streamed = true, .sectionType = kCompressionLz4}},
        {"web", {.layout = ArchiveLayout::kWeb}},
        {"raw", {.layout = ArchiveLayout::kRaw}},
    };
    for (auto [form, description] : kForms) {
        SCOPED_TRACE(form);
        description.entries = {{.path = "folder/text", .bytes = text}};
        const std::string bytes = BuildArchive(description).bytes;
        bool isClean = false;
        for (int refused = 1; !isClean; ++refused) {
            SCOPED_TRACE(refused);
            ASSERT_LT(refused, 1'000);
            zarvo_archive* archive = nullptr;
            uint64_t item = 0;
            size_t count = 0;
            std::string got(text.size(), '?');
            zarvo_error* error = nullptr;
            s_RequestsLeft = refused;
            zarvo_code code = zarvo_open_memory(bytes.data(), bytes.size(), nullptr, &archive, &error);
            if (code == ZARVO_OK) code = zarvo_find(archive, "folder/text", ZARVO_WHOLE, &item, &error);
            if (code == ZARVO_OK) code = zarvo_read(archive, item, 0, got.data(), got.size() - 1, &count, &error);
            isClean = s_RequestsLeft > 0;
            s_RequestsLeft = -1;
            EXPECT_EQ(code, zarvo_error_code(error));
            const bool isRight = got.substr(0, count) == text.substr(0, text.size() - 1);
            EXPECT_EQ(code == ZARVO_OK, isRight);
            EXPECT_EQ(isClean ? ZARVO_OK : ZARVO_ERROR_MEMORY, code) << zarvo_error_text(error);
            zarvo_error_free(error);
            zarvo_close(archive);
        }
    }
}

// As above, for an archive that is made: it is whole, or there is none.
TEST(Interface, EachRefusedRequestOfAWriterIsAnError) {
    const std::string text = SampleText(30'000);
    const TemporaryFolder folder;
    const std::string path = folder / "a.zarvo";
    for (const int32_t layout : {ZARVO_LAYOUT_FS, ZARVO_LAYOUT_WEB, ZARVO_LAYOUT_ARCHIVE}) {
        zarvo_create_options how = ZARVO_CREATE_OPTIONS_INIT;
        how.layout = layout;
        zarvo_run_options run = ZARVO_RUN_OPTIONS_INIT;
        run.threads = 1; // so that requests are counted in order
        bool isClean = false;
        for (int refused = 1; !isClean; ++refused) {
            SCOPED_TRACE(refused);
            ASSERT_LT(refused, 1'000);
            zarvo_writer* writer = nullptr;
            s_RequestsLeft = refused;
            zarvo_code code = zarvo_writer_new(&writer, nullptr);
            if (code == ZARVO_OK)
                code = zarvo_writer_add_memory(writer, "folder/text", ZARVO_WHOLE, text.data(), text.size(), nullptr);
            if (code == ZARVO_OK) code = zarvo_writer_write(writer, path.c_str(), &run, &how, nullptr, nullptr);
            isClean = s_RequestsLeft > 0;
            s_RequestsLeft = -1;
            zarvo_writer_free(writer);
            EXPECT_EQ(isClean ? ZARVO_OK : ZARVO_ERROR_MEMORY, code);
            EXPECT_EQ(isClean, std::filesystem::exists(path));
            EXPECT_EQ(isClean ? 1 : 0, std::distance(std::filesystem::directory_iterator(folder.Path()), {}));
        }
        zarvo::archive archive = *zarvo::archive::open(path);
        const uint64_t last = archive.entries().size() - 1;
        EXPECT_EQ(Delivered{text}, Read(archive, last, 0, text.size()));
        std::filesystem::remove(path);
    }
}

// A tree whose building found no memory is built from the start by the next call that needs it.
TEST(Interface, TreeIsRightAfterARefusedRequest) {
    ArchiveDescription description;
    for (int number = 0; number < 100; ++number)
        description.entries.push_back({.path = std::to_string(number) + "/x/y"});
    const std::string bytes = BuildArchive(description).bytes;
    bool isRefused = true;
    for (int refused = 1; isRefused; ++refused) {
        SCOPED_TRACE(refused);
        ASSERT_LT(refused, 1'000);
        const zarvo::archive archive = OpenBytes(bytes);
        s_IsRefusalLasting = true;
        s_RequestsLeft = refused;
        isRefused = archive.item_count() == 0;
        s_RequestsLeft = -1;
        s_IsRefusalLasting = false;
        EXPECT_EQ(300u, archive.item_count());
        uint64_t folders = 0;
        uint64_t folder = archive.item(ZARVO_ROOT)->first_child;
        for (; folder != ZARVO_NO_ITEM && folders <= 100; folder = archive.item(folder)->next_sibling)
            ++folders;
        EXPECT_EQ(100u, folders);
    }
}

#ifndef NDEBUG
TEST(Interface, ClosedHandlesAreArgumentErrorsInDebugBuilds) {
    const std::string bytes = BuildArchive({.entries = {{.path = "a", .bytes = "text"}}}).bytes;
    zarvo_archive* archive = nullptr;
    ASSERT_EQ(ZARVO_OK, zarvo_open_memory(bytes.data(), bytes.size(), nullptr, &archive, nullptr));
    zarvo_stream* stream = nullptr;
    ASSERT_EQ(ZARVO_OK, zarvo_stream_open(archive, 0, &stream, nullptr));
    zarvo_close(archive);
    char byte;
    size_t count = 0;
    EXPECT_EQ(ZARVO_ERROR_ARGUMENT, zarvo_read(archive, 0, 0, &byte, 1, &count, nullptr));
    EXPECT_EQ(ZARVO_ERROR_ARGUMENT, zarvo_stream_read(stream, &byte, 1, &count, nullptr));
    zarvo_stream_free(stream);
    EXPECT_EQ(ZARVO_ERROR_ARGUMENT, zarvo_stream_read(stream, &byte, 1, &count, nullptr));
    zarvo_close(archive);
}
#endif

// A handle that no call uses works on in both processes after a fork.
TEST(Interface, ArchiveIsReadInParentAndChild) {
    const std::string text = SampleText(300'000);
    const TemporaryFolder folder;
    WriteFile(folder / "archive",
              BuildArchive({.entries = {{.path = "a", .bytes = text}}, .type = kCompressionLz4}).bytes);
    zarvo::archive archive = *zarvo::archive::open(folder / "archive");
    EXPECT_EQ(Delivered{text.substr(0, 10)}, Read(archive, 0, 0, 10));
    const pid_t child = fork();
    if (child == 0) _exit(Read(archive, 0, 100'000, 100'000) == Delivered{text.substr(100'000, 100'000)} ? 0 : 1);
    EXPECT_EQ(Delivered{text}, Read(archive, 0, 0, text.size()));
    int status = -1;
    waitpid(child, &status, 0);
    EXPECT_EQ(0, status);
}
