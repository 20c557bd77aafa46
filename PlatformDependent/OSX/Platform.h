// The platform's own services as LocalFileSystemOSX uses them: objects are opaque, and each operation is a free
// function named after its class and selector (Platform_... for what is no message), so that the code above is plain
// C++ on every system, and no name is one that the platform's own headers declare.
//
//   AutoreleasePool pool;
//   NSString* path = NSString_stringWithUTF8String("/tmp/x");      // freed with the pool
//   if (NSFileManager_fileExistsAtPath(path)) return false;
//
// Every object returned is autoreleased; nil (a null pointer) may be passed wherever an object is expected and gives
// nil, an empty text or false, also where the message itself would not take it. Any thread; a pool and what was made
// inside it belong to one thread.
//
// Behind this header stands Standin/, a small layer over POSIX for systems that have none of this. For a Mac there is
// nothing yet: a port adds a folder of its own, and has CMakeLists.txt take it in Standin's place. It holds a
// PlatformSystem.h that includes <sys/attr.h>, <sys/vnode.h>, <sys/stat.h> and <unistd.h>, names struct stat
// PlatformStatus and lets PlatformStat call stat; and one Objective-C++ file that includes Foundation and AppKit before
// this header and forwards each function to what it is named after. The pool forwards to objc_autoreleasePoolPush and
// objc_autoreleasePoolPop. This header and the code above it stay as they are.
#pragma once

#include <PlatformSystem.h> // PlatformStatus, PlatformStat, chflags, getattrlistbulk; Standin's, as CMakeLists.txt says

#include <cstddef>

#ifndef __OBJC__ // there the platform's headers have these; to the linker a class is one, however it was declared
class NSArray;
class NSString;
class NSURL;
constexpr unsigned long NSUTF8StringEncoding = 4;
constexpr unsigned long NSApplicationSupportDirectory = 14;
constexpr unsigned long NSLocalDomainMask = 2;
#endif

// What is autoreleased while the pool lives is freed at its end. Pools nest; objects made outside of any pool live
// until their thread ends.
class AutoreleasePool {
public:
    AutoreleasePool();
    ~AutoreleasePool();
    AutoreleasePool(const AutoreleasePool&) = delete;
    AutoreleasePool& operator=(const AutoreleasePool&) = delete;

private:
    void* m_Token;
};

// Both answer nil for bytes that are not valid in the encoding.
NSString* NSString_stringWithUTF8String(const char* text);
NSString* NSString_initWithBytes(const void* bytes, size_t length, unsigned long encoding);

NSString* NSString_string(); // the empty text

// Lives as long as the object does.
const char* NSString_UTF8String(NSString* string);

// The path without links, as far as it exists; what does not exist is kept. "//", "." and a trailing "/" go. A relative
// path stays relative unless a link in it leads to an absolute one.
NSString* NSString_stringByResolvingSymlinksInPath(NSString* path);

// A relative path is taken from the process's working directory; with none, or for an empty path, the URL is empty.
NSURL* NSURL_fileURLWithPath(NSString* path);
NSURL* NSURL_URLByResolvingSymlinksInPath(NSURL* url);
// Absolute and without trailing "/", or empty. Lives as long as the object does.
const char* NSURL_fileSystemRepresentation(NSURL* url);

NSArray* NSArray_arrayWithObject(NSString* object);
NSString* NSArray_firstObject(NSArray* array); // nil when there is none

// Of the main bundle.
NSString* NSBundle_bundlePath();
NSString* NSBundle_executablePath();

// Of the default file manager.
bool NSFileManager_fileExistsAtPath(NSString* path); // follows links
bool NSFileManager_createFileAtPath(NSString* path); // without contents; makes no folders
// Copies a file, a link as a link, or a folder with all it holds. False when destination exists; a copy that fails
// leaves nothing there.
bool NSFileManager_copyItemAtPath(NSString* source, NSString* destination);

NSString* Platform_RecycleOperation(); // the constant NSWorkspaceRecycleOperation: to the trash
// Asks the shared workspace to do operation with files, names inside the folder source.
bool NSWorkspace_performFileOperation(NSString* operation, NSString* source, NSString* destination, NSArray* files,
                                      int* tag);

// The functions NSHomeDirectory and NSSearchPathForDirectoriesInDomains.
NSString* Platform_HomeDirectory();
NSArray* Platform_SearchPathForDirectoriesInDomains(unsigned long directory, unsigned long domain, bool expandTilde);
