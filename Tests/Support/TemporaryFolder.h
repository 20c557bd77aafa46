// A fresh folder under the system's temporary one, removed with all that it holds when the object goes, and the whole
// contents of files as texts. One test's, one thread's.
//
//   TemporaryFolder folder;
//   WriteFile(folder / "archive", bytes);
#pragma once

#include <cstddef>
#include <string>

class TemporaryFolder {
public:
    TemporaryFolder();
    ~TemporaryFolder();
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;

    // Absolute, without links and without a "/" at its end.
    const std::string& Path() const { return m_Path; }

private:
    std::string m_Path;
};

// The path of a name in the folder.
std::string operator/(const TemporaryFolder& folder, const std::string& name);

// Both fail the test when the file can't be written or read.
void WriteFile(const std::string& path, const std::string& text);
std::string ReadFile(const std::string& path);

// How many descriptors this process has open.
size_t CountOpenDescriptors();
