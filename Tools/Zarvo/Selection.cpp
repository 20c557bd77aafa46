#include "Tools/Zarvo/Selection.h"

#include "Tools/Zarvo/Text.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <unistd.h>

namespace {

// The whole contents. nullopt and errno when they can't be read, or when a signal has come.
std::optional<std::string> ReadAll(int descriptor, const OutputBuffer& output) {
    std::string text;
    char piece[65'536];
    while (true) {
        const ssize_t count = read(descriptor, piece, sizeof(piece));
        if (count == 0) return text;
        if (count > 0)
            text.append(piece, static_cast<size_t>(count));
        else if (errno != EINTR || output.HasSignal())
            return std::nullopt;
    }
}

std::optional<std::string> ReadAll(const std::string& path, const OutputBuffer& output) {
    const int descriptor = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (descriptor < 0) return std::nullopt;
    std::optional<std::string> text = ReadAll(descriptor, output);
    const int error = errno;
    (void)close(descriptor); // it was only read
    errno = error;
    return text;
}

// The last line may lack its end.
void AppendLines(const std::string& text, char end, std::vector<std::string>& lines) {
    for (size_t from = 0; from < text.size();) {
        const size_t to = std::min(text.find(end, from), text.size());
        lines.push_back(text.substr(from, to - from));
        from = to + 1;
    }
}

} // namespace

PatternList ReadPatterns(const Run& run) {
    PatternList list;
    list.patterns.assign(run.GetOperands().begin() + 1, run.GetOperands().end());
    list.isEverything = list.patterns.empty() && !run.arguments.Has(kFilesFrom);
    const char end = run.arguments.Has(kNul) || run.arguments.Has(kNulInput) ? '\0' : '\n';
    for (const std::string& file : run.arguments.FindAll(kFilesFrom)) {
        const std::optional<std::string> text =
            file == "-" ? ReadAll(run.input, run.output) : ReadAll(file, run.output);
        if (text) {
            AppendLines(*text, end, list.patterns);
        } else if (!run.output.HasSignal()) {
            run.console.Say(file == "-" ? "standard input" : file, strerror(errno));
            list.isComplete = false;
        }
    }
    return list;
}

bool AddPatterns(const Run& run, const std::string& archive, const std::vector<std::string>& list,
                 zarvo::patterns& patterns) {
    for (const std::string& pattern : list)
        if (const zarvo::error error = patterns.add(pattern)) {
            run.SayOfEntry(archive, pattern, error.text());
            return false;
        }
    return true;
}

bool SayUnused(const Run& run, const std::string& archive, const PatternList& list, const zarvo::patterns& patterns) {
    bool areUsed = true;
    for (size_t index = 0; index < list.patterns.size() && !run.output.IsClosed(); ++index)
        if (!patterns.is_used(index)) {
            SayUnmatched(run, archive, list.patterns[index]);
            areUsed = false;
        }
    return areUsed;
}

void SayUnmatched(const Run& run, const std::string& archive, const std::string& pattern) {
    run.SayOfEntry(archive, pattern, MakeMessage("matches nothing"));
}
