#include "Tests/Support/FolderTree.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <sstream>

namespace {

const std::string kUnreadable = "<unreadable>";

std::string ReadContents(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    if (!file.is_open()) return kUnreadable;
    return std::string(std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>());
}

std::string Describe(const std::filesystem::directory_entry& entry) {
    std::error_code error;
    if (entry.is_symlink(error)) return "<link to " + std::filesystem::read_symlink(entry.path(), error).string() + ">";
    if (entry.is_directory(error)) return kFolder;
    if (entry.is_regular_file(error)) return ReadContents(entry.path().string());
    return "<other>";
}

// What a reader of a failure needs to know of a file's bytes.
std::string Summary(const std::string& bytes) {
    constexpr size_t kShown = 40;
    if (bytes.size() <= kShown && std::all_of(bytes.begin(), bytes.end(), [](char c) { return c >= ' ' && c <= '~'; }))
        return "\"" + bytes + "\"";
    return std::to_string(bytes.size()) + " bytes";
}

} // namespace

FolderTree ReadFolderTree(const std::string& folder) {
    FolderTree tree;
    std::error_code error;
    std::filesystem::recursive_directory_iterator entry(folder, error), end;
    for (; !error && entry != end; entry.increment(error))
        tree[entry->path().string().substr(folder.size() + 1)] = Describe(*entry);
    if (error) tree["."] = kUnreadable;
    return tree;
}

std::string Differences(const FolderTree& expected, const FolderTree& actual) {
    constexpr int kMostLines = 20;
    std::ostringstream lines;
    std::set<std::string> paths;
    for (const FolderTree* tree : {&expected, &actual})
        for (const auto& [path, content] : *tree)
            paths.insert(path);

    int count = 0;
    for (const std::string& path : paths) {
        const auto wanted = expected.find(path), found = actual.find(path);
        if (wanted != expected.end() && found != actual.end() && wanted->second == found->second) continue;
        if (++count > kMostLines) continue;
        if (found == actual.end()) {
            lines << path << ": missing\n";
        } else if (wanted == expected.end()) {
            lines << path << ": unexpected, " << Summary(found->second) << "\n";
        } else {
            const size_t shorter = std::min(wanted->second.size(), found->second.size());
            const auto mismatch =
                std::mismatch(wanted->second.begin(), wanted->second.begin() + static_cast<std::ptrdiff_t>(shorter),
                              found->second.begin());
            lines << path << ": " << Summary(found->second) << " instead of " << Summary(wanted->second)
                  << ", different from byte " << mismatch.first - wanted->second.begin() << "\n";
        }
    }
    if (count > kMostLines) lines << "and " << count - kMostLines << " more\n";
    return lines.str();
}
