#include "Runtime/VirtualFileSystem/VirtualFileSystemTypes.h"

#include "Runtime/Utilities/FixedReports.h"
#include "Runtime/VirtualFileSystem/FileSystemHandler.h"

namespace VFS {

void ReportValueTooLarge() { Report(FixedReports::kCastOfTooLarge); }
void ReportNegativeValue() { Report(FixedReports::kCastOfNegative); }

} // namespace VFS

FileEntryData::~FileEntryData() {
    if (handler != nullptr) handler->DestroyFileEntry(*this);
}
