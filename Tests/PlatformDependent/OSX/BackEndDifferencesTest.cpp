// The two local back ends side by side: where they answer differently, and how.
#include "MacTest.h"

#include "Tests/Support/ConsoleCapture.h"

#include <cerrno>
#include <functional>
#include <unistd.h>

namespace {

using Handler = LocalFileSystemHandler;

class BackEndDifferencesTest : public MacTest {
protected:
    std::string Query(Handler& handler, const std::string& name, UInt32 query) const {
        FileEntryInfo info;
        info.flags = 0xF0 | kFileEntryIsHidden;
        const UInt32 answer = handler.GetFileEntryInfo(Entry(name), info, static_cast<FileEntryInfoQueryFlags>(query));
        char text[64];
        snprintf(text, sizeof(text), "0x%X 0x%X", answer, info.flags);
        return text;
    }

    // Answer, then name, size and flags of every entry.
    std::string List(Handler& handler, const std::string& name, UInt32 flags = 0) const {
        dynamic_block_array<FileEntryInfo, 32> out(kMemLabelFileList);
        const bool answer =
            handler.Enumerate(Path(name).c_str(), &out, false, nullptr, static_cast<FileEnumerationFlag>(flags));
        std::set<std::string> lines;
        for (size_t i = 0; i < out.size(); ++i) {
            const std::string entry = std::filesystem::path(out[i].path).filename();
            lines.insert(entry + " " + (entry == "sub" && out[i].size > 0 ? "some" : std::to_string(out[i].size)) +
                         " " + std::to_string(out[i].flags));
        }
        std::string text = answer ? "true" : "false";
        for (const std::string& line : lines)
            text += ", " + line;
        return text;
    }

    std::string Target(Handler& handler, const std::string& name) const {
        FileSystemEntry target;
        const bool answer = handler.Target(Entry(name), target);
        return (answer ? "true " : "false ") + std::string(target.Path());
    }

