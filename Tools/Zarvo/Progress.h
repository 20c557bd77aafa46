// The line that says how far a run is: share of bytes, bytes, files, rate, time left.
//
// On a terminal it is redrawn ten times a second at most and wiped when the object goes; elsewhere, a line is printed
// every second. One thread's.
#pragma once

#include "Tools/Zarvo/Arguments.h"
#include "Tools/Zarvo/Output.h"

#include <chrono>
#include <cstdint>
#include <string>

struct Amount {
    uint64_t bytes = 0;
    uint64_t files = 0;
};

// What came before the first byte: empty files, which take so little time that they tell nothing of what is left.
struct Prelude {
    uint64_t files = 0;
    double seconds = 0;
};

class Progress {
public:
    // canShow: whether --progress=auto shows anything on a terminal.
    Progress(const Arguments& arguments, Console& console, bool canShow);
    ~Progress() { m_Console.WipeProgress(); }
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    // Called as often as is convenient, with what has been done of all there is.
    void Update(Amount done, Amount total);

private:
    using Clock = std::chrono::steady_clock;

    Console& m_Console;
    const bool m_IsShown;
    const Clock::time_point m_Start = Clock::now();
    Clock::time_point m_Shown = m_Start; // when the last line was
    Prelude m_Prelude;
};

// The line, after so many seconds.
std::string DescribeProgress(Amount done, Amount total, double seconds, Prelude prelude = {});
