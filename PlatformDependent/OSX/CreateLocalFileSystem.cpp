// Puts the macOS back end in the registry of a program that is linked with this file.
#include "PlatformDependent/OSX/LocalFileSystemOSX.h"
#include "Runtime/Allocator/Allocator.h"

LocalFileSystemHandler* CreateLocalFileSystem(MemLabelId label) { return New<LocalFileSystemOSX>(label); }
