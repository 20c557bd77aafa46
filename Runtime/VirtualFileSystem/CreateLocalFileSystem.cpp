// The choice of the registry's back end, alone in its file: a program that brings another CreateLocalFileSystem
// (PlatformDependent/OSX/CreateLocalFileSystem.cpp) is linked with that one, and this file stays in the library.
#include "Runtime/Allocator/Allocator.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"

LocalFileSystemHandler* CreateLocalFileSystem(MemLabelId label) { return New<LocalFileSystemPosix>(label); }
