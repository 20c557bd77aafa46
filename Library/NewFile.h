// Writes new files. A file has no name until it is whole, or a temporary name in the same folder if the file system
// can't make files without names. It then gets its name in one step, and so replaces what has it.
//
//   NewFile file;
//   file.Create(folder, failure), file.Write(0, bytes, size, failure), file.Place(folder, "one.txt", failure)
//
// folder: a descriptor, from a FolderCache.
#pragma once

#include "Library/Failure.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"

#include <sys/types.h>

// One thread at a time.
class NewFile : private NonCopyable {
public:
    ~NewFile(); // removes the file if it has not got its name

    zarvo_code Create(int folder, Failure* failure);
    zarvo_code Write(UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure);
    zarvo_code Cut(UInt64 size, Failure* failure);

    // For a file that does not stay open: it is made with a temporary name, and opened again for each of the next two,
    // which several threads may call at once. folder: the one that it was made in. Whoever made it calls Remove in the
    // end, which does nothing once the file has its name.
    zarvo_code CreateClosed(int folder, Failure* failure);
    zarvo_code WriteClosed(int folder, UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure) const;
    zarvo_code CutClosed(int folder, UInt64 size, Failure* failure) const;
    void Remove(int folder);
    bool IsNamed() const { return m_Name[0] != '\0'; } // temporarily

    // These give the file its name in the folder that it was created in. A file, link, device, pipe or socket that has
    // the name is never opened. Place leaves it alone: then the failure is EEXIST, and Replace may follow.
    zarvo_code Place(int folder, const char* name, Failure* failure);
    zarvo_code Replace(int folder, const char* name, Failure* failure);

private:
    zarvo_code CreateNamed(int folder, Failure* failure);
    int OpenAgain(int folder) const;
    int Close();

    int m_Descriptor = -1;
    int m_Folder = -1;    // of the temporary name; a copy of the caller's
    char m_Name[32] = ""; // the temporary one; empty where the file has none
    dev_t m_Device = 0;   // these of a file that does not stay open
    ino_t m_Inode = 0;
};

// Makes an empty file. The failure is EEXIST if the name is taken.
zarvo_code PlaceEmptyFile(int folder, const char* name, Failure* failure);

// Whether the disk is full or can't be written, so that other files would fail, too.
bool IsDiskFailure(const Failure& failure);

// Writes at a place of an open file.
zarvo_code WriteAt(int descriptor, UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure);

// Gives a file another name in its folder, unless something has it. Returns 0, or -1 with errno: EEXIST.
int RenameToNew(int folder, const char* from, const char* to);
