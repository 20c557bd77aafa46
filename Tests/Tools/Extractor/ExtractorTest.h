// What the tests of the command share. A line of words becomes an archive in a folder, and the command runs there. Its
// status, everything that it prints and the whole folder are compared with what other words describe.
//
//   Expect({.archive = "web levels=2 a/b:c70000"});   // everything is extracted
//   Expect({.archive = "node[0].offset=9 a:c10",      // "a" can't be decompressed, and stays empty
//           .messages = "data:a",
//           .output = "a:"});
#pragma once

#include "Tests/Support/ArchiveBuilder.h"
#include "Tests/Support/FolderTree.h"
#include "Tests/Support/RunVarnex.h"
#include "Tests/Support/TemporaryFolder.h"

#include <algorithm>
#include <cstring>
#include <random>
#include <sstream>

namespace fs = std::filesystem;

// What the command prints, by word. A word with a path, "file:a", stands for the text and the path.
inline const std::map<std::string, std::string> kMessages = {
    {"ok", "All ok!"},
    {"unread", "ERROR: can't read or not a zarvo web file"},
    {"nodirectory", "ERROR: failed to parse files information"},
    {"folder", "ERROR: failed to create directory "},
    {"file", "ERROR: failed to create file "},
    {"data", "ERROR: failed to decompress file "},
    {"write", "ERROR: failed to write file "},
    {"refused", "CreateDirectory '"},
    {"unopened", "Unable to open archive file: "},
    {"noheader", "Unable to read header from archive file: "},
    {"unsupported", "Decompressing this format (4) is not supported on this platform."},
    {"unknown", "Assertion failed on expression: 't < kCompressionCount'"},
    {"unstarted", "Decompressor's stream must be initialized!"},
    {"toolarge", "Lz4 doesn't support input or output data size > INT_MAX"},
    {"pastend", "Assertion failed on expression: 'position + size <= m_EndPos'"},
    {"twosizes", "Archive file has invalid uncompressed header size!"},
    {"toowide", "Value cannot be stored by type cast target: exceeds maximum representable value. "
                "Result will be truncated."}};

// The text for words, up to a ";". "refused:/a" is the system's refusal to make a folder: only the macOS back end gives
// a reason.
inline std::string Say(const std::string& words, const std::string& folder = "") {
    const bool hasReason = std::string(VARNEX_BINARY).ends_with("OSXBackEnd");
    std::istringstream stream(words);
    std::string text;
    for (std::string word; stream >> word && word != ";";) {
        const std::string kind = word.substr(0, word.find(':')),
                          path = kind == word ? "" : word.substr(kind.size() + 1);
        const std::string reason = hasReason ? strerror(path.size() > 255 ? ENAMETOOLONG : EACCES) : "";
        text += kMessages.at(kind) + path +
                (kind == "refused" ? "' failed: " + reason + " (current dir: " + folder + ")\n" : "\n");
    }
    return text;
}

// "c70000" is 70,000 bytes that compress to half their size, "r70000" bytes that don't compress, "z70000" bytes that
// compress to almost nothing. A smaller number gives the start of the same bytes. "r70000@5000@10" is 10 of them, from
// 5,000 on. Other words stand for themselves.
inline std::string Bytes(const std::string& word) {
    char kind;
    size_t size, from = 0, count = std::string::npos;
    if (sscanf(word.c_str(), "%c%zu@%zu@%zu", &kind, &size, &from, &count) < 2) return word;
    std::string bytes(size, 'z');
    std::mt19937 random;
    for (size_t index = 0; index < size && kind != 'z'; ++index)
        bytes[index] = static_cast<char>(kind == 'c' && index / 64 % 2 == 0 ? 'a' + index % 16 : random());
    return bytes.substr(from, count);
}

// The files ("a/b:c70000", with the bytes after the colon) and folders ("a|") among words. The file "?" is not listed
// in the directory.
inline std::vector<ArchiveEntry> Entries(const std::string& words) {
    std::vector<ArchiveEntry> entries;
    std::istringstream stream(words);
    for (std::string word; stream >> word;)
        if (const size_t mark = word.find_first_of(":|"); mark != std::string::npos) {
            entries.push_back({.path = word.substr(0, mark), .bytes = Bytes(word.substr(mark + 1))});
            entries.back().flags = word[mark] == '|' ? kFolderEntry : 0;
            entries.back().listed = word[0] != '?';
        }
    return entries;
}

