#include "Tools/Zarvo/Run.h"

#include "Tools/Zarvo/Text.h"

#include <algorithm>
#include <fstream>
#include <limits>

namespace {

// What "--memory" says; 0 when it isn't given.
uint64_t FindMemory(const Arguments& arguments) {
    const std::string* const memory = arguments.Find(kMemory);
    return memory != nullptr ? *ParseSize(*memory) : 0;
}

// What it then is: half of the memory that programs may take without others being moved out. The library finds that out
// for runs, but an archive that is only read from is opened with the number.
uint64_t GetDefaultMemory() {
    std::ifstream file("/proc/meminfo");
    std::string name;
    for (uint64_t kibibytes = 0; file >> name >> kibibytes;) {
        if (name == "MemAvailable:") return kibibytes * 1'024 / 2;
        file.ignore(std::numeric_limits<std::streamsize>::max(), '\n');
    }
    return uint64_t{1} << 30; // where there is no such file
}

} // namespace

// A block in memory is held twice: as it is stored and as it is decoded.
uint64_t Run::GetMaxBlockBytes() const {
    const uint64_t memory = FindMemory(arguments);
    return std::max<uint64_t>((memory != 0 ? memory : GetDefaultMemory()) / 2, 1);
}

int RefuseUsage(Console& console, const Subcommand& subcommand, std::string_view complaint) {
    const std::string name(subcommand.name);
    console.Say(MakeMessage("%; see '%'", {complaint, "zarvo " + name + (name.empty() ? "" : " ") + "--help"}));
    return kWrongUsage;
}

std::optional<zarvo::archive> Run::OpenArchive(const std::string& path) const {
    return OpenArchive(path, GetMaxBlockBytes(), [this, path](std::string_view text) { console.Say(path, text); });
}

std::optional<zarvo::archive> Run::OpenArchive(const std::string& path, uint64_t maxBlockBytes,
                                               std::function<void(std::string_view text)> log) const {
    if (RefuseStream(path)) return std::nullopt;
    zarvo::open_options options;
    options.max_block_bytes = maxBlockBytes;
    options.log = std::move(log);
    zarvo::result<zarvo::archive> archive = zarvo::archive::open(path, std::move(options));
    if (!archive) {
        console.Say(path, archive.error().text());
        return std::nullopt;
    }
    return *std::move(archive);
}

bool Run::RefuseStream(const std::string& path) const {
    if (path != "-") return false;
    console.Say(path,
                MakeMessage("an archive must be a file that can be read at any place (a file of this name is ./-)"));
    return true;
}

zarvo::run_options Run::MakeOptions(Progress& progress) const {
    zarvo::run_options options;
    if (const std::string* const threads = arguments.Find(kThreads))
        options.threads = static_cast<uint32_t>(std::stoul(*threads));
    options.memory = FindMemory(arguments);
    options.progress = [this, &progress](const zarvo_progress& at) {
        output.Flush(); // a reader gets results while they come, and one that has gone is missed
        progress.Update({.bytes = at.bytes, .files = at.files}, {.bytes = at.bytes_total, .files = at.files_total});
        return !output.IsAbandoned();
    };
    return options;
}

void Run::WritePath(std::string_view path, bool isFolder, std::string_view end) const {
    if (output.IsTerminal()) console.WipeProgress(); // which is there, too
    output.WriteText(path);
    if (isFolder && !path.ends_with('/')) output.Write("/");
    output.Write(end);
}

void Run::SayOfEntry(const std::string& archive, std::string_view entry, std::string_view text) const {
    console.Say(archive + ": " + QuoteEmpty(entry), text);
}
