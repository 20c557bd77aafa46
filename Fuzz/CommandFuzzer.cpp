// Property: whatever the bytes are, the command makes one folder, beside the archive, and touches nothing else.
#include "Fuzz/FuzzSupport.h"
#include "Runtime/Utilities/RegisterRuntimeInitializeAndCleanup.h"
#include "Tools/Extractor/Extractor.h"

#include <csignal>
#include <cstring>
#include <filesystem>
#include <string>
#include <sys/resource.h>
#include <unistd.h>

namespace {

namespace fs = std::filesystem;

constexpr rlim_t kMaxFileSize = 1 << 20;
constexpr const char* kArchiveName = "a.zarvo";
constexpr const char* kOutputName = "a.zarvo_data";

// outer/box is the working directory; outer/witness stands for everything else.
fs::path MakeWorkplace() {
    std::string pattern = (fs::is_directory("/dev/shm") ? "/dev/shm" : "/tmp") + std::string("/varnex-fuzz-XXXXXX");
    FuzzCheck(mkdtemp(pattern.data()) != nullptr);
    fs::create_directory(fs::path(pattern) / "box");
    fs::create_directory(fs::path(pattern) / "witness");
    FuzzCheck(chdir((fs::path(pattern) / "box").c_str()) == 0);

    // Output that grows out of hand fails as on a full disk.
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

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    static const fs::path outer = MakeWorkplace();
    if (size > kMaxFileSize) return 0;
    FILE* archive = fopen(kArchiveName, "wb");
    FuzzCheck(archive != nullptr && fwrite(data, 1, size, archive) == size && fclose(archive) == 0);

    (void)ExtractArchive(kArchiveName); // any answer is right

    FuzzCheck(fs::file_size(kArchiveName) == size);
    for (const fs::directory_entry& entry : fs::directory_iterator("."))
        FuzzCheck(entry.path().filename() == kArchiveName || entry.path().filename() == kOutputName);
    for (const fs::directory_entry& entry : fs::directory_iterator(outer))
        FuzzCheck(entry.path().filename() == "box" || entry.path().filename() == "witness");
    FuzzCheck(fs::is_empty(outer / "witness"));
    fs::remove_all(kOutputName);
    return 0;
}
