// Measures the operations that every extraction is made of (Google Benchmark). A row named "...Floor" does the same
// with only the standard library or the system. Every result is checked.
#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Utilities/FileUtilities.h"
#include "Runtime/Utilities/PathNameUtility.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"
#include "Tests/Support/ArchiveBuilder.h"

#include <benchmark/benchmark.h>
#include <cstdlib>
#include <cstring>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace {

constexpr UInt64 kBlockSize = 131'072;
constexpr UInt64 kBlocks = 64;

// An archive in a file, which is removed at the end of the scope.
class TemporaryArchive {
public:
    explicit TemporaryArchive(const ArchiveDescription& description) {
        close(mkstemp(m_Path));
        WriteArchive(description, m_Path);
    }
    ~TemporaryArchive() { unlink(m_Path); }
    const char* Path() const { return m_Path; }

private:
    char m_Path[32] = "/tmp/varnex-benchmark-XXXXXX";
};

// ---- directories ----

ArchiveDescription MakeDirectory(ArchiveLayout layout, CompressionType sectionType, UInt64 count) {
    ArchiveDescription description;
    description.layout = layout;
    description.sectionType = sectionType;
    for (UInt64 index = 0; index < count; ++index)
        description.entries.push_back(
            {.path = "folder" + std::to_string(index / 1'000) + "/file" + std::to_string(index) + ".txt"});
    description.entries.back().bytes = "the legacy layouts must have data";
    return description;
}

void ParseDirectory(benchmark::State& state, ArchiveLayout layout, CompressionType sectionType) {
    const auto count = static_cast<UInt64>(state.range(0));
    const ArchiveDescription description = MakeDirectory(layout, sectionType, count);
    const TemporaryArchive archive(description);
    const std::string& lastPath = description.entries.back().path;
    for (auto pass : state) {
        ArchiveStorageReader reader(kMemLabelFileSystem);
        if (reader.Initialize(core::string(archive.Path()), 0) != 0 ||
            reader.GetDirectoryInfo().nodes.size() != count ||
            !(reader.GetDirectoryInfo().nodes.back().path == lastPath.c_str()))
            return state.SkipWithError("the directory came out wrong");
    }
    state.SetItemsProcessed(state.iterations() * state.range(0));
}
BENCHMARK_CAPTURE(ParseDirectory, BlockBased, ArchiveLayout::kBlockBased, kCompressionNone)
    ->Arg(1'000'000)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(ParseDirectory, BlockBasedLz4HC, ArchiveLayout::kBlockBased, kCompressionLz4HC)
    ->Arg(1'000'000)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(ParseDirectory, Raw, ArchiveLayout::kRaw, kCompressionNone)
    ->Arg(1'000'000)
    ->Unit(benchmark::kMillisecond);
BENCHMARK_CAPTURE(ParseDirectory, Archive, ArchiveLayout::kArchive, kCompressionNone)
    ->Arg(1'000'000)
    ->Unit(benchmark::kMillisecond);

// ---- reads ----

// Text that can be compressed.
std::string MakeText(UInt64 size) {
    std::string text;
    for (UInt64 seed = 1; text.size() < size; seed = seed * 6364136223846793005u + 1442695040888963407u)
        text += "line " + std::to_string(seed >> 40) + " of the text\n";
    text.resize(size);
    return text;
}

struct ReadForm {
    CompressionType type;
    bool streamed = false;
};

// Reads size bytes at 0, step, 2 * step and so on. A step of a block's size makes each read the first of its block. A
// streamed block is read on, with a step of size. With a step of 0 the block is in the cache.
void ReadRange(benchmark::State& state, ReadForm form, UInt64 size, UInt64 step) {
    const std::string text = MakeText(kBlocks * kBlockSize);
    ArchiveDescription description;
    description.entries = {{.path = "a", .bytes = text}};
    description.chunkSize = form.streamed ? 0 : kBlockSize;
    description.type = form.type;
    description.streamed = form.streamed;
    const TemporaryArchive archive(description);
    ArchiveStorageReader reader(kMemLabelFileSystem);
    if (reader.Initialize(core::string(archive.Path()), 0) != 0) return state.SkipWithError("no archive");

    std::vector<char> bytes(size);
    UInt64 from = 0;
    for (auto pass : state) {
        UInt64 count = 0;
        const bool isRead = reader.Read(from, size, bytes.data(), &count);
        if (!isRead || count != size || memcmp(bytes.data(), text.data() + from, size) != 0)
            return state.SkipWithError("the range came out wrong");
        from += step;
        if (from + size > text.size()) from = 0;
    }
    state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(size));
}
constexpr UInt64 kPart = 65'536;
BENCHMARK_CAPTURE(ReadRange, PartOfStored, ReadForm{kCompressionNone}, kPart, kBlockSize);
BENCHMARK_CAPTURE(ReadRange, PartOfLz4HC, ReadForm{kCompressionLz4HC}, kPart, kBlockSize);
BENCHMARK_CAPTURE(ReadRange, PartOfLzma, ReadForm{kCompressionLzma}, kPart, kBlockSize);
BENCHMARK_CAPTURE(ReadRange, NextOfStreamed, ReadForm{kCompressionLzma, true}, kPart, kPart);
BENCHMARK_CAPTURE(ReadRange, WholeStored, ReadForm{kCompressionNone}, kBlockSize, kBlockSize);
BENCHMARK_CAPTURE(ReadRange, WholeLz4HC, ReadForm{kCompressionLz4HC}, kBlockSize, kBlockSize);
BENCHMARK_CAPTURE(ReadRange, WholeLzma, ReadForm{kCompressionLzma}, kBlockSize, kBlockSize);
BENCHMARK_CAPTURE(ReadRange, AcrossTwoLz4HC, ReadForm{kCompressionLz4HC}, kBlockSize + 1, kBlockSize);
BENCHMARK_CAPTURE(ReadRange, CacheHitOf64KiB, ReadForm{kCompressionLz4HC}, kPart, 0);
BENCHMARK_CAPTURE(ReadRange, CacheHitOf16Bytes, ReadForm{kCompressionLz4HC}, 16, 0);
BENCHMARK_CAPTURE(ReadRange, StoredOf16Bytes, ReadForm{kCompressionNone}, 16, 0);

void CopyFloor(benchmark::State& state) {
    const std::string text = MakeText(kPart);
    std::vector<char> bytes(kPart);
    for (auto pass : state) {
        memcpy(bytes.data(), text.data(), kPart);
        if (memcmp(bytes.data(), text.data(), kPart) != 0) return state.SkipWithError("wrong");
    }
    state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(kPart));
}
BENCHMARK(CopyFloor);

// ---- containers ----

template <typename String>
void AppendToString(benchmark::State& state) {
    constexpr size_t kPieces = 10'000;
    for (auto pass : state) {
        String text;
        for (size_t index = 0; index < kPieces; ++index)
            text.append("sixteen letters.", 16);
        if (text.size() != kPieces * 16) return state.SkipWithError("wrong size");
        benchmark::DoNotOptimize(text.data());
    }
    state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(kPieces * 16));
}
void StringAppend(benchmark::State& state) { AppendToString<core::string>(state); }
void StringAppendFloor(benchmark::State& state) { AppendToString<std::string>(state); }
BENCHMARK(StringAppend);
BENCHMARK(StringAppendFloor);

