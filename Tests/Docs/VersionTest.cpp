// The version is told in CMakeLists.txt, and repeated where people and packaging tools look for it.
#include "Tests/Support/TemporaryFolder.h"

namespace {

// What stands between the first start and the end after it.
std::string FirstBetween(const char* document, const std::string& start, const std::string& end) {
    const std::string text = ReadFile(std::string(VARNEX_SOURCE_DIR "/") + document);
    const size_t from = text.find(start);
    if (from == std::string::npos) return "";
    return text.substr(from + start.size(), text.find(end, from + start.size()) - from - start.size());
}

TEST(Version, IsTheNewestOfTheChangelogs) {
    EXPECT_EQ(VARNEX_VERSION, FirstBetween("CHANGELOG.md", "\n## ", "\n"));
    EXPECT_EQ(VARNEX_VERSION, FirstBetween("debian/changelog", "varnex (", ")"));
}

TEST(Version, IsThatOfThePythonModule) {
    EXPECT_EQ(VARNEX_VERSION, FirstBetween("Python/pyproject.toml", "\nversion = \"", "\""));
}

} // namespace
