#include "Tools/Zarvo/Selection.h"

#include "Tools/Zarvo/Text.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <iterator>
#include <new>
#include <unistd.h>

namespace {

// The lines of a file, of which the last may lack its end. nullopt and errno when it can't be read or takes more memory
// than there is, or when a signal has come.
std::optional<std::vector<std::string>> ReadLines(int descriptor, char end, const OutputBuffer& output) {
    try {
        std::string text;
        char piece[65'536];
        while (const ssize_t count = read(descriptor, piece, sizeof(piece))) {
            if (count > 0)
                text.append(piece, static_cast<size_t>(count));
            else if (errno != EINTR || output.HasSignal())
                return std::nullopt;
        }
        std::vector<std::string> lines;
        for (size_t from = 0; from < text.size();) {
            const size_t to = std::min(text.find(end, from), text.size());
            lines.push_back(text.substr(from, to - from));
            from = to + 1;
        }
        return lines;
    } catch (const std::bad_alloc&) {
        errno = ENOMEM;
        return std::nullopt;
    }
}

std::optional<std::vector<std::string>> ReadLines(const std::string& path, char end, const OutputBuffer& output) {
    const int descriptor = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (descriptor < 0) return std::nullopt;
    std::optional<std::vector<std::string>> lines = ReadLines(descriptor, end, output);
    const int error = errno;
    (void)close(descriptor); // it was only read
    errno = error;
    return lines;
}

} // namespace

PatternList ReadPatterns(const Run& run) {
    PatternList list;
    list.patterns.assign(run.GetOperands().begin() + 1, run.GetOperands().end());
    list.isEverything = list.patterns.empty() && !run.arguments.Has(kFilesFrom);
    const char end = run.arguments.Has(kNul) || run.arguments.Has(kNulInput) ? '\0' : '\n';
    for (const std::string& file : run.arguments.FindAll(kFilesFrom)) {
        auto lines = file == "-" ? ReadLines(run.input, end, run.output) : ReadLines(file, end, run.output);
        if (lines) {
            std::ranges::move(*lines, std::back_inserter(list.patterns));
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
