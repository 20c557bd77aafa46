#include "Footing/Process.h"

#include "PlatformDependent/Linux/FileDescriptor.h"

#include <cstdlib>
#include <gtest/gtest.h>

TEST(Process, WorkingDirectoryIsNullOnceItIsGone) {
    const auto isNullOnceGone = [] {
        char folder[] = "/tmp/varnexXXXXXX";
        if (chdir(mkdtemp(folder)) != 0 || ZarvoClassic::Footing_Process_GetWorkingDirectory() == nullptr) return false;
        return rmdir(folder) == 0 && ZarvoClassic::Footing_Process_GetWorkingDirectory() == nullptr;
    };
    EXPECT_EXIT(_exit(isNullOnceGone() ? 0 : 1), testing::ExitedWithCode(0), "");
}

TEST(FileDescriptor, OpenedFilesAreNotHandedOnToOtherPrograms) {
    const int descriptor = PlatformOpen("/proc/self/exe", O_RDONLY, 0);
    EXPECT_EQ(fcntl(descriptor, F_GETFD), FD_CLOEXEC);
    EXPECT_TRUE(PlatformClose(descriptor) == 0 && PlatformClose(descriptor) == -1);
}