// An archive in words: its entries, its layout ("web6" is the block-based one under the older signature), the kind of
// its blocks, "section" when the section is of that kind too, an option, and name=value: version, chunk, levels, or the
// value of a stored field.
inline ArchiveDescription Archive(const std::string& words, ArchiveDescription archive = {}) {
    const std::string layouts[] = {"fs", "web6", "web", "raw", "old"}, kinds[] = {"stored", "lzma", "lz4", "lz4hc"};
    const std::string options[] = {"streamed", "endmark", "end", "padded"};
    bool* const set[] = {&archive.streamed, &archive.lzma.endMark, &archive.sectionAtEnd, &archive.sectionPadded};
    archive.entries = Entries(words);
    std::istringstream stream(words);
    for (std::string word; stream >> word;) {
        if (word.find_first_of(":|") != std::string::npos) continue;
        const std::string name = word.substr(0, word.find('='));
        const UInt64 value = name == word ? 0 : std::stoull(word.substr(name.size() + 1), nullptr, 0);
        const auto layout = std::find(layouts, std::end(layouts), word), kind = std::find(kinds, std::end(kinds), word);
        const auto option = std::find(options, std::end(options), word);
        const bool isLayout = layout != std::end(layouts), isKind = kind != std::end(kinds);
        if (isLayout) archive.layout = static_cast<ArchiveLayout>(layout - layouts);
        if (isKind) archive.type = static_cast<CompressionType>(kind - kinds);
        if (word == "section") archive.sectionType = archive.type;
        if (option != std::end(options)) *set[option - options] = true;
        if (name == "version") archive.version = static_cast<UInt32>(value);
        if (name == "levels") archive.levelCount = static_cast<UInt32>(value);
        if (name == "chunk") archive.chunkSize = value;
        const bool isOption = option != std::end(options) || word == "section" || name != word;
        if (!isLayout && !isKind && !isOption) ADD_FAILURE() << "no such word: " << word;
        if (name != word && name != "version" && name != "levels" && name != "chunk") archive.fields[name] = value;
    }
    return archive;
}

// The tree of an output folder that holds the entries. An empty path stands for the folder itself, which is listed too
// when there are no entries.
inline FolderTree Output(const std::vector<ArchiveEntry>& entries, const std::string& folder = "a.zarvo_data") {
    FolderTree tree;
    for (const auto& [path, bytes, flags, isListed] : entries)
        if (isListed) tree[path.empty() ? folder : folder + "/" + path] = flags != 0 ? kFolder : Brief(bytes);
    return tree.empty() ? FolderTree{{folder, kFolder}} : tree;
}

struct Case {
    std::string archive = {};     // words for Archive
    std::string messages = "ok";  // words for Say; those before a ";" are printed before the header
    std::string output = "all";   // words for Entries, "all" entries of the archive, or "none": no output folder
    ArchiveDescription form = {}; // what words can't say about the archive
    std::string folder = {};      // to run in; a fresh one by default
    std::string path = "a.zarvo";
    std::function<bool()> prepare = {}; // see RunProgram
    bool isHeard = true;                // false: nobody reads the standard output
    std::string program = VARNEX_BINARY;
    std::function<void(std::string& bytes)> change = {}; // damages the archive
};

inline void Expect(const Case& run) {
    SCOPED_TRACE(run.archive + " at " + run.path);
    const ArchiveDescription archive = Archive(run.archive, run.form);
    std::string bytes = BuildArchive(archive).bytes;
    const TemporaryFolder empty;
    const std::string folder = run.folder.empty() ? empty.Path() : run.folder;

    const size_t layout = static_cast<size_t>(archive.layout);
    const UInt32 version = archive.version.value_or(std::array{7u, 6u, 3u, 3u, 5u}[layout]);
    const bool isLegacy = archive.layout == ArchiveLayout::kWeb || archive.layout == ArchiveLayout::kRaw;
    const bool hasSize = isLegacy ? version > 1 : archive.layout != ArchiveLayout::kArchive;
    const size_t size = hasSize ? bytes.size() : 0;
    const bool isRead = !run.messages.ends_with("unread"), isListed = isRead && !run.messages.ends_with("nodirectory");
    const size_t early = run.messages.find(';') + 1;
    std::ostringstream said;
    said << "Extracting file '" << run.path << "'...\n" << Say(run.messages.substr(0, early));
    if (isRead)
        said << "  stream version: " << version << "\n  zarvo version: " << archive.engineVersion
             << "\n  zarvo revision: " << archive.engineRevision << "\n  data size: " << size << " bytes\n";
    if (isListed) said << "  creating folder '" << run.path << "_data'\n";
    said << Say(run.messages.substr(early), folder);

    if (run.change) run.change(bytes);
    const fs::path file = fs::path(folder) / run.path;
    fs::create_directories(file.parent_path());
    WriteFile(file, bytes);
    const Transcript expected(run.messages.ends_with("ok") ? 0 : 1, run.isHeard ? said.str() : "");
    EXPECT_EQ(expected, RunProgram(run.program.c_str(), {run.path}, folder, run.prepare));
    const std::string name = file.lexically_normal().lexically_relative(folder);
    FolderTree tree;
    if (isListed && run.output != "none")
        tree = Output(run.output == "all" ? archive.entries : Entries(run.output), name + "_data");
    tree[name] = Brief(bytes);
    EXPECT_EQ(tree, ReadFolderTree(folder));
}
