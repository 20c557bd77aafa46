// What the scripts print, with small programs in place of the system's.
#include "Tests/Docs/ScriptFolder.h"

namespace fs = std::filesystem;

class Scripts : public ScriptFolder {
protected:
    Scripts() { Replace("apt-get", "exit 1"); }

    Transcript RunScript(const std::string& script, const std::vector<std::string>& arguments) {
        return Run(m_Folder / ("scripts/" + script), arguments);
    }
};

TEST_F(Scripts, SayWhenThereIsNoCheckout) {
    for (const std::string script : {"format", "lines", "includes"}) {
        const std::vector<std::string> arguments(script == "format" ? 1 : 0, "--check");
        const std::string said = m_Folder / ("scripts/" + script) + ": needs a git checkout, which lists the sources\n";
        EXPECT_EQ(Transcript(1, said), RunScript(script, arguments));
    }
}

TEST_F(Scripts, AskForAllTheirPackagesAtOnce) {
    WriteFile(m_Folder / ".git", "");
    Replace("dpkg-query", "exit 1");
    Replace("sudo", "exit 1");
    Replace("id", "echo 1000");
    const std::string
        build = "g++ cmake ninja-build liblz4-dev lzma-dev nlohmann-json3-dev libssl-dev "
                "libfuse3-dev ",
        test = build + "libgtest-dev libgmock-dev clang libclang-rt-14-dev llvm jq fuse3 python3-dev python3-fsspec",
        lint = build +
               "libgtest-dev libgmock-dev libbenchmark-dev liblzma-dev clang clang-tidy-14 gcovr mandoc git python3 "
               "python3-dev";
    struct Row {
        std::string script;
        std::vector<std::string> arguments;
        std::string packages;
    };
    for (const Row& row :
         {Row{.script = "test",
         .arguments = {},
         .packages = test + " build-essential debhelper lintian pkgconf shared-mime-info libglib2.0-bin dh-python "
                            "python3-pip python3-setuptools python3-wheel"},
          Row{.script = "test", .arguments = {"debug"}, .packages = test},
          Row{.script = "bench", .arguments = {"--help"}, .packages = "python3"},
          Row{.script = "includes", .arguments = {}, .packages = lint}})
        EXPECT_EQ(Transcript(1, "Installing " + row.packages + "\n"), RunScript(row.script, row.arguments))
            << row.script;
}

TEST_F(Scripts, SetupSaysWhatToRunWithoutSudo) {
    Replace("dpkg-query", "exit 1");
    Replace("id", "echo 1000");
    const std::string setup = m_Folder / "scripts/setup";
    EXPECT_EQ(Transcript(1, setup + ": packages are missing, and there is no sudo to install them with. As root, run:\n"
                                    "apt-get update && apt-get install --no-install-recommends python3\n"),
              Run("/usr/bin/env", {"PATH=" + (m_Folder / "bin"), "/bin/bash", setup, "python"}));
}

TEST_F(Scripts, ExtractHelps) {
    const auto [status, said] = RunScript("extract", {"--help"});
    EXPECT_EQ(0, status);
    EXPECT_EQ("Usage: " + (m_Folder / "scripts/extract") + " [ARCHIVE]", said.substr(0, said.find('\n')));
}

TEST_F(Scripts, ExtractSaysHowFarItsBuildIs) {
    Replace("dpkg-query", "echo installed");
    Replace("cmake", "printf '[0/9] Looking\\n[3/9] Building\\n[4/9] Linking\\n'\n"
                     "mkdir -p build/release && ln -sf /bin/true build/release/Varnex");
    EXPECT_EQ(Transcript(0, "Building, step 3 of 9\n"), RunScript("extract", {"a.zarvo"}));
    Replace("cmake", "printf '[3/9] broken\\n'; exit 1");
    const auto [status, said] = RunScript("extract", {"a.zarvo"});
    EXPECT_EQ(1, status);
    EXPECT_NE(std::string::npos, said.find("\n[3/9] broken\n")) << said;
}

TEST_F(Scripts, SayWhereTheyCanNotBuild) {
    Replace("dpkg-query", "echo installed");
    Replace("id", "echo somebody");
    WriteFile(m_Folder / "build", "in the way");
    for (const std::string script : {"extract", "zarvo"}) {
        const std::string said =
            m_Folder / ("scripts/" + script) + ": can't build in " + (m_Folder / "build/release") +
            ", which must be a folder that somebody may write to; copy the source to one of your own\n";
        EXPECT_EQ(Transcript(1, said), RunScript(script, {}));
    }
}

TEST_F(Scripts, ExtractStopsWithoutAFileForItsLog) {
    Replace("dpkg-query", "echo installed");
    Replace("cmake", "echo built");
    Replace("mktemp", "echo 'no room' >&2; exit 1");
    EXPECT_EQ(Transcript(1, "no room\n"), RunScript("extract", {"a.zarvo"}));
}

TEST_F(Scripts, FormatFailsWithoutTheListOfSources) {
    WriteFile(m_Folder / ".git", "");
    Replace("dpkg-query", "echo installed");
    Replace("git", "exit 128");
    Replace("clang-format-14", "exit 0");
    EXPECT_EQ(Transcript(128, ""), RunScript("format", {"--check"}));
}

TEST_F(Scripts, TestSaysWhyATestWasSkipped) {
    Replace("dpkg-query", "echo installed");
    Replace("cmake", "");
    Replace("ctest", "echo '1/2 Test #1: A.B ...***Skipped'; echo '100% tests passed, 0 tests failed out of 2'");
    fs::create_directories(m_Folder / "build/debug/Testing/Temporary");
    WriteFile(m_Folder / "build/debug/Testing/Temporary/LastTest.log",
              "[ RUN      ] A.B\na.cpp:12: Skipped\nno such device\n\n[  SKIPPED ] A.B (0 ms)\n[  SKIPPED ] 1 test, "
              "listed below:\n");
    const auto [status, said] = RunScript("test", {"debug"});
    EXPECT_EQ(0, status);
    EXPECT_TRUE(said.ends_with("\nSkipped (debug): A.B: no such device\n1 passed, 0 failed, 1 skipped\n")) << said;
}
