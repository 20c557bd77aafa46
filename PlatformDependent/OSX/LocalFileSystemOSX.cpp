#include "PlatformDependent/OSX/LocalFileSystemOSX.h"

#include "PlatformDependent/OSX/Platform.h"
#include "PlatformDependent/OSX/StringConversions.h"
#include "Runtime/Threads/Mutex.h"
#include "Runtime/Utilities/FileUtilities.h"
#include "Runtime/Utilities/Format.h"
#include "Runtime/Utilities/PathNameUtility.h"
#include "Runtime/VirtualFileSystem/LocalFileSystemPosixCalls.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include <cerrno>
#include <cstring>

namespace {

constexpr char kSourceName[] = "PlatformDependent/OSX/LocalFileSystemOSX";
constexpr char kUserDataFolder[] = "Library/Zarvo";
constexpr char kUserCacheFolder[] = "Library/Caches/com.zarvo3d.ZarvoEditor"; // named after the editor's bundle
constexpr size_t kErrorTextSize = 2048;

// The fields that a status fills, apart from the hidden flag.
constexpr UInt32 kStatusQuery = kFileEntryQuerySize | kFileEntryQueryLastModified | kFileEntryQueryDirectory |
                                kFileEntryQuerySymLink | kFileEntryQueryReadOnly;
static_assert(kStatusQuery == 0x334);

// strerror_r has two forms: one returns a status and fills the buffer, the other returns the text.
[[maybe_unused]] const char* ErrorText(int, const char* buffer) { return buffer; }
[[maybe_unused]] const char* ErrorText(const char* text, const char*) { return text; }

core::string HomeFolder() { return MakeString(Platform_HomeDirectory()); }

bool GetPlatformStatus(const FileEntryData& entry, PlatformStatus* status) {
    return RepeatOnInterrupt([&] { return PlatformStat(entry.path, status); }) == 0;
}

// Other paths reach the platform as the empty text.
bool IsUtf8(const char* path) { return NSString_stringWithUTF8String(path) != nullptr; }

} // namespace

LocalFileSystemOSX::~LocalFileSystemOSX() = default;

bool LocalFileSystemOSX::IsHidden(const FileEntryData& entry) const {
    PlatformStatus status;
    return GetPlatformStatus(entry, &status) && (status.st_flags & UF_HIDDEN) != 0;
}

bool LocalFileSystemOSX::SetFlags(FileEntryData& entry, UInt32 mask, UInt32 flags) {
    PlatformStatus status;
    if (!GetPlatformStatus(entry, &status)) return false;
    UInt32 newFlags = status.st_flags;
    if (mask & kFileEntryIsHidden) newFlags &= ~UInt32{UF_HIDDEN};
    if (flags & kFileEntryIsHidden) newFlags |= UF_HIDDEN;
    if (newFlags == status.st_flags) return true;
    if (RepeatOnInterrupt([&] { return chflags(entry.path, newFlags); }) == 0) return true;
    AssertImplementation(0, kSourceName, __LINE__, -1,
                         Format("Failed to change file flags for '%s'. errno: %i", entry.path, errno).c_str());
    return false;
}

bool LocalFileSystemOSX::CreateAsFile(FileEntryData& entry) {
    const AutoreleasePool pool;
    NSString* path = NSString_stringWithUTF8String(entry.path);
    if (NSFileManager_fileExistsAtPath(path)) return false;
    return NSFileManager_createFileAtPath(path);
}

bool LocalFileSystemOSX::MoveToTrash(FileEntryData& entry) {
    NSURL* url = NSURL_URLByResolvingSymlinksInPath(NSURL_fileURLWithPath(MakeNSString(entry.path)));
    const core::string_ref resolved = NSURL_fileSystemRepresentation(url);
    strcpy_truncate(entry.path, resolved.data(), sizeof(entry.path), resolved.length());
    // These would name something else below, because they are cut or converted; and "/" is the whole disk.
    if (resolved.length() > kMaxPathLength || !IsUtf8(entry.path)) return false;
    if (strchr(entry.path, '\\') != nullptr || resolved == "/") return false;
    if (!IsPathCreated(entry.path)) return false;

    const core::string path = PathToAbsolutePath(entry.path);
    int tag = 0;
    // Its answer doesn't count, only whether the path is gone.
    (void)NSWorkspace_performFileOperation(Platform_RecycleOperation(), MakeNSString(DeleteLastPathNameComponent(path)),
                                           MakeNSString(""),
                                           NSArray_arrayWithObject(MakeNSString(GetLastPathNameComponent(path))), &tag);
    const FileSystemEntry thing(path);
    if (thing.Exists()) (void)DeleteFileOrDirectory(path); // tested below
    return !thing.Exists();
}

