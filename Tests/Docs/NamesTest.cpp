// What ARCHITECTURE.md names is in the source, and the README's figures are those that were measured last.
#include "Tests/Support/TemporaryFolder.h"

#include <regex>
#include <set>

namespace fs = std::filesystem;

namespace {

const fs::path kRoot = VARNEX_SOURCE_DIR;

std::vector<std::string> FindAll(const std::string& text, const char* expression) {
    const std::regex regex(expression);
    std::vector<std::string> found;
    for (std::sregex_iterator at(text.begin(), text.end(), regex), end; at != end; ++at)
        found.push_back(at->str(at->size() - 1));
    return found;
}

// The paths of all files and folders of the source, from its root, with "/" in front and, after folders, at the end;
// and the words in the files.
class Source {
public:
    Source() {
        for (const char* const folder :
             {"Benchmarks", "Examples", "Footing", "Fuzz", "Library", "PlatformDependent", "Python", "Runtime",
              "Samples", "Tests", "Tools", "cmake", "debian", "docs", "man", "scripts"}) {
            Add(kRoot / folder);
            for (const auto& entry : fs::recursive_directory_iterator(kRoot / folder))
                Add(entry.path());
        }
    }

    // Whether there is a file or folder of this name, which may leave out the folders that it is in.
    bool HasPath(const std::string& name) const {
        return m_Paths.find("/" + name + "\n") != std::string::npos ||
               m_Paths.find("/" + name + "/\n") != std::string::npos;
    }
    bool HasWord(const std::string& word) const { return m_Words.contains(word); }

private:
    void Add(const fs::path& path) {
        m_Paths += "/" + fs::relative(path, kRoot).string() + (fs::is_directory(path) ? "/\n" : "\n");
        if (!std::set<std::string>{".h", ".hpp", ".c", ".cpp", ".py", ".txt", ".cmake"}.contains(path.extension()))
            return;
        for (std::string& word : FindAll(ReadFile(path), "\\w+"))
            m_Words.insert(std::move(word));
    }

    std::string m_Paths;
    std::set<std::string> m_Words;
};

// The cells of the first row of a table that begins with this one.
std::vector<std::string> ReadRow(const std::string& document, const std::string& first) {
    const size_t from = document.find("\n| " + first + " | ");
    if (from == std::string::npos) return {};
    return FindAll(document.substr(from + 1, document.find('\n', from + 1) - from), "\\| ([^|\n]+) (?=\\|)");
}

// The columns of wall times and of peak memory.
constexpr size_t kWall = 2, kPeak = 5;

double AsNumber(const std::vector<std::string>& row, size_t column) {
    return column < row.size() ? std::stod(row[column]) : 0;
}

std::string Format(const char* format, double number) {
    char text[32];
    (void)snprintf(text, sizeof(text), format, number);
    return text;
}

// With its lines joined.
std::string ReadReadme() { return std::regex_replace(ReadFile(kRoot / "README.md"), std::regex("\\s+"), " "); }

} // namespace

TEST(Architecture, NamesWhatTheSourceHas) {
    const Source source;
    const std::vector<std::string> names = FindAll(ReadFile(kRoot / "ARCHITECTURE.md"), "`([^`]+)`");
    EXPECT_LT(200u, names.size());
    const std::regex file("\\S+/\\S*|\\S+\\.(h|hpp|cpp|cmake|dict|md)");
    for (const std::string& name : names) {
        if (std::regex_match(name, file)) {
            EXPECT_TRUE(source.HasPath(name.ends_with('/') ? name.substr(0, name.size() - 1) : name)) << name;
            continue;
        }
        for (const std::string& word : FindAll(name, "\\w+"))
            EXPECT_TRUE(source.HasWord(word)) << word << " in " << name;
    }
}

TEST(Readme, ShowsTheFiguresOfTheLastRun) {
    const std::string measured = ReadFile(kRoot / "docs/performance.md");
    const std::vector<std::string> tree = FindAll(measured, "\n([0-9,]+ files, \\d+ MB);");
    const std::vector<std::string> row = ReadRow(measured, "**LZ4HC chunks**");
    const std::vector<std::string> other = ReadRow(measured, "`unsquashfs -p 1`, lz4hc");
    const double floor = AsNumber(ReadRow(measured, "floor of LZ4HC chunks"), kWall);
    const std::vector<std::string> expected = {tree.empty() ? "" : tree[0],
                                               Format("%.2f", AsNumber(row, kWall)),
                                               Format("%.0f", (AsNumber(row, kWall) / floor - 1) * 100),
                                               Format("%.2f", AsNumber(other, kWall)),
                                               Format("%.0f", AsNumber(row, kPeak)),
                                               Format("%.0f", AsNumber(other, kPeak))};

    const std::string text = ReadReadme();
    const std::regex figures(
        "extracts ([0-9,]+ files) \\((\\d+ MB), LZ4HC\\) in ([0-9.]+) s\\. That is (\\d+) % longer .*?"
        "`unsquashfs -p 1` needs ([0-9.]+) s .*?"
        "`Varnex` takes (\\d+) MiB for these files, where `unsquashfs` takes (\\d+) MiB");
    std::smatch found;
    ASSERT_TRUE(std::regex_search(text, found, figures)) << "the sentences with the figures have changed";
    std::vector<std::string> shown = {found.str(1) + ", " + found.str(2)};
    for (size_t index = 3; index < found.size(); ++index)
        shown.push_back(found.str(index));
    EXPECT_EQ(expected, shown);
}

TEST(Readme, RoundsTheFiguresOfZarvo) {
    const std::string measured = ReadFile(kRoot / "docs/performance.md");
    const std::string text = ReadReadme();
    const std::string peak = Format("%.0f", AsNumber(ReadRow(measured, "**`extract`: LZ4HC chunks**"), kPeak));
    EXPECT_NE(std::string::npos, text.find("`zarvo` takes about " + peak + " MiB")) << peak;

    struct Case {
        std::string sentence;
        double share;
        std::string row;
        std::string other;
    };
    for (const Case& each :
         {Case{.sentence = "it extracts LZ4HC in about half the time of `unsquashfs`",
         .share = 0.5,
         .row = "**`extract`: LZ4HC chunks**",
         .other = "`unsquashfs -p 2`, lz4hc"},
          Case{.sentence = "LZMA blocks, with a decoder of its own, in about three fifths of the time "
                           "of `7zz`",
          .share = 0.6,
          .row = "**`extract`: LZMA chunks**",
          .other = "`7zz x -mmt=2`, LZMA2 blocks of 128 KiB"}}) {
        EXPECT_NE(std::string::npos, text.find(each.sentence)) << each.sentence;
        const double other = AsNumber(ReadRow(measured, each.other), kWall);
        EXPECT_NEAR(each.share, AsNumber(ReadRow(measured, each.row), kWall) / other, 0.05) << each.sentence;
    }
}
