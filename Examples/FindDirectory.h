// Makes sure that an opened archive's directory is known: a ZarvoWeb archive keeps it inside the compressed data, and
// reading from the start, in order and by one thread, finds it. False when there is none to be found.
#pragma once

#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include <vector>

inline bool FindDirectory(ArchiveStorageReader& reader) {
    std::vector<char> piece(65'536);
    size_t wanted = piece.size();
    UInt64 position = 0;
    while (!reader.IsDirectoryReady() && reader.CanDirectoryBecomeReady() && wanted != 0) {
        UInt64 count = 0;
        if (reader.Read(position, wanted, piece.data(), &count))
            position += count;
        else
            wanted /= 2; // a range that passes the stream's end is refused whole
    }
    return reader.IsDirectoryReady();
}
