// Captures what the console functions print while it lives. One at a time, on the test's main thread.
#pragma once

#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Utilities/LogHooks.h"

#include <cstdio>
#include <cstdlib>
#include <string>

class ConsoleCapture : private NonCopyable {
public:
    ConsoleCapture() : m_File(open_memstream(&m_Text, &m_Size)), m_Previous(gConsoleFile.exchange(m_File)) {}
    ~ConsoleCapture() {
        gConsoleFile = m_Previous;
        fclose(m_File);
        free(m_Text);
    }

    // Everything printed so far.
    std::string Text() const { return std::string(m_Text, m_Size); }

private:
    char* m_Text = nullptr;
    size_t m_Size = 0;
    FILE* m_File;
    FILE* m_Previous;
};
