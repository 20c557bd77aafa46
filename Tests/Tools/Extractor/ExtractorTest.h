// What the transcript tests share: an archive becomes a file in an empty folder, the command runs there, and everything
// that it says, its status and the whole folder are compared with what is expected.
#pragma once

#include "Tests/Support/FolderTree.h"
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"
#include "Tools/ArchiveWriter/ArchiveWriter.h"

#include <cstring>
#include <gtest/gtest.h>
#include <random>
#include <string>
#include <vector>

inline const std::string kStarting = "Extracting file 'a.zarvo'...\n";
inline const std::string kCantRead = "ERROR: can't read or not a zarvo web file\n";
inline const std::string kNoHeader = "Unable to read header from archive file: a.zarvo\n" + kCantRead;
inline const std::string kNoDirectory = "ERROR: failed to parse files information\n";
inline const std::string kAllOk = "All ok!\n";
inline const std::string kWideCast = "Value cannot be stored by type cast target: exceeds maximum representable value. "
                                     "Result will be truncated.\n";

// Everything that a run says from its first line to its header's last.
inline std::string HeaderReport(UInt32 version, UInt64 size) {
    return kStarting + "  stream version: " + std::to_string(version) +
           "\n  zarvo version: 5.x.x\n  zarvo revision: 7041.3.0b12\n  data size: " + std::to_string(size) + " bytes\n";
}

// The whole of what a run says; messages are what follows the line on the output folder.
inline std::string Report(UInt32 version, UInt64 size, const std::string& messages = kAllOk) {
    return HeaderReport(version, size) + "  creating folder 'a.zarvo_data'\n" + messages;
}

// The line on a folder that the system refuses; only the macOS back end says why.
inline std::string FolderRefused(const std::string& path, [[maybe_unused]] int error,
                                 const std::string& currentDirectory) {
#ifdef VARNEX_WITH_OSX_BACK_END
    const std::string reason = strerror(error);
#else
    const std::string reason;
#endif
    return "CreateDirectory '" + path + "' failed: " + reason + " (current dir: " + currentDirectory + ")\n";
}

struct Outcome {
    Transcript transcript;
    FolderTree tree; // of the folder that the command ran in, without the archive
};

// Runs the command on an archive of these bytes in a folder, which may hold something already.
inline Outcome Extract(const TemporaryFolder& folder, const std::string& bytes, RunOptions options = {}) {
    const std::string path = folder / "a.zarvo";
    WriteFile(path, bytes);
    options.workingDirectory = folder.Path();
    Outcome outcome{RunVarnex({"a.zarvo"}, options), ReadFolderTree(folder.Path())};
    EXPECT_EQ(outcome.tree["a.zarvo"] == bytes, true) << "the archive was changed";
    outcome.tree.erase("a.zarvo");
    return outcome;
}

inline Outcome Extract(const std::string& bytes, const RunOptions& options = {}) {
    const TemporaryFolder folder;
    return Extract(folder, bytes, options);
}

// The tree that a run leaves: the output folder, what it holds, and the folders that its paths imply.
inline FolderTree OutputTree(const FolderTree& contents) {
    FolderTree tree = {{"a.zarvo_data", kFolder}};
    for (const auto& [path, content] : contents) {
        const std::string whole = "a.zarvo_data/" + path;
        for (size_t slash = whole.find('/'); slash != std::string::npos; slash = whole.find('/', slash + 1))
            tree[whole.substr(0, slash)] = kFolder;
        tree[whole] = content;
    }
    return tree;
}

inline FolderTree TreeOf(const std::vector<ArchiveEntry>& entries) {
    FolderTree contents;
    for (const ArchiveEntry& entry : entries)
        if (entry.listed) contents[entry.path] = (entry.flags & kFolderEntry) != 0 ? kFolder : entry.bytes;
    return OutputTree(contents);
}

// A function, not a macro: the caller says where and in which row it is by SCOPED_TRACE.
inline void ExpectOutcome(int status, const std::string& output, const FolderTree& tree, const Outcome& outcome) {
    EXPECT_EQ((Transcript{.status = status, .output = output}), outcome.transcript);
    EXPECT_EQ("", Differences(tree, outcome.tree));
}

// Bytes that no compressor makes smaller; the same for the same seed.
inline std::string Incompressible(size_t size, unsigned seed = 1) {
    std::mt19937 random(seed);
    std::string bytes(size, '\0');
    for (char& byte : bytes)
        byte = static_cast<char>(random() & 0xFF);
    return bytes;
}

// Bytes of which hardly anything is left when they are compressed.
inline std::string ExtremelyCompressible(size_t size) { return std::string(size, 'z'); }

// Bytes that become about half as many: runs of text between random bytes.
inline std::string Compressible(size_t size, unsigned seed = 1) {
    std::string bytes = Incompressible(size, seed);
    for (size_t index = 0; index < size; ++index)
        if (index / 64 % 2 == 0) bytes[index] = static_cast<char>('a' + index % 16);
    return bytes;
}

// A path of this length, in components that a file system takes.
inline std::string PathOfLength(size_t length) {
    std::string path;
    while (path.size() < length)
        path += path.size() % 200 == 199 && path.size() + 1 < length ? '/' : 'p';
    return path;
}
