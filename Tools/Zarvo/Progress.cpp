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

Progress::Progress(const Arguments& arguments, Console& console, bool canShow)
    : m_Console(console), m_IsShown(IsShown(arguments, console, canShow)) {}

void Progress::Update(Amount done, Amount total) {
    if (!m_IsShown) return;
    const Clock::time_point now = Clock::now();
    const double seconds = std::chrono::duration<double>(now - m_Start).count();
    if (done.bytes == 0 && total.bytes != 0) m_Prelude = {.files = done.files, .seconds = seconds};
    if (now - m_Shown < std::chrono::milliseconds(m_Console.IsTerminal() ? 100 : 1'000)) return;
    m_Shown = now;
    m_Console.ShowProgress(DescribeProgress(done, total, seconds, m_Prelude));
}

std::string DescribeProgress(Amount done, Amount total, double seconds, Prelude prelude) {
    const auto bytes = static_cast<double>(done.bytes), all = static_cast<double>(total.bytes);
    const double rate = seconds > 0 ? bytes / seconds : 0;
    // A file costs time beside its bytes, about as much as so many bytes do.
    constexpr double kFileCost = 16'384;
    const double work = bytes + kFileCost * static_cast<double>(done.files - prelude.files);
    const double allWork = all + kFileCost * static_cast<double>(total.files - prelude.files);
    const double workLeft = work > 0 ? (allWork - work) / work * (seconds - prelude.seconds) : -1;
    std::string left = "?";
    if (workLeft >= 0 && workLeft < 1e6) {
        const auto secondsLeft = static_cast<unsigned>(workLeft + 0.5);
        char text[32];
        (void)snprintf(text, sizeof(text), "%u:%02u", secondsLeft / 60, secondsLeft % 60);
        left = text;
    }
    char files[64] = "";
    if (total.files > 0)
        (void)snprintf(files, sizeof(files), "%llu of %llu files, ", static_cast<unsigned long long>(done.files),
                       static_cast<unsigned long long>(total.files));
    // Of files that are all empty, their share.
    const double share = all > 0 ? bytes / all : allWork > 0 ? work / allWork : 0;
    char line[192];
    (void)snprintf(line, sizeof(line), "%3.0f%%  %s of %s, %s%s/s, %s left", 100 * share, DescribeBytes(bytes).c_str(),
                   DescribeBytes(all).c_str(), files, DescribeBytes(rate).c_str(), left.c_str());
    return line;
}
