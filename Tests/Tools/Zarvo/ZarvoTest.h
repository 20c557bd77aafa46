// What the tests of zarvo share: archives in words or in the open, in a folder that is the current one, and the command
// run in process, with all that it says.
//
//   MakeArchive("a.zarvo", Archive("a:x b|"));
//   EXPECT_EQ((Heard{0, "a\nb/\n", ""}), Zarvo({"list", "a.zarvo"}));
#pragma once

#include "Tests/Tools/Extractor/ExtractorTest.h"
#include "Tools/Zarvo/Command.h"

#include <csignal>
#include <gmock/gmock-matchers.h>
#include <ostream>

struct Heard {
    int status;
    std::string output;
    std::string error;
    bool operator==(const Heard&) const = default;
    friend std::ostream& operator<<(std::ostream& stream, const Heard& heard) {
        return stream << "status " << heard.status << "\n--- output\n" << heard.output << "--- error\n" << heard.error;
    }
};

// A file without a name, as a descriptor.
class Scratch {
public:
    explicit Scratch(const std::string& text = "") : m_File(tmpfile()) {
        EXPECT_EQ(text.size(), fwrite(text.data(), 1, text.size(), m_File));
        rewind(m_File);
    }
    ~Scratch() { fclose(m_File); }
    Scratch(const Scratch&) = delete;
    Scratch& operator=(const Scratch&) = delete;

    int Descriptor() const { return fileno(m_File); }
    std::string Read() const {
        std::string text;
        rewind(m_File);
        for (int byte; (byte = getc(m_File)) != EOF;)
            text += static_cast<char>(byte);
        return text;
    }

private:
    FILE* m_File;
};

// Where a run takes place.
struct Stage {
    std::string input = {};
    bool isOutputTerminal = false;
    bool isErrorTerminal = false;
    int signal = 0; // that has come
};

inline Heard Zarvo(const std::vector<std::string>& arguments, const Stage& stage = {}) {
    const Scratch input(stage.input), output, error;
    World world;
    world.arguments = arguments;
    world.input = input.Descriptor();
    world.output = output.Descriptor();
    world.error = error.Descriptor();
    world.isOutputTerminal = stage.isOutputTerminal;
    world.isErrorTerminal = stage.isErrorTerminal;
    const std::atomic<int> signal = stage.signal;
    world.signal = &signal;
    const int status = RunZarvo(world).status;
    return {status, output.Read(), error.Read()};
}

inline void MakeArchive(const std::string& path, const ArchiveDescription& archive) {
    WriteFile(path, BuildArchive(archive).bytes);
}

// Each test has an empty folder, which is the current one.
class ZarvoTest : public testing::Test {
protected:
    ZarvoTest() {
        fs::current_path(m_Folder.Path());
        signal(SIGPIPE, SIG_IGN); // as the process has it
    }
    ~ZarvoTest() override { fs::current_path(m_Before); }

private:
    const fs::path m_Before = fs::current_path();
    const TemporaryFolder m_Folder;
};
