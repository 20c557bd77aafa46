// The road of one archive: open it, report its header, find its directory, write every entry into a folder beside it.
#pragma once

// Unpacks the archive at archivePath into the folder that the path with "_data" appended names, and prints what the
// header says, every failure, and "All ok!" when there was none. An entry that fails does not stop the others, and
// no stored path leads outside that folder; links that are already in it are followed. True when every entry was
// written.
//
// The start-up callbacks must have run, and the file system's current directory be set. One thread at a time.
[[nodiscard]] bool ExtractArchive(const char* archivePath);
