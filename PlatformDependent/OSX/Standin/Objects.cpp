#include "PlatformDependent/OSX/Standin/Objects.h"

#include "PlatformDependent/OSX/Standin/Faults.h"

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <pwd.h>
#include <unistd.h>

StandinFaults gStandinFaults;

namespace {

// The objects of all pools of a thread, the innermost pool's last. A pool remembers how many there were at its start.
class ThreadPools {
public:
    ~ThreadPools() { FreeDownTo(0); }

    void FreeDownTo(size_t height) {
        while (objects.size() > height) {
            delete objects.back();
            objects.pop_back();
        }
    }
    std::vector<StandinObject*> objects;
};
thread_local ThreadPools tPools;

bool IsContinuation(unsigned char byte) { return (byte & 0xC0) == 0x80; }

// The length of the UTF-8 sequence at the start of text; 0 when it is not valid.
size_t SequenceLength(const unsigned char* text, size_t length) {
    const unsigned char lead = text[0];
    if (lead < 0x80) return 1;
    const size_t count = lead >= 0xF0 ? 4 : lead >= 0xE0 ? 3 : 2;
    if (lead < 0xC2 || lead > 0xF4 || length < count) return 0; // C0 and C1 start only overlong forms
    for (size_t i = 1; i < count; ++i)
        if (!IsContinuation(text[i])) return 0;
    const unsigned char second = text[1];
    if (lead == 0xE0 && second < 0xA0) return 0; // overlong
    if (lead == 0xED && second > 0x9F) return 0; // surrogates
    if (lead == 0xF0 && second < 0x90) return 0; // overlong
    if (lead == 0xF4 && second > 0x8F) return 0; // above the last code point
    return count;
}

bool IsUTF8(const unsigned char* text, size_t length) {
    for (size_t at = 0; at < length;) {
        const size_t count = SequenceLength(text + at, length - at);
        if (count == 0) return false;
        at += count;
    }
    return true;
}

std::string WorkingDirectory() {
    char buffer[PATH_MAX];
    return getcwd(buffer, sizeof(buffer)) != nullptr ? buffer : "";
}

std::string PathOfExecutable() {
    char buffer[PATH_MAX];
    const ssize_t length = readlink("/proc/self/exe", buffer, sizeof(buffer));
    return std::string(buffer, length > 0 ? static_cast<size_t>(length) : 0);
}

} // namespace

void AddToAutoreleasePool(StandinObject* object) {
    if (object != nullptr) tPools.objects.push_back(object);
}

size_t CountStandinObjects() { return tPools.objects.size(); }

AutoreleasePool::AutoreleasePool() : m_Token(reinterpret_cast<void*>(tPools.objects.size())) {}
AutoreleasePool::~AutoreleasePool() { tPools.FreeDownTo(reinterpret_cast<size_t>(m_Token)); }

NSString* NSString_string() { return MakeAutoreleased<NSString>(std::string()); }

NSString* NSString_initWithBytes(const void* bytes, size_t length, unsigned long encoding) {
    const auto* text = static_cast<const unsigned char*>(bytes);
    if (encoding != NSUTF8StringEncoding || !IsUTF8(text, length)) return nullptr;
    return MakeAutoreleased<NSString>(std::string(static_cast<const char*>(bytes), length));
}

NSString* NSString_stringWithUTF8String(const char* text) {
    return NSString_initWithBytes(text, strlen(text), NSUTF8StringEncoding);
}

const char* NSString_UTF8String(NSString* string) { return string != nullptr ? string->text.c_str() : nullptr; }

NSString* NSString_stringByResolvingSymlinksInPath(NSString* path) {
    return path != nullptr ? MakeAutoreleased<NSString>(ResolveLinks(path->text)) : nullptr;
}

NSURL* NSURL_fileURLWithPath(NSString* path) {
    if (path == nullptr) return nullptr;
    std::string absolute = path->text;
    if (!absolute.empty() && absolute[0] != '/') {
        // A leading "." adds nothing to the working directory.
        while (absolute == "." || absolute.compare(0, 2, "./") == 0)
            absolute.erase(0, std::min(absolute.find_first_not_of('/', 1), absolute.size()));
        const std::string folder = WorkingDirectory();
        if (folder.empty()) return MakeAutoreleased<NSURL>(folder); // it was deleted
        absolute.insert(0, folder == "/" ? folder : folder + "/");
    }
    while (absolute.size() > 1 && absolute.back() == '/')
        absolute.pop_back();
    return MakeAutoreleased<NSURL>(std::move(absolute));
}

NSURL* NSURL_URLByResolvingSymlinksInPath(NSURL* url) {
    return url != nullptr ? MakeAutoreleased<NSURL>(ResolveLinks(url->path)) : nullptr;
}

const char* NSURL_fileSystemRepresentation(NSURL* url) { return url != nullptr ? url->path.c_str() : ""; }

NSArray* NSArray_arrayWithObject(NSString* object) { return MakeAutoreleased<NSArray>(std::vector<NSString*>{object}); }

NSString* NSArray_firstObject(NSArray* array) {
    return array != nullptr && !array->objects.empty() ? array->objects.front() : nullptr;
}

NSString* NSBundle_executablePath() { return MakeAutoreleased<NSString>(PathOfExecutable()); }

// The bundle of a program that is not in one is its folder.
NSString* NSBundle_bundlePath() {
    const std::string path = gStandinFaults.emptyBundlePath ? "" : PathOfExecutable();
    return MakeAutoreleased<NSString>(path.substr(0, path.find_last_of('/')));
}

NSString* Platform_HomeDirectory() {
    if (const char* home = getenv("HOME"); home != nullptr && home[0] != '\0')
        return MakeAutoreleased<NSString>(std::string(home));
    const passwd* user = getpwuid(getuid());
    return MakeAutoreleased<NSString>(std::string(user != nullptr ? user->pw_dir : ""));
}

NSArray* Platform_SearchPathForDirectoriesInDomains(unsigned long directory, unsigned long domain, bool) {
    std::vector<NSString*> folders;
    if (directory == NSApplicationSupportDirectory && domain == NSLocalDomainMask)
        folders.push_back(MakeAutoreleased<NSString>(std::string("/Library/Application Support")));
    return MakeAutoreleased<NSArray>(std::move(folders));
}
