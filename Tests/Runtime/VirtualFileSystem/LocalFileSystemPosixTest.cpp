#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"
#include "Tests/Runtime/VirtualFileSystem/LocalDiskTest.h"
#include "Tests/Support/ReportRecorder.h"

#include <sys/mman.h>

class LocalFileSystemPosixTest : public LocalDiskTest {};

TEST_F(LocalFileSystemPosixTest, OpeningFollowsThePermission) {
    // "old" holds 4 bytes, "new" is missing; the contents are those once "X" has been written, if it could be.
    const std::tuple<int, const char*, UInt32, UInt64, bool, bool, const char*> kCases[] = {
        {0, "old", 0, 0, false, true, "data"},  {0, "new", 1, 0, false, false, ""},
        {1, "old", 0, 0, true, false, "X"},     {1, "new", 0, 0, true, false, "X"},
        {2, "old", 0, 0, true, true, "Xata"},   {2, "new", 0, 0, true, true, "X"},
        {3, "old", 0, 4, true, false, "dataX"}, {3, "new", 0, 0, true, false, "X"},
        {9, "old", 0, 0, false, true, "data"},  {2, ".", 14, 0, false, false, ""}};
    for (const auto& [permission, name, error, position, canWrite, canRead, contents] : kCases) {
        SCOPED_TRACE(testing::Message() << name << ", permission " << permission);
        Run("printf data > old; rm -f new");
        FileSystemEntry entry = Entry(name);
        UInt64 byte = 0, count = 99;
        EXPECT_TRUE(Open(entry, permission) == (error == 0) && entry.lastError == error);
        EXPECT_TRUE(local.Position(entry) == position && local.Seek(entry, 0, kFileOriginBegin) == (error == 0));
        EXPECT_EQ(canWrite, local.Write(entry, 1, "X", &count)); // at the end when appending
        EXPECT_EQ(canRead, local.Read(entry, 0, 1, &byte, &count, kFileReadFlagsNone));
        EXPECT_EQ(error != 0 ? 99 : UInt64{canRead}, count);
        EXPECT_TRUE(local.Close(entry) && entry.handlerState == nullptr && entry.lastError == error);
        EXPECT_EQ(contents, error == 0 ? ReadFile(folder / name) : "");
    }
}

TEST_F(LocalFileSystemPosixTest, ReadsAndSeeksGoWhereTheySay) {
    Run("printf 0123456789 > file");
    FileSystemEntry entry = Entry("file");
    ASSERT_TRUE(Open(entry, 0));
    ReportRecorder reports;
    const std::tuple<SInt64, int, bool, std::string> kCases[] = {
        {6, 1, true, "6789"}, {-3, 3, true, "789"}, {2, 3, true, ""},     {-4, 2, true, "89"},
        {-1, 1, false, ""},   {9, 0, true, "9"},    {5, 4, true, "56789"}};
    char buffer[16];
    UInt64 count = 99;
    for (const auto& [offset, origin, isDone, rest] : kCases) {
        EXPECT_EQ(isDone, local.Seek(entry, offset, static_cast<FileOrigin>(origin))) << offset;
        EXPECT_EQ(!rest.empty(), local.Read(entry, sizeof(buffer), buffer, &count, kFileReadFlagsNone)) << offset;
        EXPECT_EQ(rest, std::string(buffer, count)) << offset;
        EXPECT_EQ(origin == 0 || origin == 4 ? 1u : 0u, reports.Take().size()) << offset;
    }
    EXPECT_TRUE(local.Read(entry, 3, 2, buffer, &count, kFileReadFlagsNone) && buffer[0] == '3' && count == 2);
    EXPECT_FALSE(local.Read(entry, ~UInt64{0}, 2, buffer, &count, kFileReadFlagsNone)); // more than an offset holds
    EXPECT_TRUE(reports.Take().size() == 1 && local.Close(entry));
}

TEST_F(LocalFileSystemPosixTest, FailuresOfTheSystemAreRecorded) {
    UInt64 byte = 0, count = 99;
    FileSystemEntry directory = Entry("."), full = Entry("/dev/full");
    ASSERT_TRUE(Open(directory, 0) && Open(full, 1));
    EXPECT_FALSE(local.Read(directory, 1, &byte, &count, kFileReadFlagsNone) || count + directory.lastError != 14);
    close(*static_cast<int*>(directory.handlerState)); // behind its back
    EXPECT_FALSE(local.Close(directory) || directory.handlerState != nullptr || directory.lastError != 14);
    count = 99;
    EXPECT_FALSE(local.Write(full, 1, &byte, &count) || count != 0 || full.lastError != 14);
    EXPECT_TRUE(local.Close(full) && full.lastError == 0);
    const int kErrors[][2] = {{0, 0}, {ENOENT, 1}, {EEXIST, 7}, {EPERM, 9}, {EACCES, 9}, {EXDEV, 10}, {ENOSPC, 14}};
    for (const auto& [error, recorded] : kErrors)
        EXPECT_EQ(recorded, static_cast<int>(FileSystemErrorFromErrno(error))) << error;
    int calls = 0;
    EXPECT_EQ(RepeatOnInterrupt([&] { return errno = ++calls < 3 ? EINTR : EIO, -1; }) + calls, 2);
}

TEST_F(LocalFileSystemPosixTest, AWriteThatOneCallCannotTakeIsContinued) {
    constexpr UInt64 kLarge = 0x80000000;
    void* memory = mmap(nullptr, kLarge, PROT_READ, MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
    FileAccessor sink;
    UInt64 written = 0;
    EXPECT_TRUE(sink.Open("/dev/null", kFilePermissionWrite) && sink.Write(kLarge, memory, &written));
    EXPECT_TRUE(written == kLarge && munmap(memory, kLarge) == 0);
}

TEST_F(LocalFileSystemPosixTest, QuestionsFollowLinksOrNotAsEachSays) {
    Run("printf 12345 > file; chmod 444 file; mkdir sub; ln -s sub tosub; ln -s file tofile; ln -s nowhere dangling");
    const char* const kCases[][2] = {
        {"file", "exists file read-only "}, {"sub", "exists folder "}, {"tosub", "exists folder link "},
        {"tofile", "exists file link "},    {"dangling", "link "},     {"/dev/null", "exists file "}};
    for (const auto& [name, answers] : kCases) {
        const FileSystemEntry entry = Entry(name);
        std::string said = local.Exists(entry) ? "exists " : "";
        said += std::string(local.IsDir(entry) ? "folder " : "") + (local.IsFile(entry) ? "file " : "");
        said += std::string(local.IsSymLink(entry) ? "link " : "") + (local.IsReadOnly(entry) ? "read-only " : "");
        EXPECT_EQ(answers, said) << name;
    }
    EXPECT_TRUE(local.Size(Entry("tofile")) == 5 && local.Size(Entry("dangling")) == 0);
}

TEST_F(LocalFileSystemPosixTest, FilesAndFoldersAreMadeOneAtATime) {
    FileSystemEntry made = Entry("made"), deep = Entry("no/made"), file = Entry("file");
    EXPECT_TRUE(local.CreateAsDir(made) && made.lastError == 0 && !local.CreateAsDir(made) && made.lastError == 7);
    EXPECT_FALSE(local.CreateAsDir(deep) || deep.lastError != 1 || local.CreateAsFile(deep));
    EXPECT_TRUE(local.CreateAsFile(file) && local.SetLength(file, 3) && !local.CreateAsFile(file));
    EXPECT_EQ(ReadFile(folder / "file"), std::string(3, '\0'));
}
