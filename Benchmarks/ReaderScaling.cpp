// How much faster two threads read different blocks through one reader than one thread does: ReaderScaling
//
// Measures each kind of block and each way of reading in several rounds, which alternate between one thread and two,
// and prints the best of each and their ratio. The rows "decoder alone" read nothing: they show the ratio that the
// machine allows. All bytes are compared with the source.
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"
#include "Tests/Support/ArchiveBuilder.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <stdlib.h>
#include <thread>
#include <unistd.h>

namespace {

constexpr UInt64 kBlockSize = 131'072;
constexpr UInt64 kBlocks = 64;
constexpr int kRounds = 8;

// Text that can be compressed.
std::string MakeText() {
    std::string text;
    for (UInt64 seed = 1; text.size() < kBlocks * kBlockSize; seed = seed * 6364136223846793005u + 1442695040888963407u)
        text += "line " + std::to_string(seed >> 40) + " of the text\n";
    text.resize(kBlocks * kBlockSize);
    return text;
}

// Bytes per second of threadCount threads. work(block) handles one block and returns whether the result was right. Each
// thread handles every block passes times; the threads start at different blocks, so that two rarely handle the same
// one at once.
template <typename Work>
double Measure(UInt64 threadCount, UInt64 passes, Work work) {
    const auto start = std::chrono::steady_clock::now();
    std::vector<std::thread> threads;
    for (UInt64 index = 0; index < threadCount; ++index)
        threads.emplace_back([=] {
            for (UInt64 count = 0; count < passes * kBlocks; ++count) {
                if (work((count + index * kBlocks / threadCount) % kBlocks)) continue;
                fprintf(stderr, "a block came out wrong\n");
                abort();
            }
        });
    for (std::thread& thread : threads)
        thread.join();
    const std::chrono::duration<double> seconds = std::chrono::steady_clock::now() - start;
    return static_cast<double>(threadCount * passes * kBlocks * kBlockSize) / seconds.count();
}

template <typename Work>
void Compare(const char* kind, const char* way, UInt64 passes, Work work) {
    double one = 0, two = 0;
    for (int round = 0; round < kRounds; ++round) {
        one = std::max(one, Measure(1, passes, work));
        two = std::max(two, Measure(2, passes, work));
    }
    printf("%-8s %-22s %9.1f MB/s %9.1f MB/s   ratio %.2f\n", kind, way, one / 1e6, two / 1e6, two / one);
}

// passes should take some tenths of a second.
void CompareKind(const char* kind, CompressionType type, bool isStreamed, UInt64 passes) {
    char path[] = "/tmp/varnex-scaling-XXXXXX";
    close(mkstemp(path));
    const std::string text = MakeText();
    ArchiveDescription description;
    description.entries = {{.path = "a", .bytes = text}};
    description.chunkSize = kBlockSize;
    description.type = type;
    description.streamed = isStreamed;
    WriteArchive(description, path);
    ArchiveStorageReader reader(kMemLabelFileSystem);
    if (reader.Initialize(core::string(path), 0) != 0) abort();
    unlink(path);

    auto read = [&](UInt64 from, UInt64 size) {
        thread_local std::string bytes(kBlockSize, '\0');
        UInt64 count = 0;
        return reader.Read(from, size, bytes.data(), &count) && count == size &&
               memcmp(bytes.data(), text.data() + from, size) == 0;
    };
    Compare(kind, "whole blocks", passes, [&](UInt64 block) { return read(block * kBlockSize, kBlockSize); });
    Compare(kind, "16 parts of each", passes, [&](UInt64 block) {
        constexpr UInt64 kPart = kBlockSize / 16;
        for (UInt64 from = block * kBlockSize; from < (block + 1) * kBlockSize; from += kPart)
            if (!read(from, kPart)) return false;
        return true;
    });

    IDecompressor* decompressor = CreateDecompressor(type, kMemLabelGeneral);
    if (decompressor == nullptr) return;
    std::vector<std::string> stored;
    for (UInt64 block = 0; block < kBlocks; ++block)
        stored.push_back(Compress(type, std::string_view(text).substr(block * kBlockSize, kBlockSize)));
    Compare(kind, "decoder alone", passes, [&](UInt64 block) {
        thread_local std::string bytes(kBlockSize, '\0');
        size_t consumed = stored[block].size(), produced = kBlockSize;
        return decompressor->DecompressMemory(stored[block].data(), &consumed, bytes.data(), &produced) &&
               memcmp(bytes.data(), text.data() + block * kBlockSize, kBlockSize) == 0;
    });
    Delete(decompressor, kMemLabelGeneral);
}

} // namespace

int main() {
    printf("%-31s %14s %14s\n", "", "one thread", "two threads");
    CompareKind("LZMA", kCompressionLzma, false, 2);
    CompareKind("streamed", kCompressionLzma, true, 2);
    CompareKind("LZ4", kCompressionLz4, false, 100);
    CompareKind("stored", kCompressionNone, false, 200);
}
