// Writes one file of an archive to standard output: ReadOneFile ARCHIVE PATH
#include "Runtime/Utilities/LogHooks.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include <algorithm>
#include <cstdio>
#include <vector>

namespace {

bool WriteToOutput(ArchiveStorageReader& reader, const ArchiveStorageHeader::Node& node) {
    std::vector<char> piece(65'536);
    UInt64 count = 0;
    for (UInt64 done = 0; done < node.size; done += count) {
        const UInt64 wanted = std::min<UInt64>(node.size - done, piece.size());
        if (!reader.Read(node.offset + done, wanted, piece.data(), &count)) {
            fprintf(stderr, "%s: damaged\n", node.path.c_str());
            return false;
        }
        fwrite(piece.data(), 1, static_cast<size_t>(count), stdout); // fflush and ferror report a failure below
    }
    if (fflush(stdout) == 0 && ferror(stdout) == 0) return true;
    fprintf(stderr, "%s: can't be written\n", node.path.c_str());
    return false;
}

} // namespace

int main(int argumentCount, char** arguments) {
    if (argumentCount != 3) {
        fprintf(stderr, "Usage: ReadOneFile ARCHIVE PATH\n");
        return 2;
    }
    gConsoleFile = stderr; // for the runtime's messages; standard output is for the results
    ArchiveStorageReader reader(kMemLabelFileSystem);
    if (reader.Initialize(core::string(arguments[1]), 0) != 0 || !reader.FindDirectory()) {
        fprintf(stderr, "%s: not a readable archive\n", arguments[1]);
        return 1;
    }
    for (const ArchiveStorageHeader::Node& node : reader.GetDirectoryInfo().nodes)
        if (node.path == arguments[2]) return WriteToOutput(reader, node) ? 0 : 1;
    fprintf(stderr, "%s: no such file in the archive\n", arguments[2]);
    return 1;
}
