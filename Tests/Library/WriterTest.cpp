// Archives of entries from memory and callbacks.
#include "Tests/Library/CreationTest.h"

namespace {

class Writer : public Creation {
protected:
    const std::string m_Text = "x"; // outlives the writers, which do not copy it

    Made WriteAll(zarvo::writer& writer, zarvo::create_options how = {}) {
        how.force = true;
        return Report([&](const zarvo::run_options& run,
                          const zarvo::create_options& form) { return writer.write(Archive(), run, form); },
                      how, {.threads = 3});
    }
};

TEST_F(Writer, MakesWhatAFolderOfTheSameFilesMakes) {
    const std::string text = SampleText(150'000), noise = NoiseText(60'000);
    Put("b/text", text);
    Put("b-", noise);
    fs::create_directory(In() + "/empty");
    for (const Form& form : AllForms()) {
        SCOPED_TRACE(form.name);
        ASSERT_EQ(form.hasFolders ? 0 : 1, Create(m_Folder / "folder", In(), form.how).reports.size() != 0);
        zarvo::writer writer;
        EXPECT_FALSE(writer.add_folder("empty"));
        EXPECT_FALSE(writer.add("b/text", std::make_unique<CountingSource>(text)));
        EXPECT_FALSE(writer.add_folder("b"));
        EXPECT_FALSE(writer.add("b-", BytesOf(noise)));
        EXPECT_EQ(2u, WriteAll(writer, form.how).files);
        EXPECT_EQ(true, ReadFile(m_Folder / "folder") == ReadFile(Archive()));
        EXPECT_EQ(2u, WriteAll(writer, form.how).files); // once more
        EXPECT_EQ(true, ReadFile(m_Folder / "folder") == ReadFile(Archive()));
        fs::remove(m_Folder / "folder");
    }
}

TEST_F(Writer, RefusesPathsThatWouldNotComeBack) {
    zarvo::writer writer;
    using namespace std::string_view_literals;
    for (const std::string_view path :
         {""sv, "/"sv, "/a"sv, "a/"sv, "a//b"sv, "./a"sv, "a/."sv, ".."sv, "a/../b"sv, "a\\b"sv, "a\0b"sv}) {
        EXPECT_EQ(ZARVO_ERROR_REFUSED, writer.add(path, BytesOf("")).code()) << path;
        EXPECT_EQ(ZARVO_ERROR_REFUSED, writer.add_folder(path).code()) << path;
    }
    EXPECT_EQ(Made{}, WriteAll(writer));
}

TEST_F(Writer, RefusesEntriesThatCannotBeTogether) {
    const std::vector<const char*> kCases[] = {{"a", "b", "a"}, {"a", "a-", "a/b"}, {"x", "a/b/c/d", "a/b"}};
    for (const std::vector<const char*>& paths : kCases) {
        zarvo::writer writer;
        for (const char* const path : paths)
            EXPECT_FALSE(writer.add(path, BytesOf("")));
        EXPECT_EQ(ZARVO_ERROR_REFUSED, WriteAll(writer).code) << paths[2];
    }
}

TEST_F(Writer, NamesTheSourceThatFails) {
    for (const bool isShort : {false, true}) {
        zarvo::writer writer;
        auto source = std::make_unique<CountingSource>(SampleText(300'000));
        if (isShort)
            source->claimedSize = 300'001;
        else
            source->failingRead = 2;
        EXPECT_FALSE(writer.add("d/bad", std::move(source)));
        EXPECT_FALSE(writer.add("good", BytesOf(m_Text)));
        EXPECT_EQ(isShort ? "d/bad failed: the source ends too early\n" : "d/bad failed: Connection timed out\n",
                  WriteAll(writer).reports);
        EXPECT_EQ(std::set<std::string>{}, Names());
    }
}

// Higher levels take many times as long for it, while no other thread has anything to do.
TEST_F(Writer, EncodesTheDirectoryAtLevelFourAtMost) {
    zarvo::writer writer;
    for (int file = 0; file < 2'000; ++file)
        ASSERT_FALSE(writer.add("folder/file" + std::to_string(file), BytesOf("")));
    for (const auto& [kind, highest] : {std::pair{ZARVO_KIND_LZ4HC, 12}, {ZARVO_KIND_LZMA, 9}}) {
        std::string archives[2];
        for (const bool isHighest : {false, true}) {
            EXPECT_EQ(2'000u, WriteAll(writer, {.compression = kind, .level = isHighest ? highest : 4}).files);
            archives[isHighest] = ReadFile(Archive());
        }
        EXPECT_EQ(true, archives[0] == archives[1]) << kind;
    }
}

// The directory is encoded after all else, and takes seconds where paths have nothing in common.
TEST_F(Writer, IsStoppedWhileItEncodesTheDirectory) {
    constexpr size_t kPathSize = 3'000;
    std::string letters = NoiseText(4'000 * kPathSize);
    for (char& letter : letters)
        letter = static_cast<char>('a' + static_cast<unsigned char>(letter) % 26);
    zarvo::writer writer;
    for (size_t at = 0; at < letters.size(); at += kPathSize)
        ASSERT_FALSE(writer.add(std::string_view(letters).substr(at, kPathSize), BytesOf("")));
    int looks = 0; // with all files done
    zarvo::run_options run;
    run.progress = [&](const zarvo_progress& at) { return at.files < at.files_total || ++looks < 3; };
    EXPECT_EQ(ZARVO_ERROR_STOPPED, writer.write(Archive(), run, {.compression = ZARVO_KIND_LZMA}).error.code());
    EXPECT_GT(10, looks);
    EXPECT_EQ(std::set<std::string>{}, Names());
}

TEST_F(Writer, ThrowsWhatASourceThrows) {
    for (const uint32_t threads : {1u, 2u}) {
        zarvo::writer writer;
        auto source = std::make_unique<CountingSource>(SampleText(300'000));
        source->beforeRead = [] { throw std::runtime_error("from the source"); };
        EXPECT_FALSE(writer.add("bad", std::move(source)));
        EXPECT_FALSE(writer.add("good", BytesOf(m_Text)));
        EXPECT_THROW((void)writer.write(Archive(), {.threads = threads}), std::runtime_error) << threads;
        EXPECT_EQ(std::set<std::string>{}, Names());
    }
}

TEST_F(Writer, ClosesItsSources) {
    struct Closing final : zarvo::source {
        explicit Closing(int* count) : closed(count) {}
        ~Closing() override { ++*closed; }
        int64_t read_at(std::span<std::byte>, uint64_t) override { return 0; }
        int64_t size() override { return 0; }
        int* closed;
    };
    int closed = 0;
    {
        zarvo::writer writer;
        EXPECT_FALSE(writer.add("a", std::make_unique<Closing>(&closed)));
        EXPECT_EQ(0, closed);
        EXPECT_TRUE(writer.add("..", std::make_unique<Closing>(&closed)));
        EXPECT_EQ(1, closed);
    }
    EXPECT_EQ(2, closed);
}

} // namespace
