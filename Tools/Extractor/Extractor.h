// Extracts one archive: opens it, prints its header, finds its directory and writes every entry into a folder beside
// it.
#pragma once

// Unpacks the archive at archivePath into the folder archivePath + "_data". Prints the header, every failure, and
// "All ok!" when nothing failed. An entry that fails does not stop the others. No stored path leads outside the folder,
// but links that are already in it are followed. Returns whether every entry was written.
//
// The start-up callbacks must have run, and the file system's current directory must be set. One thread at a time.
[[nodiscard]] bool ExtractArchive(const char* archivePath);
