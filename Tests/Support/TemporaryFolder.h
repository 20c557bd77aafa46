// A fresh folder under the system's temporary one, removed with all that it holds when the object goes, and the whole
// contents of files as texts. One test's, one thread's.
//
//   TemporaryFolder folder;
//   WriteFile(folder / "archive", bytes);
#pragma once

#include "Runtime/Core/NonCopyable.h"

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>
#include <string>

class TemporaryFolder : private NonCopyable {
public:
    TemporaryFolder()
        : m_Path(std::filesystem::canonical(std::filesystem::temp_directory_path()) / "varnex-test-XXXXXX") {
        if (mkdtemp(m_Path.data()) == nullptr) abort(); // no test can go on
    }
    ~TemporaryFolder() {
        std::error_code error; // of what a test has made read-only, and more than once
        const auto open = [&](const std::filesystem::path& path) {
            std::filesystem::permissions(path, std::filesystem::perms::owner_all, std::filesystem::perm_options::add,
                                         error);
        };
        open(m_Path);
        for (std::filesystem::recursive_directory_iterator entry(m_Path, error), end; entry != end;
             entry.increment(error))
            if (entry->is_directory(error) && !entry->is_symlink(error)) open(*entry);
        std::filesystem::remove_all(m_Path, error);
        EXPECT_FALSE(std::filesystem::exists(m_Path)) << m_Path << ": " << error.message();
    }

    // Absolute, without links and without a "/" at its end.
    const std::string& Path() const { return m_Path; }

private:
    std::string m_Path;
};

// The path of a name in the folder.
inline std::string operator/(const TemporaryFolder& folder, const std::string& name) {
    return folder.Path() + "/" + name;
}

// Both fail the test when the file can't be written or read.
inline void WriteFile(const std::string& path, const std::string& text) {
    std::ofstream file(path, std::ios::binary);
    EXPECT_TRUE(file.write(text.data(), static_cast<std::streamsize>(text.size())).flush().good()) << path;
}
inline std::string ReadFile(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    EXPECT_TRUE(file.is_open()) << path;
    std::ostringstream text;
    text << file.rdbuf();
    return std::move(text).str();
}

// How many descriptors this process has open.
inline size_t CountOpenDescriptors() {
    const std::filesystem::directory_iterator descriptors("/proc/self/fd"); // itself open while it counts
    return static_cast<size_t>(std::distance(begin(descriptors), end(descriptors))) - 1;
}
