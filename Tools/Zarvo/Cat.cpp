#include "Tools/Zarvo/Progress.h"
#include "Tools/Zarvo/Run.h"
#include "Tools/Zarvo/Selection.h"
#include "Tools/Zarvo/Text.h"

#include <algorithm>
#include <compare>
#include <functional>
#include <span>
#include <utility>

namespace {

// Finds the files that patterns choose: of those with equal normal forms the last one.
class FileFinder {
public:
    explicit FileFinder(const zarvo::archive& archive) : m_Archive(archive) {
        for (const zarvo::entry entry : archive.entries())
            if (entry.problem() != ZARVO_PROBLEM_NONE)
                m_Problems.push_back({zarvo::normalize_path(entry.path()), entry.index()});
        std::sort(m_Problems.begin(), m_Problems.end());
    }

    // Appends the indices of the files that one pattern chooses, in the archive's order. *isMatched becomes true if it
    // matches anything.
    zarvo::error Find(const std::string& pattern, std::vector<uint64_t>& files, bool* isMatched) const {
        const size_t before = files.size();
        // A path without globs is looked up, so that many of them don't cost a walk over all entries each. Entries with
        // problems are not in the tree of items, but in a sorted list.
        if (IsPlainPath(pattern)) {
            if (zarvo::result<uint64_t> item = m_Archive.find(pattern)) {
                *isMatched = true;
                if (zarvo::error error = CollectBelow(*item, files)) return error;
            } else if (item.error().code() != ZARVO_ERROR_NOT_FOUND) {
                return std::move(item).error();
            }
            const std::string path = zarvo::normalize_path(pattern);
            CollectProblems(path, path + '\0', files, isMatched);
            CollectProblems(path + '/', path + char('/' + 1), files, isMatched);
        } else {
            zarvo::patterns matcher;
            if (zarvo::error error = matcher.add(pattern)) return error;
            for (const zarvo::entry entry : m_Archive.entries())
                if (zarvo::error error = Match(matcher, entry, files, isMatched)) return error;
        }
        const auto found = files.begin() + static_cast<std::ptrdiff_t>(before);
        std::sort(found, files.end());
        files.erase(std::unique(found, files.end()), files.end()); // of equal names, the last has come for each
        return {};
    }

private:
    // Whether a pattern is a path without globs. One that stands for everything is none: it matches nothing in an empty
    // archive, where the root is found.
    static bool IsPlainPath(const std::string& pattern) {
        return pattern.find_first_of("*?[\\") == std::string::npos && !zarvo::normalize_path(pattern).empty();
    }

    // Appends the files at and below an item.
    zarvo::error CollectBelow(uint64_t top, std::vector<uint64_t>& files) const {
        std::vector<uint64_t> ahead = {top};
        while (!ahead.empty()) {
            const uint64_t index = ahead.back();
            ahead.pop_back();
            zarvo::result<zarvo_item> item = m_Archive.item(index);
            if (!item) return std::move(item).error();
            if (item->kind == ZARVO_FILE) files.push_back(index);
            for (uint64_t child = item->first_child; child != ZARVO_NO_ITEM;) {
                ahead.push_back(child);
                zarvo::result<zarvo_item> sibling = m_Archive.item(child);
                if (!sibling) return std::move(sibling).error();
                child = sibling->next_sibling;
            }
        }
        return {};
    }

    // An entry with a problem, which is in no folder.
    struct Problem {
        std::string path; // in normal form
        uint64_t index;

        auto operator<=>(const Problem&) const = default;
    };

    // Appends the files among the problems whose paths are from one text on and before another.
    void CollectProblems(const std::string& from, const std::string& to, std::vector<uint64_t>& files,
                         bool* isMatched) const {
        const auto end = std::lower_bound(m_Problems.begin(), m_Problems.end(), Problem{to, 0});
        for (auto at = std::lower_bound(m_Problems.begin(), end, Problem{from, 0}); at != end; ++at) {
            *isMatched = true;
            const bool isLast = at + 1 == m_Problems.end() || (at + 1)->path != at->path;
            if (isLast && m_Archive.entries()[at->index].is_file()) files.push_back(at->index);
        }
    }