template <typename Array>
void GrowArray(benchmark::State& state) {
    constexpr UInt32 kCount = 100'000;
    for (auto pass : state) {
        Array array;
        for (UInt32 index = 0; index < kCount; ++index)
            array.push_back(index);
        if (array.size() != kCount || array.back() != kCount - 1) return state.SkipWithError("wrong elements");
        benchmark::DoNotOptimize(array.data());
    }
    state.SetItemsProcessed(state.iterations() * kCount);
}
void ArrayGrowth(benchmark::State& state) { GrowArray<dynamic_array<UInt32>>(state); }
void ArrayGrowthFloor(benchmark::State& state) { GrowArray<std::vector<UInt32>>(state); }
BENCHMARK(ArrayGrowth);
BENCHMARK(ArrayGrowthFloor);

// ---- paths ----

constexpr const char* kBase = "/some/where/archive.zarvo_data";
constexpr const char* kTail = "textures/characters/soldier/face_normal.png";
constexpr const char* kJoined = "/some/where/archive.zarvo_data/textures/characters/soldier/face_normal.png";

void PathJoin(benchmark::State& state) {
    core::string path(kMemLabelGeneral);
    for (auto pass : state) {
        path.clear();
        AppendPathNameImpl(kBase, kTail, '/', path);
        if (!(path == kJoined)) return state.SkipWithError("wrong path");
    }
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(PathJoin);

void PathJoinFloor(benchmark::State& state) {
    std::string path;
    for (auto pass : state) {
        path.clear();
        path.append(kBase).append(1, '/').append(kTail);
        if (path != kJoined) return state.SkipWithError("wrong path");
    }
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(PathJoinFloor);

// Eight nested folders, which are removed at the end of the scope.
class FolderChain {
public:
    FolderChain() {
        m_Path = mkdtemp(m_Root);
        for (int depth = 0; depth < kDepth; ++depth) {
            m_Path += "/folder";
            mkdir(m_Path.c_str(), 0777);
        }
    }
    ~FolderChain() {
        for (int depth = 0; depth <= kDepth; ++depth) {
            rmdir(m_Path.c_str());
            m_Path.erase(m_Path.rfind('/'));
        }
    }
    const char* Path() const { return m_Path.c_str(); }

private:
    static constexpr int kDepth = 8;
    char m_Root[32] = "/tmp/varnex-benchmark-XXXXXX";
    std::string m_Path;
};

void CreateExistingFolders(benchmark::State& state) {
    const FolderChain chain;
    for (auto pass : state)
        if (!CreateDirectoryRecursive(chain.Path())) return state.SkipWithError("not there");
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(CreateExistingFolders);

void CreateExistingFoldersFloor(benchmark::State& state) {
    const FolderChain chain;
    for (auto pass : state) {
        struct stat status;
        if (stat(chain.Path(), &status) != 0 || !S_ISDIR(status.st_mode)) return state.SkipWithError("not there");
    }
    state.SetItemsProcessed(state.iterations());
}
BENCHMARK(CreateExistingFoldersFloor);

} // namespace

BENCHMARK_MAIN();
