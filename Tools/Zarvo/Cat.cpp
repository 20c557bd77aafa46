#include "Tools/Zarvo/Progress.h"
#include "Tools/Zarvo/Run.h"
#include "Tools/Zarvo/Selection.h"
#include "Tools/Zarvo/Text.h"

#include <algorithm>
#include <functional>
#include <span>
#include <unordered_map>
#include <utility>

namespace {

// Finds the files that patterns choose: of those with equal normal forms the last one.
class FileFinder {
public:
    explicit FileFinder(const zarvo::archive& archive) : m_Archive(archive) {
        for (const zarvo::entry entry : archive.entries())
            if (entry.problem() != ZARVO_PROBLEM_NONE) {
                m_Problems.push_back(entry.index());
                m_LastProblem[zarvo::normalize_path(entry.path())] = entry.index();
            }
    }

    // Appends the indices of the files that one pattern chooses, in the archive's order. *isMatched says whether it has
    // matched anything; unchanged where not.
    zarvo::error Find(const std::string& pattern, std::vector<uint64_t>& files, bool* isMatched) const {
        const size_t before = files.size();
        zarvo::patterns matcher;
        if (zarvo::error error = matcher.add(pattern)) return error;
        // A path without globs is looked up, so that many of them don't cost a walk over all entries each. What the
        // tree of items does not hold is matched.
        if (IsPlainPath(pattern)) {
            if (zarvo::result<uint64_t> item = m_Archive.find(pattern)) {
                *isMatched = true;
                if (zarvo::error error = CollectBelow(*item, files)) return error;
            } else if (item.error().code() != ZARVO_ERROR_NOT_FOUND) {
                return std::move(item).error();
            }
            for (const uint64_t index : m_Problems)
                if (zarvo::error error = Match(matcher, m_Archive.entries()[index], files, isMatched)) return error;
        } else {
            for (const zarvo::entry entry : m_Archive.entries())
                if (zarvo::error error = Match(matcher, entry, files, isMatched)) return error;
        }
        const auto found = files.begin() + static_cast<std::ptrdiff_t>(before);
        std::sort(found, files.end());
        files.erase(std::unique(found, files.end()), files.end()); // of equal names, the last has come for each
        return {};
    }

private:
    // In whatever form: names are compared by component. Not what stands for everything, which is nothing in an empty
    // archive.
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

    zarvo::error Match(zarvo::patterns& matcher, const zarvo::entry& entry, std::vector<uint64_t>& files,
                       bool* isMatched) const {
        if (!matcher.match(entry.path())) return {};
        *isMatched = true;
        if (!entry.is_file()) return {};
        if (entry.problem() != ZARVO_PROBLEM_NONE) {
            files.push_back(m_LastProblem.at(zarvo::normalize_path(entry.path())));
            return {};
        }
        zarvo::result<uint64_t> last = m_Archive.find(entry.path());
        if (!last) return std::move(last).error();
        files.push_back(*last);
        return {};
    }

    const zarvo::archive& m_Archive;
    std::vector<uint64_t> m_Problems; // of entries with a problem, which are in no folder, the indices
    std::unordered_map<std::string, uint64_t> m_LastProblem; // of them, by normal form
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
