#include "Tests/Support/TemporaryFolder.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <dirent.h>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sys/stat.h>
#include <unistd.h>

namespace fs = std::filesystem;

namespace {

// By descriptor, so that trees deeper than a path can name are removed too.
void RemoveContents(int folder) {
    fchmod(folder, 0700); // what a test has made read-only
    DIR* stream = fdopendir(folder);
    if (stream == nullptr) return;
    while (const dirent* record = readdir(stream)) {
        const std::string name = record->d_name;
        if (name == "." || name == "..") continue;
        if (unlinkat(folder, name.c_str(), 0) == 0) continue;
        fchmodat(folder, name.c_str(), 0700, 0);
        const int child = openat(folder, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
        if (child >= 0) RemoveContents(child);
        unlinkat(folder, name.c_str(), AT_REMOVEDIR);
    }
    closedir(stream);
}

} // namespace

TemporaryFolder::TemporaryFolder() {
    std::string path = fs::canonical(fs::temp_directory_path()).string() + "/varnex-test-XXXXXX";
    if (mkdtemp(path.data()) == nullptr) abort(); // no test can go on
    m_Path = path;
}

TemporaryFolder::~TemporaryFolder() {
    const int folder = open(m_Path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (folder >= 0) RemoveContents(folder);
    EXPECT_EQ(rmdir(m_Path.c_str()), 0) << m_Path;
}

std::string operator/(const TemporaryFolder& folder, const std::string& name) { return folder.Path() + "/" + name; }

void WriteFile(const std::string& path, const std::string& text) {
    std::ofstream file(path, std::ios::binary);
    file << text;
    file.close();
    EXPECT_TRUE(file.good()) << path;
}

std::string ReadFile(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    EXPECT_TRUE(file.is_open()) << path;
    return {std::istreambuf_iterator<char>(file), {}};
}

size_t CountOpenDescriptors() {
    const fs::directory_iterator descriptors("/proc/self/fd"); // itself open while it counts
    return static_cast<size_t>(std::distance(fs::begin(descriptors), fs::end(descriptors))) - 1;
}
