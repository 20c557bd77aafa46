// What tests of the macOS back end share: a fresh folder, which is HOME too, a pool, a stand-in that fails nothing, and
// a count of open descriptors that has to be the same when the test ends.
#pragma once

#include "PlatformDependent/OSX/LocalFileSystemOSX.h"
#include "PlatformDependent/OSX/Platform.h"
#include "PlatformDependent/OSX/Standin/Faults.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#include "Tests/Support/TemporaryFolder.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <set>
#include <string>

class MacTest : public testing::Test {
protected:
    void SetUp() override {
        setenv("HOME", Path("").c_str(), 1);
        WorkIn("/");
    }

    void TearDown() override {
        WorkIn("/");
        EXPECT_EQ(CountOpenDescriptors(), m_DescriptorsBefore);
    }

    // The path of a name in the test's folder; the folder itself for none.
    std::string Path(const std::string& name) const {
        return name.empty() ? m_Folder.Path() : m_Folder.Path() + "/" + name;
    }

    // Makes the folders above it too.
    void WriteFile(const std::string& name, const std::string& text) const {
        std::filesystem::create_directories(std::filesystem::path(Path(name)).parent_path());
        ::WriteFile(Path(name), text);
    }

    std::string ReadFile(const std::string& name) const { return ::ReadFile(Path(name)); }

    // Every name below a folder, links not followed.
    std::set<std::string> Tree(const std::string& name) const {
        std::set<std::string> names;
        for (const auto& entry : std::filesystem::recursive_directory_iterator(Path(name)))
            names.insert(entry.path().string().substr(Path(name).size() + 1));
        return names;
    }

    // Makes a folder the process's working directory and the file system's current directory.
    void WorkIn(const std::string& name) const {
        const std::string path = name == "/" ? name : Path(name);
        ASSERT_EQ(chdir(path.c_str()), 0);
        GetFileSystem()->SetCurrentDirectory(path.c_str());
    }

    FileSystemEntry Entry(const std::string& name) const { return FileSystemEntry(Path(name).c_str()); }

    // The back end under test: the one that the registry of this program has.
    static LocalFileSystemOSX& Mac() {
        return *static_cast<LocalFileSystemOSX*>(GetFileSystem()->GetHandlerForPath("/"));
    }

private:
    const size_t m_DescriptorsBefore = CountOpenDescriptors();
    const TemporaryFolder m_Folder;
    const ScopedFaults m_Faults;
    const AutoreleasePool m_Pool;
};