bool LocalFileSystemOSX::Target(const FileEntryData& entry, FileSystemEntry& target) const {
    target = FileSystemEntry(MakeString(NSString_stringByResolvingSymlinksInPath(MakeNSString(entry.path))));
    return true;
}

bool LocalFileSystemOSX::Copy(FileEntryData& from, FileEntryData& to) {
    const AutoreleasePool pool;
    NSString* source = NSString_stringWithUTF8String(ToAbsolute(from.path).c_str());
    NSString* destination = NSString_stringWithUTF8String(ToAbsolute(to.path).c_str());
    return NSFileManager_copyItemAtPath(NSString_stringByResolvingSymlinksInPath(source), destination);
}

FileEntryInfoQueryFlags LocalFileSystemOSX::GetFileEntryInfo(const FileEntryData& entry, FileEntryInfo& info,
                                                             FileEntryInfoQueryFlags query) const {
    FileEntryInfoQueryFlags answer = kFileEntryQueryNone;
    if (query & kFileEntryQueryExists) {
        if (!Exists(entry)) return kFileEntryQueryNone;
        answer = kFileEntryQueryExists;
    }
    if ((query & (kStatusQuery | kFileEntryQueryHidden)) == 0) return answer;
    PlatformStatus status;
    if (!GetPlatformStatus(entry, &status)) return answer;
    if (query & kStatusQuery) answer = answer | LocalFileSystemPosix::GetFileEntryInfo(entry, status, info, query);
    if (query & kFileEntryQueryHidden) {
        info.flags = static_cast<UInt8>(info.flags & ~kFileEntryIsHidden);
        if (status.st_flags & UF_HIDDEN) info.flags |= kFileEntryIsHidden;
        answer = answer | kFileEntryQueryHidden;
    }
    return answer;
}

core::string LocalFileSystemOSX::GetApplicationPath() const {
    static core::string appPath(kMemLabelPathString);
    static Mutex appPathLock;
    const Mutex::AutoLock lock(appPathLock);
    if (appPath.empty()) {
        const AutoreleasePool pool;
        appPath = MakeString(NSBundle_bundlePath());
    }
    return core::string(appPath, kMemLabelPathString);
}

core::string LocalFileSystemOSX::GetApplicationFolder() const {
    const core::string application = GetApplicationPath();
    return core::string(DeleteLastPathNameComponent(application), kMemLabelGeneral);
}

core::string LocalFileSystemOSX::GetApplicationManagedPath() const {
    return AppendPathName(GetApplicationContentsPath(), "Managed");
}

core::string LocalFileSystemOSX::GetApplicationContentsPath() const {
    return AppendPathName(GetApplicationPath(), "Contents");
}

core::string LocalFileSystemOSX::GetExecutablePath() const {
    const AutoreleasePool pool;
    return MakeString(NSBundle_executablePath());
}

core::string LocalFileSystemOSX::GetUserAppCacheFolder() const {
    core::string folder(kMemLabelGeneral);
    AppendPathNameImpl(HomeFolder(), kUserCacheFolder, '/', folder);
    return folder;
}

core::string LocalFileSystemOSX::GetUserAppDataFolder() const { return AppendPathName(HomeFolder(), kUserDataFolder); }

core::string LocalFileSystemOSX::GetSharedApplicationDataFolder() const {
    const AutoreleasePool pool;
    return MakeString(NSArray_firstObject(
        Platform_SearchPathForDirectoriesInDomains(NSApplicationSupportDirectory, NSLocalDomainMask, true)));
}

core::string LocalFileSystemOSX::LastErrorMessage() {
    char buffer[kErrorTextSize] = {};
    const char* text = ErrorText(strerror_r(errno, buffer, sizeof(buffer)), buffer);
    return core::string(text, kMemLabelPathString);
}
