// What tests of the POSIX back end share: a fresh folder, which is the file system's current directory, a back end of
// their own, and a count of open descriptors that has to be the same when the test ends.
#pragma once

#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Tests/Support/TemporaryFolder.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

class LocalDiskTest : public testing::Test {
protected:
    LocalDiskTest() { GetFileSystem()->SetCurrentDirectory(folder.Path().c_str()); }
    ~LocalDiskTest() override {
        GetFileSystem()->SetCurrentDirectory("");
        EXPECT_EQ(CountOpenDescriptors(), m_DescriptorsBefore);
    }

    bool Open(FileEntryData& entry, int permission) {
        return local.Open(entry, static_cast<FilePermission>(permission), kFileAutoBehaviorNone);
    }
    FileSystemEntry Entry(const std::string& name) const {
        return FileSystemEntry((name[0] == '/' ? name : folder / name).c_str());
    }

    // Runs a script of the shell in the folder, each command of which must succeed.
    void Run(const std::string& script) const {
        EXPECT_EQ(system(("set -e; cd '" + folder.Path() + "'; " + script).c_str()), 0) << script;
    }

    // Without following links; -1 when nothing is there.
    int Mode(const std::string& name) const {
        struct stat status;
        return lstat(Entry(name).path, &status) == 0 ? static_cast<int>(status.st_mode & 07777) : -1;
    }

    // Whether the function answers true in another process, which has no rights beyond anybody's.
    template <typename Function>
    bool IsTrueForAnybody(Function function) const {
        Run("chmod 755 .");
        const pid_t child = fork();
        if (child == 0) _exit((geteuid() != 0 || (setgid(65534) == 0 && setuid(65534) == 0)) && function() ? 0 : 1);
        int status = -1;
        return waitpid(child, &status, 0) == child && status == 0;
    }

    const size_t m_DescriptorsBefore = CountOpenDescriptors();
    const TemporaryFolder folder;
    LocalFileSystemPosix local;
};
