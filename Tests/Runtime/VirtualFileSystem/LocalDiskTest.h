// What tests of the local back ends share: a fresh folder, which is the current directory of the process and of the
// file system, the back end of this program, records of results that print themselves, and a check that the test leaves
// no descriptor open.
#pragma once

#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Tests/Support/ConsoleCapture.h"
#include "Tests/Support/TemporaryFolder.h"

#include <algorithm>
#include <cstdlib>
#include <gtest/gtest.h>
#include <sstream>
#include <sys/stat.h>
#include <unistd.h>

#ifdef VARNEX_WITH_OSX_BACK_END
constexpr bool kIsMac = true;
#else
constexpr bool kIsMac = false;
#endif

constexpr int kFolder = kFileEntryIsDirectory;
constexpr int kLink = kFileEntryIsSymLink;
constexpr int kHidden = kFileEntryIsHidden;

// The answer of an operation, and the error that it left in its entry.
struct Outcome {
    bool answer;
    FileSystemError error;

    friend bool operator==(const Outcome&, const Outcome&) = default;
    friend std::ostream& operator<<(std::ostream& out, const Outcome& outcome) {
        return out << std::boolalpha << outcome.answer << " with error " << outcome.error;
    }
};
constexpr Outcome kDone{true, kFileSystemErrorNone};

// What a listing tells about one entry, its time aside.
struct Listed {
    std::string path;
    UInt64 size = 0;
    int flags = 0; // FileEntryFlags

    friend bool operator==(const Listed&, const Listed&) = default;
    friend std::ostream& operator<<(std::ostream& out, const Listed& listed) {
        return out << listed.path << " of size " << listed.size << " with flags " << listed.flags;
    }
};

class LocalDiskTest : public testing::Test {
protected:
    LocalDiskTest() { WorkIn(folder.Path(), folder.Path()); }
    ~LocalDiskTest() override {
        EXPECT_EQ(0, seteuid(getuid()));
        WorkIn("/", "");
        EXPECT_EQ(CountOpenDescriptors(), m_DescriptorsBefore);
    }

    static void WorkIn(const std::string& workingDirectory, const std::string& currentDirectory) {
        ASSERT_EQ(0, chdir(workingDirectory.c_str()));
        GetFileSystem()->SetCurrentDirectory(currentDirectory.c_str());
    }

    // Gives up root's rights, which ignore modes, until the test ends.
    static void WorkAsAnyUser() {
        ASSERT_EQ(0, chmod(".", 0777));
        ASSERT_EQ(0, geteuid() == 0 ? seteuid(65534) : 0);
    }

    bool Open(FileEntryData& entry, FilePermission permission) {
        return local.Open(entry, permission, kFileAutoBehaviorNone);
    }
    FileSystemEntry Entry(const std::string& name) const {
        return FileSystemEntry((name[0] == '/' ? name : folder / name).c_str());
    }

    struct Listing {
        bool answer;
        std::vector<Listed> entries; // sorted by path
        std::string printed;
    };
    Listing List(const std::string& path, UInt32 flags = kFileEnumerationAll) {
        const ConsoleCapture console;
        dynamic_block_array<FileEntryInfo, 32> out(kMemLabelFileList);
        Listing listing;
        listing.answer = local.Enumerate(path.c_str(), &out, true, &m_Counter, FileEnumerationFlag(flags));
        for (size_t index = 0; index < out.size(); ++index) {
            const bool isSizeTheDisks = !kIsMac && (out[index].flags & kFolder) != 0;
            listing.entries.push_back({out[index].path, isSizeTheDisks ? 0 : out[index].size, out[index].flags});
        }
        std::sort(listing.entries.begin(), listing.entries.end(),
                  [](const Listed& a, const Listed& b) { return a.path < b.path; });
        listing.printed = console.Text();
        return listing;
    }

    // Runs a shell script in the folder. Each of its commands must succeed.
    void Run(const std::string& script) const {
        EXPECT_EQ(system(("set -e; cd '" + folder.Path() + "'; " + script).c_str()), 0) << script;
    }

    // The mode in octal, without following links; empty when nothing is there.
    std::string Mode(const std::string& name) const {
        struct stat status;
        if (lstat(Entry(name).path, &status) != 0) return "";
        std::ostringstream text;
        text << std::oct << (status.st_mode & 07777);
        return text.str();
    }
    bool IsThere(const std::string& name) const { return !Mode(name).empty(); }

    const size_t m_DescriptorsBefore = CountOpenDescriptors();
    const TemporaryFolder folder;
    LocalFileSystemHandler& local = *static_cast<LocalFileSystemHandler*>(GetFileSystem()->GetHandlerForPath("/"));
    UInt64 m_Sum = 0;
    void* m_Counter = &m_Sum; // what a summing listing adds to
};
