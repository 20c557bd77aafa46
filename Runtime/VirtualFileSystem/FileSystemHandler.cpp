#include "Runtime/VirtualFileSystem/FileSystemHandler.h"

#include "Runtime/Utilities/LogAssert.h"

bool FileSystemHandler::CreateFileWithContentAtomically(const FileEntryData& entry, const void*, UInt64) const {
    ReportFailedCheck("CreateFileWithContentAtomically is not implemented by this handler");
    entry.lastError = kFileSystemErrorNotSupported;
    return false;
}
