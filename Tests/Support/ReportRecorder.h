// Records the reports of the log sink with their source positions while it lives, and keeps them off the console. One
// at a time, on the test's main thread.
#pragma once

#include "Tests/Support/ConsoleCapture.h"

#include <utility>
#include <vector>

class ReportRecorder {
public:
    ReportRecorder() {
        s_Texts.clear();
        gUtpLogFunc = [](const DebugStringToFileData& data) {
            s_Texts.push_back(std::string(data.file) + ":" + std::to_string(data.line) + ": " + data.message);
        };
    }
    ~ReportRecorder() { gUtpLogFunc = nullptr; }

    // "file:line: message" of each record since the last call.
    std::vector<std::string> Take() { return std::exchange(s_Texts, {}); }

private:
    static inline std::vector<std::string> s_Texts;
    ConsoleCapture m_Console;
};
