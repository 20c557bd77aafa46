// Hashes every file of an archive from several threads through one reader, prints "hash  path" in the order of the
// directory, and prints its speed on standard error: ParallelReader ARCHIVE [THREADS]
#include "Runtime/Utilities/LogHooks.h"
#include "Runtime/Utilities/SpookyHash.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <thread>
#include <vector>

namespace {

using ArchiveStorageHeader::Node;

struct FileHash {
    bool isRead = false;
    UInt64 half1 = 0;
    UInt64 half2 = 0;
};

// The work of one thread: takes the next file until none is left. A file is hashed piece by piece, with each hash as
// the seed of the next.
void HashFiles(ArchiveStorageReader& reader, std::atomic<size_t>& next, std::vector<FileHash>& hashes,
               std::atomic<UInt64>& bytesRead) {
    const dynamic_array<Node>& nodes = reader.GetDirectoryInfo().nodes;
    std::vector<char> piece(1 << 20);
    for (size_t index = next++; index < nodes.size(); index = next++) {
        const Node& node = nodes[index];
        FileHash& hash = hashes[index];
        UInt64 done = 0;
        UInt64 count = 0;
        while (done < node.size && reader.Read(node.offset + done, std::min<UInt64>(node.size - done, piece.size()),
                                               piece.data(), &count)) {
            SpookyHash::Hash128(piece.data(), static_cast<size_t>(count), &hash.half1, &hash.half2);
            done += count;
        }
        hash.isRead = done == node.size;
        bytesRead += done;
    }
}

} // namespace

int main(int argumentCount, char** arguments) {
    if (argumentCount < 2) {
        fprintf(stderr, "Usage: ParallelReader ARCHIVE [THREADS]\n");
        return 2;
    }
    gConsoleFile = stderr; // for the runtime's messages; standard output is for the results
    // Initialize also creates the file system, which must happen before a second thread uses it.
    ArchiveStorageReader reader(kMemLabelFileSystem);
    if (reader.Initialize(core::string(arguments[1]), 0) != 0 || !reader.FindDirectory()) {
        fprintf(stderr, "%s: not a readable archive\n", arguments[1]);
        return 1;
    }
    const dynamic_array<Node>& nodes = reader.GetDirectoryInfo().nodes;
    const int threadCount = argumentCount > 2 ? std::clamp(atoi(arguments[2]), 1, 256) : 4;
    std::vector<FileHash> hashes(nodes.size());
    std::atomic<size_t> next{0};
    std::atomic<UInt64> bytesRead{0};
    const auto start = std::chrono::steady_clock::now();
    std::vector<std::thread> threads;
    threads.reserve(static_cast<size_t>(threadCount));
    for (int index = 0; index < threadCount; ++index)
        threads.emplace_back([&] { HashFiles(reader, next, hashes, bytesRead); });
    for (std::thread& thread : threads)
        thread.join();
    const std::chrono::duration<double> seconds = std::chrono::steady_clock::now() - start;

    bool isAllRead = true;
    for (size_t index = 0; index < nodes.size(); ++index) {
        if ((nodes[index].flags & ArchiveStorageHeader::kNodeDirectory) != 0) continue;
        isAllRead = isAllRead && hashes[index].isRead;
        if (hashes[index].isRead)
            printf("%016llx%016llx  %s\n", hashes[index].half1, hashes[index].half2, nodes[index].path.c_str());
        else
            printf("%-32s  %s\n", "can't be read", nodes[index].path.c_str());
    }
    fprintf(stderr, "%llu bytes by %d threads, %.0f bytes per second\n", bytesRead.load(), threadCount,
            static_cast<double>(bytesRead.load()) / std::max(seconds.count(), 1e-9));
    return isAllRead ? 0 : 1;
}
