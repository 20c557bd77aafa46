#include "Runtime/VirtualFileSystem/VirtualFileSystemTypes.h"

#include "Runtime/Utilities/LogAssert.h"
#include "Runtime/VirtualFileSystem/FileSystemHandler.h"

namespace VFS {

constexpr const char* kSource = "./Runtime/VirtualFileSystem/VirtualFileSystemTypes";

void ReportValueTooLarge() {
    AssertImplementation(0, kSource, 123, -1,
                         "Value cannot be stored by type cast target: exceeds maximum representable value. "
                         "Result will be truncated.");
}

void ReportNegativeValue() {
    AssertImplementation(0, kSource, 128, -1, "Casting a negative value into an unsigned type.");
}

} // namespace VFS

FileEntryData::~FileEntryData() {
    if (handler != nullptr) handler->DestroyFileEntry(*this);
}
