// What tests of the local back ends share: a fresh folder, which is the file system's current directory, a POSIX back
// end, records of results that print themselves, and a check that the test leaves no descriptor open.
#pragma once

#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Tests/Support/TemporaryFolder.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <sstream>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

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
    LocalDiskTest() { GetFileSystem()->SetCurrentDirectory(folder.Path().c_str()); }
    ~LocalDiskTest() override {
        GetFileSystem()->SetCurrentDirectory("");
        EXPECT_EQ(CountOpenDescriptors(), m_DescriptorsBefore);
    }

    bool Open(FileEntryData& entry, FilePermission permission) {
        return local.Open(entry, permission, kFileAutoBehaviorNone);
    }
    FileSystemEntry Entry(const std::string& name) const {
        return FileSystemEntry((name[0] == '/' ? name : folder / name).c_str());
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

    // Whether function answers true in another process, which has no more rights than any user.
    template <typename Function>
    bool IsTrueForAnyUser(Function function) const {
        Run("chmod 755 .");
        const pid_t child = fork();
        if (child == 0) {
            if (geteuid() == 0 && (setgid(65534) != 0 || setuid(65534) != 0)) _exit(1);
            _exit(function() ? 0 : 1);
        }
        int status = -1;
        return waitpid(child, &status, 0) == child && status == 0;
    }

    const size_t m_DescriptorsBefore = CountOpenDescriptors();
    const TemporaryFolder folder;
    LocalFileSystemPosix local;
};
