// Opens folders below one folder, and nowhere else, even if another program changes the tree at the same time: each is
// opened from the one above it, and no link is followed. Folders that are missing can be made.
//
//   OutputFolder output;
//   output.Open("game_data", failure);
//   FolderCache folders(&output, 8, FolderCache::kMake);   // one per thread
//   int folder = folders.Get("road/of", failure);
//
// For dry runs, both kinds of folders can be looked at without being made: whatever would keep them from being made, as
// far as can be known without writing, is a failure.
#pragma once

#include "Library/Failure.h"
#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/NonCopyable.h"

#include <sys/types.h>

// Any thread, once it is open.
class OutputFolder : private NonCopyable {
public:
    ~OutputFolder();

    // Opens the folder, and makes it and those above it if they are missing. Links in path are followed.
    zarvo_code Open(const char* path, Failure* failure);

    // As Open, but makes nothing. If the folder IsMissing, the Descriptor is that of the nearest one above it.
    zarvo_code OpenToLook(const char* path, Failure* failure);

    // Opens a folder that is there, to read what lies below it.
    zarvo_code OpenToRead(const char* path, Failure* failure);

    int Descriptor() const { return m_Descriptor; }
    bool IsMissing() const { return m_IsMissing; }

private:
    int m_Descriptor = -1;
    bool m_IsMissing = false;
};

// Keeps open the folders that a thread has used lately. One thread.
class FolderCache : private NonCopyable {
public:
    // What is done with folders that are missing: they are made, or looked at as for a dry run, or are a failure.
    enum Missing { kMake, kLook, kRefuse };

    // Keeps up to maxFolders open, at least 1.
    FolderCache(const OutputFolder* output, size_t maxFolders, Missing missing)
        : m_Output(output), m_MaxFolders(maxFolders), m_Missing(missing) {}
    ~FolderCache();

    // The descriptor of a folder, or -1 after a failure. With kMake, makes the folder and those above it. The
    // descriptor belongs to the cache, and is valid until the next call. path need not be in normal form, but holds no
    // "..". When descriptors run out, the cache closes other folders. With kLook, -1 without a failure says that the
    // folder is missing and can be made.
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

    // As Get, without its short way for the path of the last call. Keeps the last maxKept folders of the path open.
    int Walk(core::string_ref path, size_t maxKept, Failure* failure);
    int Enter(int above, const char* name, Failure* failure);
    void CheckNames(int above, char* names, Failure* failure);
    [[nodiscard]] bool Keep(core::string_ref path, int descriptor);

    const OutputFolder* m_Output;
    const size_t m_MaxFolders;
    const Missing m_Missing;
    dynamic_array<Folder> m_Folders{kMemLabelFileSystem};
    core::string m_Normal{kMemLabelGeneral};
    UInt64 m_Uses = 0;
    bool m_WasThere = false; // whether the last folder to be made was there already

    // What the last Get was asked for and has found, or -1.
    core::string m_LastPath{kMemLabelGeneral};
    int m_LastDescriptor = -1;
};

// Whether the failure is that no descriptor is left.
bool IsOutOfDescriptors(const Failure& failure);

// What stands in the place of a file.
struct Standing {
    bool isThere = false;
    bool isFolder = false;
    bool isSpecial = false; // a device, pipe or socket
    dev_t device = 0;
    ino_t inode = 0;
};
Standing LookAt(int folder, const char* name);

// Whether a name is one that the file system takes, and whether files can be made in a folder, without trying.
zarvo_code CheckName(int folder, const char* name, Failure* failure);
zarvo_code CheckCanMakeIn(int folder, Failure* failure);
