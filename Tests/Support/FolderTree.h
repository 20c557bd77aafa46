// A whole folder as a value, to be compared with what is expected in it.
//
//   EXPECT_EQ("", Differences({{"a", kFolder}, {"a/b.txt", "text"}}, ReadFolderTree(folder)));
#pragma once

#include <map>
#include <string>

// Paths below the folder, with "/" between components, and what each one is: a file's bytes, kFolder, "<link to ...>",
// or "<other>".
using FolderTree = std::map<std::string, std::string>;

inline const std::string kFolder = "<folder>";

// Everything below a folder; links are not followed. What can't be read is "<unreadable>", also the folder itself,
// under the path ".".
FolderTree ReadFolderTree(const std::string& folder);

// One line for each path that is missing, unexpected or different, at most 20 of them. Empty: the trees are equal.
std::string Differences(const FolderTree& expected, const FolderTree& actual);
