// A folder with a copy of the scripts, in which programs of the system can be replaced by small ones.
//
//   Replace("cmake", "echo 'no such preset'; exit 1");
//   EXPECT_EQ(..., Run(m_Folder / "scripts/extract", {"a.zarvo"}));
#pragma once

#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"

class ScriptFolder : public testing::Test {
protected:
    ScriptFolder() {
        std::filesystem::copy(VARNEX_SOURCE_DIR "/scripts", m_Folder / "scripts");
        std::filesystem::create_directory(m_Folder / "bin");
    }

    // Makes a program that runs a line of shell, and that is found before the system's program of the same name.
    void Replace(const std::string& name, const std::string& line) {
        WriteFile(m_Folder / ("bin/" + name), "#!/bin/sh\n" + line + "\n");
        std::filesystem::permissions(m_Folder / ("bin/" + name), std::filesystem::perms::owner_all);
    }

    Transcript Run(const std::string& program, const std::vector<std::string>& arguments) {
        const auto prepare = [&] {
            return setenv("PATH", (m_Folder / "bin:" + getenv("PATH")).c_str(), 1) == 0 &&
                   setenv("LC_ALL", "C", 1) == 0;
        };
        return RunProgram(program.c_str(), arguments, m_Folder.Path(), prepare);
    }

    const TemporaryFolder m_Folder;
};
