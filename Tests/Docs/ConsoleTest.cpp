// The sessions that documents show, run as they stand: in a document, an indented line that begins with "$ " is a
// command, lines that begin with "> " after it belong to it, and the other lines of the block are what it prints.
#include "Tests/Docs/ScriptFolder.h"

#include <regex>
#include <set>

namespace fs = std::filesystem;

namespace {

struct Step {
    std::string command;
    std::string output;
};

std::vector<Step> ReadSteps(const std::string& document) {
    std::vector<Step> steps;
    std::istringstream text(ReadFile(document));
    bool isInSession = false;
    for (std::string line; std::getline(text, line);) {
        const bool isCode = line.starts_with("    ");
        if (isCode) line.erase(0, 4);
        if (isCode && line.starts_with("$ ")) {
            steps.push_back({.command = line.substr(2), .output = ""});
            isInSession = true;
        } else if (!isCode) {
            isInSession = false;
        } else if (isInSession && line.starts_with("> ")) {
            steps.back().command += "\n" + line.substr(2);
        } else if (isInSession) {
            steps.back().output += line + "\n";
        }
    }
    return steps;
}

// How long a run takes is the one figure that may differ.
std::string WithoutSeconds(const std::string& text) {
    return std::regex_replace(text, std::regex("[0-9]+\\.[0-9]{2} seconds"), "? seconds");
}

} // namespace

// A folder like the root of the source after a build, in which building is left out. The commands are also installed.
class Console : public ScriptFolder {
protected:
    Console() {
        for (const std::string copied : {"Samples", "docs"})
            fs::copy(VARNEX_SOURCE_DIR "/" + copied, m_Folder / copied);
        fs::create_directories(m_Folder / "build/release");
        for (const std::string folder : {"build/release/", "bin/"}) {
            fs::create_symlink(VARNEX_BINARY, m_Folder / (folder + "Varnex"));
            fs::create_symlink(ZARVO_BINARY, m_Folder / (folder + "zarvo"));
        }
        Replace("cmake", "true");
        Replace("dpkg-query", "echo installed");
        Replace("python3", "PYTHONPATH=" ZARVO_PYTHON_PATH " exec /usr/bin/python3 \"$@\"");
    }

    // Runs a line of shell where the lines before it have gone to.
    Transcript RunLine(const std::string& command) {
        const std::string placeFile = m_Folder / "build/place";
        const std::string shell = "cd \"$1\" && trap 'pwd >\"$2\"' EXIT\n" + command;
        const Transcript transcript = Run("/bin/bash", {"-c", shell, "bash", m_Place, placeFile});
        m_Place = ReadFile(placeFile);
        m_Place.pop_back(); // the newline
        return transcript;
    }

    std::set<std::string> ListRoot() const {
        std::set<std::string> names;
        for (const fs::directory_entry& entry : fs::directory_iterator(m_Folder.Path()))
            names.insert(entry.path().filename());
        return names;
    }

    std::string m_Place = m_Folder.Path();
};

class ConsoleOf : public Console, public testing::WithParamInterface<const char*> {};

INSTANTIATE_TEST_SUITE_P(Documents, ConsoleOf, testing::Values("README.md", "docs/recipes.md"));

TEST_P(ConsoleOf, PrintsWhatTheDocumentShows) {
    const std::vector<Step> steps = ReadSteps(VARNEX_SOURCE_DIR "/" + std::string(GetParam()));
    EXPECT_LT(3u, steps.size());
    const std::set<std::string> namesBefore = ListRoot();
    const bool canMount = access("/dev/fuse", R_OK | W_OK) == 0;
    const bool canImport = *ZARVO_PYTHON_PATH != '\0' && !VARNEX_SANITIZED; // Python itself is not sanitized
    std::string leftOut;
    bool isMountLeftOut = false;
    for (const Step& step : steps) {
        if (step.command.starts_with("zarvo mount")) isMountLeftOut = !canMount;
        if (isMountLeftOut || (step.command.starts_with("python3") && !canImport)) {
            leftOut += "\n" + step.command;
            if (step.command.starts_with("fusermount3 -u")) isMountLeftOut = false;
            continue;
        }
        const auto [status, output] = RunLine(step.command);
        EXPECT_EQ(0, status) << step.command;
        EXPECT_EQ(WithoutSeconds(step.output), WithoutSeconds(output)) << step.command;
    }
    EXPECT_EQ(namesBefore, ListRoot()); // build/ and *_data are no part of the source
    if (!leftOut.empty()) GTEST_SKIP() << "this system can't run:" << leftOut;
}

TEST_F(Console, ScreenshotMakesThePictureOfTheReadme) {
    fs::remove(m_Folder / "docs/terminal.svg");
    Replace("cmake", "[ -e built ] || echo '[1/2] Building'; touch built"); // that doesn't go into the picture
    EXPECT_EQ(Transcript(0, "Building, step 1 of 2\n"), RunLine("scripts/screenshot"));
    EXPECT_EQ(WithoutSeconds(ReadFile(VARNEX_SOURCE_DIR "/docs/terminal.svg")),
              WithoutSeconds(ReadFile(m_Folder / "docs/terminal.svg")));
}
