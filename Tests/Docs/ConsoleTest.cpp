// The sessions that documents show, run as they stand: in a document, an indented line that begins with "$ " is a
// command, lines that begin with "> " after it belong to it, and the other lines of the block are what it prints.
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"

#include <regex>

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
class Console : public testing::Test {
protected:
    Console() {
        for (const std::string copied : {"Samples", "scripts", "docs"})
            fs::copy(VARNEX_SOURCE_DIR "/" + copied, m_Folder / copied, fs::copy_options::recursive);
        fs::create_directories(m_Folder / "build/release");
        fs::create_directory(m_Folder / "bin");
        for (const std::string folder : {"build/release/", "bin/"}) {
            fs::create_symlink(VARNEX_BINARY, m_Folder / (folder + "Varnex"));
            fs::create_symlink(ZARVO_BINARY, m_Folder / (folder + "zarvo"));
        }
        for (const auto& [name, line] : {std::pair("cmake", "true"), std::pair("dpkg-query", "echo installed")}) {
            WriteFile(m_Folder / ("bin/" + std::string(name)), std::string("#!/bin/sh\n") + line + "\n");
            fs::permissions(m_Folder / ("bin/" + std::string(name)), fs::perms::owner_all);
        }
    }

    Transcript Run(const std::string& command) {
        const auto prepare = [&] {
            return setenv("PATH", (m_Folder / "bin:" + getenv("PATH")).c_str(), 1) == 0 &&
                   setenv("LC_ALL", "C", 1) == 0;
        };
        return RunProgram("/bin/bash", {"-c", command}, m_Folder.Path(), prepare);
    }

    const TemporaryFolder m_Folder;
};

class ConsoleOf : public Console, public testing::WithParamInterface<const char*> {};

INSTANTIATE_TEST_SUITE_P(Documents, ConsoleOf, testing::Values("README.md", "docs/recipes.md"));

TEST_P(ConsoleOf, PrintsWhatTheDocumentShows) {
    const std::vector<Step> steps = ReadSteps(VARNEX_SOURCE_DIR "/" + std::string(GetParam()));
    EXPECT_LT(3u, steps.size());
    for (const Step& step : steps) {
        const auto [status, output] = Run(step.command);
        EXPECT_EQ(0, status) << step.command;
        EXPECT_EQ(WithoutSeconds(step.output), WithoutSeconds(output)) << step.command;
    }
}

TEST_F(Console, ScreenshotMakesThePictureOfTheReadme) {
    fs::remove(m_Folder / "docs/terminal.svg");
    EXPECT_EQ(Transcript(0, ""), Run("scripts/screenshot"));
    EXPECT_EQ(WithoutSeconds(ReadFile(VARNEX_SOURCE_DIR "/docs/terminal.svg")),
              WithoutSeconds(ReadFile(m_Folder / "docs/terminal.svg")));
}
