// Property: whatever the bytes are, the command makes one folder, beside the archive, and touches nothing else. After
// "All ok!", that folder contains exactly the files and folders that the archive lists, and the files have the bytes
// that another reader delivers.
#include "Fuzz/FuzzSupport.h"
#include "Runtime/Utilities/RegisterRuntimeInitializeAndCleanup.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"
#include "Tools/Extractor/Extractor.h"

#include <algorithm>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <set>
#include <string>
#include <sys/resource.h>
#include <unistd.h>

namespace {

namespace fs = std::filesystem;

constexpr rlim_t kMaxFileSize = 1 << 20;
constexpr UInt64 kPiece = 4'099; // differs from the command's, so that the reads differ
constexpr const char* kArchiveName = "a.zarvo";
constexpr const char* kOutputName = "a.zarvo_data";

// Returns the folder outer. outer/box becomes the working directory; outer/witness must stay as it is.
fs::path MakeWorkplace() {
    std::string pattern = (fs::is_directory("/dev/shm") ? "/dev/shm" : "/tmp") + std::string("/varnex-fuzz-XXXXXX");
    FuzzCheck(mkdtemp(pattern.data()) != nullptr);
    fs::create_directory(fs::path(pattern) / "box");
    fs::create_directory(fs::path(pattern) / "witness");
    FuzzCheck(chdir((fs::path(pattern) / "box").c_str()) == 0);

    // Writing past this limit fails as on a full disk.
    const rlimit limit{kMaxFileSize, kMaxFileSize};
    FuzzCheck(setrlimit(RLIMIT_FSIZE, &limit) == 0);
    signal(SIGXFSZ, SIG_IGN);

    static fs::path outer;
    outer = pattern;
    atexit([] {
        std::error_code ignored;
        fs::remove_all(outer, ignored);
    });
    GetFileSystem()->SetCurrentDirectory((outer / "box").c_str());
    RegisterRuntimeInitializeAndCleanup::ExecuteInitializations();
    SilenceConsole();
    return outer;
}

// Where a stored path leads, relative to the output folder. After "All ok!", no path has a component "..".
fs::path Place(const ArchiveStorageHeader::Node& node) {
    std::string path = node.path.c_str();
    std::replace(path.begin(), path.end(), '\\', '/');
    fs::path place;
    for (const fs::path& component : fs::path(path).relative_path())
        if (!component.empty() && component != ".") place /= component;
    return place;
}

void CheckFile(ArchiveStorageReader& reader, const ArchiveStorageHeader::Node& node, const fs::path& path) {
    FuzzCheck(fs::is_regular_file(path) && fs::file_size(path) == node.size);
    std::ifstream file(path, std::ios::binary);
    char expected[kPiece];
    char found[kPiece];
    UInt64 delivered = 0;
    for (UInt64 done = 0; done < node.size; done += delivered) {
        FuzzCheck(reader.Read(node.offset + done, std::min(node.size - done, kPiece), expected, &delivered));
        FuzzCheck(file.read(found, static_cast<std::streamsize>(delivered)).good());
        FuzzCheck(memcmp(expected, found, static_cast<size_t>(delivered)) == 0);
    }
}

void CheckOutput() {
    ArchiveStorageReader reader(kMemLabelFileSystem);
    FuzzCheck(reader.Initialize(core::string(kArchiveName), 0) == 0);
    FuzzCheck(reader.FindDirectory());

    std::map<fs::path, const ArchiveStorageHeader::Node*> files; // the last node counts when a path is listed twice
    std::set<fs::path> listed;
    for (const ArchiveStorageHeader::Node& node : reader.GetDirectoryInfo().nodes) {
        const bool isFolder = (node.flags & ArchiveStorageHeader::kNodeDirectory) != 0;
        if (!isFolder) files[Place(node)] = &node;
        for (fs::path place = Place(node); !place.empty(); place = place.parent_path())
            listed.insert(place);
    }
    std::set<fs::path> found;
    for (const fs::directory_entry& made : fs::recursive_directory_iterator(kOutputName)) {
        const fs::path place = made.path().lexically_relative(kOutputName);
        FuzzCheck(made.is_directory() != files.contains(place));
        found.insert(place);
    }
    FuzzCheck(found == listed);
    for (const auto& [place, node] : files)
        CheckFile(reader, *node, kOutputName / place);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    static const fs::path outer = MakeWorkplace();
    if (size > kMaxFileSize) return 0;
    FILE* archive = fopen(kArchiveName, "wb");
    FuzzCheck(archive != nullptr && fwrite(data, 1, size, archive) == size && fclose(archive) == 0);

    if (ExtractArchive(kArchiveName)) CheckOutput();

    FuzzCheck(fs::file_size(kArchiveName) == size);
    for (const fs::directory_entry& entry : fs::directory_iterator("."))
        FuzzCheck(entry.path().filename() == kArchiveName || entry.path().filename() == kOutputName);
    for (const fs::directory_entry& entry : fs::directory_iterator(outer))
        FuzzCheck(entry.path().filename() == "box" || entry.path().filename() == "witness");
    FuzzCheck(fs::is_empty(outer / "witness"));
    fs::remove_all(kOutputName);
    return 0;
}
