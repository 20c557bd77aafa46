// What lies below a folder, in a form that tests compare and print.
//
//   EXPECT_EQ((FolderTree{{"a/b", "text"}, {"empty", kFolder}}), ReadFolderTree(folder / "out"));
#pragma once

#include "Tests/Support/TemporaryFolder.h"

#include <functional>
#include <map>
#include <string>

// Maps each path below a folder to what it is: a file's bytes (or Brief of them), a link's target, or kFolder for an
// empty folder. Other folders are not listed.
using FolderTree = std::map<std::string, std::string>;

inline const std::string kFolder = "<folder>";

// The bytes, or their number and a hash when there are many.
inline std::string Brief(const std::string& bytes) {
    if (bytes.size() < 100) return bytes;
    return std::to_string(bytes.size()) + " bytes, " + std::to_string(std::hash<std::string>()(bytes));
}

inline FolderTree ReadFolderTree(const std::string& folder) {
    namespace fs = std::filesystem;
    FolderTree tree;
    for (const auto& entry : fs::recursive_directory_iterator(folder)) {
        const bool isLink = entry.is_symlink(), isFolder = entry.is_directory() && !isLink;
        const std::string path = entry.path(), name = path.substr(folder.size() + 1);
        if (!isFolder || fs::is_empty(path))
            tree[name] = isLink ? fs::read_symlink(path).string() : isFolder ? kFolder : Brief(ReadFile(path));
    }
    return tree;
}
