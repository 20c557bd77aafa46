// Makes files and folders below one folder, and nowhere else, whoever changes the tree meanwhile: each folder is opened
// from the one above it, and no link is followed.
//
//   OutputFolder output;
//   output.Open("game_data", failure);
//   FolderCache folders(&output);              // of one thread
//   int folder = folders.Get("road/of", failure);
//   NewFile file;
//   file.Create(folder, failure), file.Write(0, bytes, size, failure), file.Place(folder, "one.txt", overwrite,
//   failure)
//
// A new file has no name until it is whole (where the file system can do that, else a temporary one beside its place),
// and takes the place of what is there in one step.
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

    // Makes the folder, and those above it, where they are missing. path itself may lead over links.
    zarvo_code Open(const char* path, Failure* failure);

    int Descriptor() const { return m_Descriptor; }

private:
    int m_Descriptor = -1;
};

// The folders that a thread has used lately, open. One thread.
class FolderCache : private NonCopyable {
public:
    // Keeps up to maxFolders open, at least 1.
    FolderCache(const OutputFolder* output, size_t maxFolders) : m_Output(output), m_MaxFolders(maxFolders) {}
    ~FolderCache();

    // The descriptor of a folder, which is made with those above it where it is missing; -1 after a failure. It stays
    // the cache's, and is good until the next call. path in any form, without "..". Folders that are kept open give way
    // where descriptors run out.
    int Get(core::string_ref path, Failure* failure);

    // Closes the folders, for whoever finds no descriptor left. Whether there were any.
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

// Whether the failure is of the disk, so that no other file will fare better: it is full, or can't be written.
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
    ~NewFile(); // what was not placed is gone

    zarvo_code Create(int folder, Failure* failure);
    zarvo_code Write(UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure);

    zarvo_code Cut(UInt64 size, Failure* failure);

    // Gives the file its name in the folder that it was created in. A file, link, device, pipe or socket that is there
    // is never opened: it is replaced, or, where replaces is false, left alone. The failure is EEXIST then, and another
    // try may follow.
    zarvo_code Place(int folder, const char* name, bool replaces, Failure* failure);

private:
    zarvo_code CreateNamed(int folder, Failure* failure);
    int Close();

    int m_Descriptor = -1;
    int m_Folder = -1;    // of the temporary name; a copy of the caller's
    char m_Name[32] = ""; // the temporary one; empty where the file has none
};

// A file of no bytes, which is whole at once. The failure is EEXIST where something is there.
zarvo_code PlaceEmptyFile(int folder, const char* name, Failure* failure);
