// The platform's own services as LocalFileSystemOSX uses them. Objects are opaque. Each operation is a free function
// named after its class and selector, or Platform_... when it is not a message, so that its callers are plain C++ on
// every system and no name clashes with the platform's headers.
//
//   AutoreleasePool pool;
//   NSString* path = NSString_stringWithUTF8String("/tmp/x");      // freed with the pool
//   if (NSFileManager_fileExistsAtPath(path)) return false;
//
// Every returned object is autoreleased. nil (a null pointer) may be passed for any object, even where the message
// itself would not accept it, and gives nil, an empty text or false. Any thread; a pool and the objects made in it
// belong to one thread.
//
// Standin/ implements this header with POSIX calls, for systems that have none of these services. There is no
// implementation for a Mac yet. A port adds its own folder, which CMakeLists.txt names in place of Standin. It needs:
//  - a PlatformSystem.h that includes <sys/attr.h>, <sys/vnode.h>, <sys/stat.h> and <unistd.h>, defines PlatformStatus
//    as struct stat and lets PlatformStat call stat;
//  - one Objective-C++ file that includes Foundation and AppKit before this header, and forwards each function to what
//    it is named after, and the pool to objc_autoreleasePoolPush and objc_autoreleasePoolPop.
// This header and its callers need no change.
#pragma once

#include <PlatformSystem.h> // PlatformStatus, PlatformStat, chflags, getattrlistbulk; Standin's, as CMakeLists.txt says

#include <cstddef>

#ifndef __OBJC__ // Objective-C++ has these from the platform's headers; the linker sees the same names either way
class NSArray;
class NSString;
class NSURL;
constexpr unsigned long NSUTF8StringEncoding = 4;
constexpr unsigned long NSApplicationSupportDirectory = 14;
constexpr unsigned long NSLocalDomainMask = 2;
#endif

// Frees the objects that were autoreleased while it lived. Pools nest. Objects made outside any pool live until their
// thread ends.
class AutoreleasePool {
public:
    AutoreleasePool();
    ~AutoreleasePool();
    AutoreleasePool(const AutoreleasePool&) = delete;
    AutoreleasePool& operator=(const AutoreleasePool&) = delete;

private:
    void* m_Token;
};

// Both return nil for bytes that are not valid in the encoding.
NSString* NSString_stringWithUTF8String(const char* text);
NSString* NSString_initWithBytes(const void* bytes, size_t length, unsigned long encoding);

NSString* NSString_string(); // the empty text

// The text lives as long as string does.
const char* NSString_UTF8String(NSString* string);

// The path with its links resolved, as far as it exists; the rest is kept. Removes "//", "." and a trailing "/". A
// relative path stays relative unless one of its links leads to an absolute path.
NSString* NSString_stringByResolvingSymlinksInPath(NSString* path);

// A relative path is relative to the process's working directory. The URL is empty when that is gone, or path is empty.
NSURL* NSURL_fileURLWithPath(NSString* path);
NSURL* NSURL_URLByResolvingSymlinksInPath(NSURL* url);
// Absolute and without a trailing "/", or empty. The text lives as long as url does.
const char* NSURL_fileSystemRepresentation(NSURL* url);

NSArray* NSArray_arrayWithObject(NSString* object);
NSString* NSArray_firstObject(NSArray* array); // nil when there is none

// Of the main bundle.
NSString* NSBundle_bundlePath();
NSString* NSBundle_executablePath();

// Of the default file manager.
bool NSFileManager_fileExistsAtPath(NSString* path); // follows links
bool NSFileManager_createFileAtPath(NSString* path); // empty; its folder must exist
// Copies a file, a link as a link, or a folder with its contents. False when destination exists. A failed copy leaves
// nothing behind.
bool NSFileManager_copyItemAtPath(NSString* source, NSString* destination);

NSString* Platform_RecycleOperation(); // the constant NSWorkspaceRecycleOperation, which moves to the trash
// Asks the shared workspace to perform operation on files, which are names in the folder source.
bool NSWorkspace_performFileOperation(NSString* operation, NSString* source, NSString* destination, NSArray* files,
                                      int* tag);

// The functions NSHomeDirectory and NSSearchPathForDirectoriesInDomains.
NSString* Platform_HomeDirectory();
NSArray* Platform_SearchPathForDirectoriesInDomains(unsigned long directory, unsigned long domain, bool expandTilde);
