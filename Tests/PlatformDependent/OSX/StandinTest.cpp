// The layer that stands for the platform: what the back end above it relies on.
#include "MacTest.h"

#include "PlatformDependent/OSX/Platform.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <unistd.h>

namespace {

constexpr uint32_t kCommon =
    ATTR_CMN_RETURNED_ATTRS | ATTR_CMN_NAME | ATTR_CMN_OBJTYPE | ATTR_CMN_MODTIME | ATTR_CMN_FLAGS | ATTR_CMN_ERROR;
const attrlist kRequest = {ATTR_BIT_MAP_COUNT, 0, kCommon, 0, 0, ATTR_FILE_TOTALSIZE, 0};

class StandinTest : public MacTest {
protected:
    int Bulk(int descriptor, attrlist request, size_t size) {
        return getattrlistbulk(descriptor, &request, m_Buffer, size, 0);
    }

    template <typename T>
    T Field(size_t offset) const {
        T value;
        memcpy(&value, m_Buffer + offset, sizeof(value));
        return value;
    }

    char m_Buffer[4096];
};

TEST_F(StandinTest, RecordsArePackedAsDocumented) {
    WriteFile("folder/a", "12345");
    const int descriptor = open(Path("folder").c_str(), O_RDONLY | O_CLOEXEC);
    ASSERT_EQ(Bulk(descriptor, kRequest, sizeof(m_Buffer)), 1);
    EXPECT_EQ(Field<uint32_t>(0), 72u);
    EXPECT_EQ(Field<uint32_t>(4), kCommon & ~ATTR_CMN_ERROR & ~ATTR_CMN_RETURNED_ATTRS);
    EXPECT_EQ(Field<uint32_t>(16), ATTR_FILE_TOTALSIZE);
    EXPECT_EQ(Field<int32_t>(24), 40);
    EXPECT_EQ(Field<uint32_t>(28), 2u);
    EXPECT_EQ(Field<uint32_t>(32), static_cast<uint32_t>(VREG));
    struct stat status;
    ASSERT_EQ(stat(Path("folder/a").c_str(), &status), 0);
    EXPECT_EQ(Field<timespec>(36).tv_sec, status.st_mtim.tv_sec);
    EXPECT_EQ(Field<timespec>(36).tv_nsec, status.st_mtim.tv_nsec);
    EXPECT_EQ(Field<uint32_t>(52), 0u);
    EXPECT_EQ(Field<int64_t>(56), 5);
    EXPECT_STREQ(m_Buffer + 64, "a");
    EXPECT_EQ(Bulk(descriptor, kRequest, sizeof(m_Buffer)), 0);
    close(descriptor);

    rename(Path("folder/a").c_str(), Path("a").c_str());
    mkdir(Path("folder/d").c_str(), 0755);
    chflags(Path("folder/d").c_str(), UF_HIDDEN);
    const int second = open(Path("folder").c_str(), O_RDONLY | O_CLOEXEC);
    ASSERT_EQ(Bulk(second, kRequest, sizeof(m_Buffer)), 1);
    EXPECT_EQ(Field<uint32_t>(0), 64u);
    EXPECT_EQ(Field<uint32_t>(16), 0u);
    EXPECT_EQ(Field<int32_t>(24), 32);
    EXPECT_EQ(Field<uint32_t>(32), static_cast<uint32_t>(VDIR));
    EXPECT_EQ(Field<uint32_t>(52), UF_HIDDEN);
    EXPECT_STREQ(m_Buffer + 56, "d");
    close(second);
}

TEST_F(StandinTest, BufferTooSmallForOneRecordLeavesThePosition) {
    for (const char* name : {"folder/a", "folder/b", "folder/c"})
        WriteFile(name, "");
    const int descriptor = open(Path("folder").c_str(), O_RDONLY | O_CLOEXEC);
    EXPECT_EQ(Bulk(descriptor, kRequest, 71), -1);
    EXPECT_EQ(errno, ERANGE);
    std::set<std::string> names;
    ASSERT_EQ(Bulk(descriptor, kRequest, 2 * 72), 2);
    names = {m_Buffer + 64, m_Buffer + 72 + 64};
    EXPECT_EQ(Bulk(descriptor, kRequest, 71), -1);
    ASSERT_EQ(Bulk(descriptor, kRequest, 72), 1);
    names.insert(m_Buffer + 64);
    EXPECT_EQ(names, (std::set<std::string>{"a", "b", "c"}));
    EXPECT_EQ(Bulk(descriptor, kRequest, 72), 0);
    close(descriptor);
}

TEST_F(StandinTest, BulkRequestsThatAreNotUnderstoodAreRefused) {
    WriteFile("file", "");
    const int folder = open(Path("").c_str(), O_RDONLY | O_CLOEXEC);
    const int file = open(Path("file").c_str(), O_RDONLY | O_CLOEXEC);
    const struct {
        int descriptor;
        attrlist request;
        int error;
    } kCases[] = {
        {-1, kRequest, EBADF},
        {file, kRequest, ENOTDIR},
        {folder, {4, 0, kCommon, 0, 0, 0, 0}, EINVAL},
        {folder, {ATTR_BIT_MAP_COUNT, 0, kCommon, 1, 0, 0, 0}, EINVAL},
        {folder, {ATTR_BIT_MAP_COUNT, 0, kCommon & ~ATTR_CMN_NAME, 0, 0, 0, 0}, EINVAL},
        {folder, {ATTR_BIT_MAP_COUNT, 0, kCommon & ~ATTR_CMN_RETURNED_ATTRS, 0, 0, 0, 0}, EINVAL},
    };
    for (const auto& [descriptor, request, error] : kCases) {
        errno = 0;
        EXPECT_EQ(Bulk(descriptor, request, sizeof(m_Buffer)), -1) << error << " " << request.commonattr;
        EXPECT_EQ(errno, error) << request.commonattr;
    }
    close(file);
    close(folder);
}

TEST_F(StandinTest, FlagsStayWithTheFileAndLinksAreFollowed) {
    WriteFile("file", "");
    mkdir(Path("folder").c_str(), 0755);
    mkfifo(Path("pipe").c_str(), 0644); // can't have an extended attribute: kept in the table
    symlink("file", Path("link").c_str());
    PlatformStatus status;
    for (const char* name : {"file", "folder", "pipe"}) {
        ASSERT_EQ(chflags(Path(name).c_str(), UF_HIDDEN | 1), 0) << name;
        ASSERT_EQ(PlatformStat(Path(name).c_str(), &status), 0) << name;
        EXPECT_EQ(status.st_flags, UF_HIDDEN | 1) << name;
    }
    rename(Path("file").c_str(), Path("folder/moved").c_str());
    WriteFile("file", "");
    ASSERT_EQ(PlatformStat(Path("folder/moved").c_str(), &status), 0);
    EXPECT_EQ(status.st_flags, UF_HIDDEN | 1);
    ASSERT_EQ(PlatformStat(Path("link").c_str(), &status), 0);
    EXPECT_EQ(status.st_flags, 0u);
    ASSERT_EQ(chflags(Path("link").c_str(), UF_HIDDEN), 0);
    for (const char* name : {"file", "folder", "pipe"}) {
        ASSERT_EQ(chflags(Path(name).c_str(), 0), 0) << name;
        ASSERT_EQ(PlatformStat(Path(name).c_str(), &status), 0) << name;
        EXPECT_EQ(status.st_flags, 0u) << name;
    }
    EXPECT_EQ(chflags(Path("missing").c_str(), 0), -1);
    EXPECT_EQ(errno, ENOENT);
}

TEST_F(StandinTest, LinksAreResolvedAsFarAsThePathExists) {
    mkdir(Path("real").c_str(), 0755);
    symlink("real", Path("link").c_str());
    symlink((Path("real") + "/").c_str(), Path("absolute").c_str());
    symlink("nowhere/x", Path("dangling").c_str());
    symlink("loop", Path("loop").c_str());
    const struct {
        std::string path, resolved;
    } kCases[] = {
        {"", ""},
        {"/", "/"},
        {"/..//", "/"},
        {"a/./b//c/", "a/b/c"},
        {"../a/../..", "../.."},
        {Path("link"), Path("real")},
        {Path("link/../link/x/y"), Path("real/x/y")},
        {Path("absolute/x"), Path("real/x")},
        {Path("dangling"), Path("nowhere/x")},
        {Path("loop/x"), Path("loop/x")},
    };
    for (const auto& [path, resolved] : kCases)
        EXPECT_EQ(
            NSString_UTF8String(NSString_stringByResolvingSymlinksInPath(NSString_stringWithUTF8String(path.c_str()))),
            resolved)
            << path;
}

TEST_F(StandinTest, TextsThatAreNotUTF8BecomeNoString) {
    for (const char* text :
         {"", "a", "\xC3\xA9", "\xE2\x82\xAC", "\xED\x9F\xBF", "\xF0\x90\x80\x80", "\xF4\x8F\xBF\xBF"})
        EXPECT_NE(NSString_stringWithUTF8String(text), nullptr) << text;
    for (const char* text : {"\x80", "\xC3", "\xC3\x28", "\xC0\x80", "\xC1\xBF", "\xE0\x9F\xBF", "\xE2\x82",
                             "\xED\xA0\x80", "\xF0\x8F\xBF\xBF", "\xF4\x90\x80\x80", "\xF5\x80\x80\x80", "\xFF"})
        EXPECT_EQ(NSString_stringWithUTF8String(text), nullptr) << text;
}

TEST_F(StandinTest, FileURLsAreAbsolute) {
    WorkIn("");
    const struct {
        std::string path, representation;
    } kCases[] = {{"", ""},         {"/", "/"},         {"/a//b/", "/a//b"},  {".", Path("")},
                  {"./", Path("")}, {"./a", Path("a")}, {"a/b/", Path("a/b")}};
    for (const auto& [path, representation] : kCases)
        EXPECT_EQ(NSURL_fileSystemRepresentation(NSURL_fileURLWithPath(NSString_stringWithUTF8String(path.c_str()))),
                  representation)
            << path;
}

TEST_F(StandinTest, CopyThatFailsLeavesNothing) {
    WriteFile("from/sub/file", "1");
    mkfifo(Path("from/sub/pipe").c_str(), 0644); // can't be copied
    const auto copy = [&](const char* from, const char* to) {
        return NSFileManager_copyItemAtPath(NSString_stringWithUTF8String(Path(from).c_str()),
                                            NSString_stringWithUTF8String(Path(to).c_str()));
    };
    EXPECT_FALSE(copy("from", "to"));
    EXPECT_EQ(Tree(""), (std::set<std::string>{"from", "from/sub", "from/sub/file", "from/sub/pipe"}));
    unlink(Path("from/sub/pipe").c_str());
    EXPECT_FALSE(copy("from", "from/sub/to")) << "into itself";
    EXPECT_FALSE(copy("from/sub", "from/sub/to")) << "into itself";
    EXPECT_TRUE(copy("from/sub", "from/sub2")) << "beside itself, under a name that begins alike";
    EXPECT_EQ(Tree(""), (std::set<std::string>{"from", "from/sub", "from/sub/file", "from/sub2", "from/sub2/file"}));
}

TEST_F(StandinTest, PoolsFreeWhatWasMadeInsideThem) {
    const size_t before = CountStandinObjects();
    NSString* outer = NSString_stringWithUTF8String("outer");
    {
        const AutoreleasePool pool;
        NSArray_arrayWithObject(NSString_stringWithUTF8String("inner"));
        EXPECT_EQ(CountStandinObjects(), before + 3);
    }
    EXPECT_EQ(CountStandinObjects(), before + 1);
    EXPECT_STREQ(NSString_UTF8String(outer), "outer");
}

} // namespace