    std::string Copy(Handler& handler, const std::string& from, const std::string& to) const {
        FileSystemEntry source = Entry(from), destination = Entry(to);
        return handler.Copy(source, destination) ? "true" : "false";
    }
};

TEST_F(BackEndDifferencesTest, AreTheseAndNoOthers) {
    const auto setUp = [this] {
        WriteFile("list/file", "12345");
        WriteFile("list/.dot", "");
        WriteFile("list/flagged", "");
        WriteFile("list/readonly", "");
        std::filesystem::create_directories(Path("list/sub"));
        symlink("file", Path("list/link").c_str());
        symlink("nowhere/x", Path("list/dangling").c_str());
        chflags(Path("list/flagged").c_str(), UF_HIDDEN);
        chmod(Path("list/readonly").c_str(), 0444);
    };
    const std::string prefix = Path("") + "/";
    const struct {
        const char* what;
        std::function<std::string(Handler&)> ask;
        std::string posix, mac;
    } kCases[] = {
        {"existing folder", [&](Handler& h) { return Query(h, "list", 0x90); }, "0x1D4 0xF1", "0x194 0xF5"},
        {"missing", [&](Handler& h) { return Query(h, "missing", 0x90); }, "0x0 0xF4", "0x0 0xF4"},
        {"nothing asked", [&](Handler& h) { return Query(h, "list/file", 0); }, "0x40 0xF0", "0x0 0xF4"},
        {"existence", [&](Handler& h) { return Query(h, "list/file", 0x80); }, "0xC0 0xF0", "0x80 0xF4"},
        {"hidden bit", [&](Handler& h) { return Query(h, "list/file", 0x40); }, "0x40 0xF0", "0x40 0xF0"},
        {"hidden bit of a flagged file", [&](Handler& h) { return Query(h, "list/flagged", 0x40); }, "0x40 0xF0",
         "0x40 0xF4"},
        {"all of a link", [&](Handler& h) { return Query(h, "list/link", 0x3F4); }, "0x3F4 0xF2", "0x3F4 0xF2"},
        {"read-only", [&](Handler& h) { return Query(h, "list/readonly", 0x200); }, "0x354 0xF8", "0x314 0xFC"},
        {"missing, not asked whether", [&](Handler& h) { return Query(h, "missing", 0x374); }, "0x40 0xF0", "0x0 0xF4"},
        {"listing", [&](Handler& h) { return List(h, "list"); },
         "true, .dot 0 4, dangling 0 2, file 5 0, flagged 0 0, link 5 2, readonly 0 8, sub some 1",
         "true, .dot 0 4, dangling 9 2, file 5 0, flagged 0 4, link 4 2, readonly 0 0, sub 0 1"},
        {"listing without hidden files", [&](Handler& h) { return List(h, "list", 0x02 | 0x10); },
         "true, dangling 0 2, file 5 0, flagged 0 0, link 5 2, readonly 0 8",
         "true, .dot 0 4, dangling 9 2, file 5 0, link 4 2, readonly 0 0"},
        {"listing of nothing", [&](Handler& h) { return List(h, "missing"); }, "false", "true"},
        {"hidden", [&](Handler& h) { return std::string(h.IsHidden(Entry("list/flagged")) ? "yes" : "no"); }, "no",
         "yes"},
        {"target", [&](Handler& h) { return Target(h, "list/link"); }, "true " + prefix + "list/file",
         "true " + prefix + "list/file"},
        {"target of nothing", [&](Handler& h) { return Target(h, "list/dangling"); }, "false ",
         "true " + prefix + "list/nowhere/x"},
        {"copy of a folder", [&](Handler& h) { return Copy(h, "list", "copy"); }, "false", "true"},
        {"copy onto a file", [&](Handler& h) { return Copy(h, "list/file", "list/flagged"); }, "true", "false"},
        {"copy onto itself", [&](Handler& h) { return Copy(h, "list/file", "list/file"); }, "false", "false"},
        {"trash of nothing",
         [&](Handler& h) {
             FileSystemEntry entry = Entry("missing");
             return std::string(h.MoveToTrash(entry) ? "true" : "false");
         },
         "true", "false"},
        {"error text",
         [&](Handler& h) {
             errno = ENOENT;
             return std::string(h.LastErrorMessage().c_str());
         },
         "", "No such file or directory"},
        {"data folder", [&](Handler& h) { return std::string(h.GetUserAppDataFolder().c_str()); },
         prefix + ".config/zarvo3d", prefix + "Library/Zarvo"},
        {"shared folder", [&](Handler& h) { return std::string(h.GetSharedApplicationDataFolder().c_str()); }, "",
         "/Library/Application Support"},
    };
    LocalFileSystemPosix posix;
    for (const auto& [what, ask, posixAnswer, macAnswer] : kCases) {
        for (Handler* handler : {static_cast<Handler*>(&posix), static_cast<Handler*>(&Mac())}) {
            setUp();
            ConsoleCapture console;
            EXPECT_EQ(ask(*handler), handler == &posix ? posixAnswer : macAnswer)
                << what << (handler == &posix ? " on POSIX" : " on macOS");
            std::filesystem::remove_all(Path("list"));
            std::filesystem::remove_all(Path("copy"));
        }
    }
}

// A folder deep down that can't be opened ends a POSIX listing and is passed over by a macOS one.
TEST_F(BackEndDifferencesTest, UnreadableFolderInARecursiveListing) {
    WriteFile("list/closed/file", "");
    std::filesystem::permissions(Path(""), std::filesystem::perms(0755));
    std::filesystem::permissions(Path("list/closed"), std::filesystem::perms(0));
    LocalFileSystemPosix posix;
    const uid_t user = geteuid();
    if (user == 0) {
        ASSERT_EQ(seteuid(65534), 0); // root may open anything
    }
    for (Handler* handler : {static_cast<Handler*>(&posix), static_cast<Handler*>(&Mac())}) {
        dynamic_block_array<FileEntryInfo, 32> out(kMemLabelFileList);
        EXPECT_EQ(handler->Enumerate(Path("list").c_str(), &out, true, nullptr, kFileEnumerationAll),
                  handler != &posix);
        EXPECT_EQ(out.size(), 1u);
    }
    ASSERT_EQ(seteuid(user), 0);
    std::filesystem::permissions(Path("list/closed"), std::filesystem::perms(0755));
}

} // namespace
