#include "Tools/Zarvo/Progress.h"

#include "Tools/Zarvo/Text.h"

#include <cstdio>

namespace {

bool IsShown(const Arguments& arguments, const Console& console, bool canShow) {
    const std::string* const when = arguments.Find(kProgress);
    if (arguments.Has(kQuiet) || (when != nullptr && *when == "never")) return false;
    return (when != nullptr && *when == "always") || (canShow && console.IsTerminal());
}

} // namespace

Progress::Progress(const Arguments& arguments, Console& console, Amount total, bool canShow)
    : m_Console(console), m_Total(total), m_IsShown(IsShown(arguments, console, canShow)) {}

void Progress::Update(Amount done) {
    if (!m_IsShown) return;
    const Clock::time_point now = Clock::now();
    if (now - m_Shown < std::chrono::milliseconds(m_Console.IsTerminal() ? 100 : 1'000)) return;
    m_Shown = now;
    m_Console.ShowProgress(DescribeProgress(done, m_Total, std::chrono::duration<double>(now - m_Start).count()));
}

std::string DescribeProgress(Amount done, Amount total, double seconds) {
    const auto bytes = static_cast<double>(done.bytes), all = static_cast<double>(total.bytes);
    const double rate = seconds > 0 ? bytes / seconds : 0;
    std::string left = "?";
    if (rate > 0 && all >= bytes && (all - bytes) / rate < 1e6) {
        const auto secondsLeft = static_cast<unsigned>((all - bytes) / rate + 0.5);
        char text[32];
        (void)snprintf(text, sizeof(text), "%u:%02u", secondsLeft / 60, secondsLeft % 60);
        left = text;
    }
    char line[192];
    (void)snprintf(line, sizeof(line), "%3.0f%%  %s of %s, %llu of %llu files, %s/s, %s left",
                   all > 0 ? 100 * bytes / all : 0, DescribeBytes(bytes).c_str(), DescribeBytes(all).c_str(),
                   static_cast<unsigned long long>(done.files), static_cast<unsigned long long>(total.files),
                   DescribeBytes(rate).c_str(), left.c_str());
    return line;
}