    zarvo::error Match(zarvo::patterns& matcher, const zarvo::entry& entry, std::vector<uint64_t>& files,
                       bool* isMatched) const {
        if (!matcher.match(entry.path())) return {};
        *isMatched = true;
        if (!entry.is_file()) return {};
        if (entry.problem() != ZARVO_PROBLEM_NONE) {
            const Problem after = {zarvo::normalize_path(entry.path()), UINT64_MAX};
            files.push_back((std::lower_bound(m_Problems.begin(), m_Problems.end(), after) - 1)->index);
            return {};
        }
        zarvo::result<uint64_t> last = m_Archive.find(entry.path());
        if (!last) return std::move(last).error();
        files.push_back(*last);
        return {};
    }

    const zarvo::archive& m_Archive;
    std::vector<Problem> m_Problems; // sorted
};

// Why there is no file of this name, or an empty text.
std::string GetRefusal(const zarvo::entry& entry) {
    if (entry.problem() == ZARVO_PROBLEM_EMPTY) return MakeMessage("the path is empty");
    if (entry.problem() == ZARVO_PROBLEM_SEPARATOR) return MakeMessage("the path of a file ends with a separator");
    return "";
}

// Writes one file. Returns what stopped that before its end; what lies before has been written.
zarvo::error WriteFile(zarvo::archive& archive, const zarvo::entry& entry, std::span<std::byte> buffer,
                       OutputBuffer& output, const std::function<void(size_t)>& tell) {
    zarvo::result<zarvo::stream> stream = archive.open_stream(entry.index());
    if (!stream) return std::move(stream).error();
    while (!output.IsClosed()) {
        zarvo::read_result read = stream->read(buffer);
        output.Write({reinterpret_cast<const char*>(buffer.data()), read.count});
        tell(read.count);
        if (read.error || read.count == 0) return std::move(read.error);
    }
    return {};
}

} // namespace

int RunCat(const Run& run) {
    const std::string& path = run.GetOperands()[0];
    std::optional<zarvo::archive> archive = run.OpenArchive(path);
    if (!archive) return kNoArchive;
    const PatternList list = ReadPatterns(run);
    int status = list.isComplete ? kAllDone : kSomethingWrong;

    const FileFinder finder(*archive);
    std::vector<uint64_t> files;
    for (const std::string& pattern : list.patterns) {
        if (run.output.IsClosed()) return status;
        bool isMatched = false;
        if (const zarvo::error error = finder.Find(pattern, files, &isMatched)) {
            run.SayOfEntry(path, pattern, error.text());
            status = kSomethingWrong;
        } else if (!isMatched) {
            SayUnmatched(run, path, pattern);
            status = kSomethingWrong;
        }
    }

    Amount total = {.bytes = 0, .files = files.size()}, done;
    for (const uint64_t index : files)
        total.bytes += archive->entries()[index].size();
    Progress progress(run.arguments, run.console, !run.output.IsTerminal());
    const auto tell = [&](size_t count) {
        done.bytes += count;
        progress.Update(done, total);
    };
    constexpr size_t kPieceSize = 1 << 20;
    std::vector<std::byte> buffer(kPieceSize);
    for (const uint64_t index : files) {
        if (run.output.IsClosed()) break;
        const zarvo::entry entry = archive->entries()[index];
        if (const std::string refusal = GetRefusal(entry); !refusal.empty()) {
            run.SayOfEntry(path, entry.path(), refusal);
            status = kSomethingWrong;
        } else if (const zarvo::error error = WriteFile(*archive, entry, buffer, run.output, tell)) {
            run.SayOfEntry(path, entry.path(), error.text());
            status = kSomethingWrong;
        }
        ++done.files;
    }
    return status;
}
