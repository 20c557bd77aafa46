// The platform's own services as LocalFileSystemOSX uses them: objects are opaque, and each operation is a free
// function named after its class and selector, so that the code above is plain C++ on every system.
//
//   AutoreleasePool pool;
//   NSString* path = NSString_stringWithUTF8String("/tmp/x");      // freed with the pool
//   if (NSFileManager_fileExistsAtPath(path)) return false;
//
// Every object returned is autoreleased; nil (a null pointer) may be passed wherever an object is expected and gives
// nil, an empty text or false. Any thread; a pool and what was made inside it belong to one thread.
//
// Behind this header stands one of two folders, chosen by CMake. Standin/ is a small layer over POSIX, for systems that
// have none of this. On a Mac a folder of its own takes its place: a PlatformSystem.h that includes <sys/attr.h>,
// <sys/vnode.h>, <sys/stat.h> and <unistd.h>, names struct stat PlatformStatus and lets PlatformStat call stat; and one
// Objective-C++ file that includes Foundation and AppKit before this header (which then says @class for class, a
// difference that the linker does not see) and forwards each function to the message it is named after. The pool
// forwards to objc_autoreleasePoolPush and objc_autoreleasePoolPop. Nothing else changes.
#pragma once

#include <PlatformSystem.h> // PlatformStatus, PlatformStat, chflags, getattrlistbulk; from the folder that CMake chose

#include <cstddef>

class NSArray;
class NSString;
class NSURL;

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

enum NSStringEncoding : unsigned long { NSUTF8StringEncoding = 4 };
enum NSSearchPathDirectory : unsigned long { NSApplicationSupportDirectory = 14 };
enum NSSearchPathDomainMask : unsigned long { NSLocalDomainMask = 2 };

// Both answer nil for bytes that are not valid in the encoding.
NSString* NSString_stringWithUTF8String(const char* text);
NSString* NSString_initWithBytes(const void* bytes, size_t length, NSStringEncoding encoding);

NSString* NSString_string(); // the empty text

// Lives as long as the object does.
const char* NSString_UTF8String(NSString* string);

// The path without links, as far as it exists; what does not exist is kept. "//", "." and a trailing "/" go. A relative
// path stays relative unless a link in it leads to an absolute one.
NSString* NSString_stringByResolvingSymlinksInPath(NSString* path);

// A relative path is taken from the process's working directory.
NSURL* NSURL_fileURLWithPath(NSString* path);
NSURL* NSURL_URLByResolvingSymlinksInPath(NSURL* url);
// Absolute and without trailing "/"; empty for the URL of an empty path. Lives as long as the object does.
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

// Asks the shared workspace to move files, names inside the folder source, to the trash.
enum NSWorkspaceFileOperation : int { NSWorkspaceRecycleOperation };
bool NSWorkspace_performFileOperation(NSWorkspaceFileOperation operation, NSString* source, NSString* destination,
                                      NSArray* files, int* tag);

NSString* NSHomeDirectory();
NSArray* NSSearchPathForDirectoriesInDomains(NSSearchPathDirectory directory, NSSearchPathDomainMask domain,
                                             bool expandTilde);
