// Makes files and folders below one folder, and nowhere else, even if another program changes the tree at the same
// time: each folder is opened from the one above it, and no link is followed.
//
//   OutputFolder output;
//   output.Open("game_data", failure);
//   FolderCache folders(&output);              // one per thread
//   int folder = folders.Get("road/of", failure);
//   NewFile file;
//   file.Create(folder, failure), file.Write(0, bytes, size, failure), file.Place(folder, "one.txt", overwrite,
//   failure)
//
// A new file has no name until it is whole, or a temporary name in the same folder if the file system can't make files
// without names. It then replaces what is there in one step.
#pragma once

#include "Library/Failure.h"
#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/NonCopyable.h"

#include <atomic>
#include <sys/types.h>

// Any thread, once it is open.
class OutputFolder : private NonCopyable {
public:
    ~OutputFolder();

    // Opens the folder, and makes it and those above it if they are missing. Links in path are followed.
    zarvo_code Open(const char* path, Failure* failure);

    int Descriptor() const { return m_Descriptor; }

private:
    int m_Descriptor = -1;
};

// Keeps open the folders that a thread has used lately. One thread.
class FolderCache : private NonCopyable {
public:
    // Keeps up to maxFolders open, at least 1.
    FolderCache(const OutputFolder* output, size_t maxFolders) : m_Output(output), m_MaxFolders(maxFolders) {}
    ~FolderCache();

    // The descriptor of a folder, or -1 after a failure. Makes the folder if it is missing, with those above it. The
    // descriptor belongs to the cache, and is valid until the next call. path need not be in normal form, but holds no
    // "..". When descriptors run out, the cache closes other folders.
    int Get(core::string_ref path, Failure* failure);

    // Closes all folders, to free descriptors. False if none was open.
    bool Close();

private:
    struct Folder {
        explicit Folder(MemLabelId label) : path(label) {}

        core::string path; // in normal form
        int descriptor = -1;
        UInt64 lastUse = 0;
    };

    // As Get, and keeps the last maxKept folders of the path open.
    int Walk(core::string_ref path, size_t maxKept, Failure* failure);
    int Enter(int above, const char* name, Failure* failure);
    [[nodiscard]] bool Keep(core::string_ref path, int descriptor);

    const OutputFolder* m_Output;
    const size_t m_MaxFolders;
    dynamic_array<Folder> m_Folders{kMemLabelFileSystem};
    core::string m_Normal{kMemLabelGeneral};
    UInt64 m_Uses = 0;
};

// Whether the failure is that no descriptor is left.
bool IsOutOfDescriptors(const Failure& failure);

// Whether the disk is full or can't be written, so that other files would fail, too.
bool IsDiskFailure(const Failure& failure);

// What stands in the place of a file.
struct Standing {
    bool isThere = false;
    bool isFolder = false;
    dev_t device = 0;
    ino_t inode = 0;
};
Standing LookAt(int folder, const char* name);

// One thread at a time.
class NewFile : private NonCopyable {
public:
    ~NewFile(); // removes the file if it was not placed

    zarvo_code Create(int folder, Failure* failure);
    zarvo_code Write(UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure);

    zarvo_code Cut(UInt64 size, Failure* failure);

    // Gives the file its name in the folder that it was created in. A file, link, device, pipe or socket of that name
    // is never opened. If replaces is true, it is replaced; otherwise it is left alone, the failure is EEXIST, and
    // Place may be called again.
    zarvo_code Place(int folder, const char* name, bool replaces, Failure* failure);

private:
    zarvo_code CreateNamed(int folder, Failure* failure);
    int Close();

    int m_Descriptor = -1;
    int m_Folder = -1;    // of the temporary name; a copy of the caller's
    char m_Name[32] = ""; // the temporary one; empty where the file has none
};

// Makes an empty file. The failure is EEXIST if the name is taken.
zarvo_code PlaceEmptyFile(int folder, const char* name, Failure* failure);
