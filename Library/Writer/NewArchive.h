// The file of an archive that is being made: beside its place until it is whole, under a name that is made of the
// archive's.
//
//   NewArchive file;
//   file.FindPlace("folder/game.zarvo", failure);
//   file.Open(isReplacing, &hasLeftover, failure), file.Write(0, bytes, size, failure), file.Finish(failure);
//
// A lock tells a file that a killed run has left from one that another run is writing. FindPlace, Open and Finish are
// one thread's; any thread may Write.
#pragma once

#include "Library/Failure.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/NonCopyable.h"
#include "Runtime/Core/Types.h"

#include <sys/stat.h>

class NewArchive : private NonCopyable {
public:
    ~NewArchive(); // removes the file if it was not finished

    // Opens the folder that the archive goes into.
    zarvo_code FindPlace(const char* path, Failure* failure);

    // Whether a name in a folder is the archive's, or that of its unfinished file.
    bool IsPlace(const struct stat& folder, core::string_ref name) const;

    // Whether the archive may be put in its place: EEXIST if something is there that is not to be replaced, which
    // devices, pipes and sockets never are.
    zarvo_code CheckPlace(bool isReplacing, Failure* failure) const;

    // For dry runs: whether Open can make the file, as far as can be known without making it.
    zarvo_code CheckCanOpen(Failure* failure) const;

    // Makes the file. *hasLeftover: whether it replaces one that a killed run has left.
    zarvo_code Open(bool isReplacing, bool* hasLeftover, Failure* failure);

    zarvo_code Write(UInt64 offset, const UInt8* bytes, UInt64 size, Failure* failure);

    // Puts the archive in its place once all of it is on the disk.
    zarvo_code Finish(Failure* failure);

private:
    zarvo_code OpenLocked(bool* hasLeftover, bool* isDone, Failure* failure);

    bool m_IsReplacing = false;
    int m_Folder = -1;
    struct stat m_FolderStatus = {};
    int m_Descriptor = -1;
    core::string m_Name{kMemLabelGeneral};
    core::string m_Unfinished{kMemLabelGeneral};
};
