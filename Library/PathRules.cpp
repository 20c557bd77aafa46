#include "Library/PathRules.h"

#include "Library/include/zarvo.h"
#include "Runtime/Utilities/SpookyHash.h"

#include <cstring>
#include <ctime>
#include <sys/random.h>

bool PathComponents::Next() {
    do {
        m_Begin = m_End;
        while (m_Begin < m_Path.size() && IsSeparator(m_Path[m_Begin]))
            ++m_Begin;
        m_End = m_Begin;
        while (m_End < m_Path.size() && !IsSeparator(m_Path[m_End]))
            ++m_End;
    } while (m_End - m_Begin == 1 && m_Path[m_Begin] == '.');
    return m_Begin != m_End;
}

core::string_ref LastComponent(core::string_ref path) {
    size_t end = path.size();
    while (true) {
        while (end != 0 && IsSeparator(path[end - 1]))
            --end;
        size_t begin = end;
        while (begin != 0 && !IsSeparator(path[begin - 1]))
            --begin;
        const bool isDot = end - begin == 1 && path[begin] == '.';
        if (!isDot) return path.substr(begin, end - begin);
        end = begin;
    }
}

core::string_ref WithoutLastComponent(core::string_ref path) {
    const core::string_ref last = LastComponent(path);
    size_t end = static_cast<size_t>(last.data() - path.data());
    while (end != 0 && IsSeparator(path[end - 1]))
        --end;
    return path.substr(0, end);
}

bool IsSamePath(core::string_ref a, core::string_ref b) {
    if (a == b) return true; // most stored paths are in normal form
    PathComponents atA(a);
    PathComponents atB(b);
    while (true) {
        const bool hasA = atA.Next();
        const bool hasB = atB.Next();
        if (hasA != hasB) return false;
        if (!hasA) return true;
        if (!(atA.Name() == atB.Name())) return false;
    }
}

static bool HasTwoDots(core::string_ref path) {
    const char* const end = path.data() + path.size();
    for (const char* at = path.data(); at != end; ++at) {
        at = static_cast<const char*>(memchr(at, '.', static_cast<size_t>(end - at)));
        if (at == nullptr || at + 1 == end) return false;
        if (at[1] == '.') return true;
    }
    return false;
}

SInt32 GetPathProblem(core::string_ref path, bool isFile) {
    // Nearly every path is told by a look at its ends and a search for "..".
    if (!path.empty() && path[0] != '.' && !IsSeparator(path[0]) && !IsSeparator(path.back()) && !HasTwoDots(path))
        return ZARVO_PROBLEM_NONE;
    bool isEmpty = true;
    for (PathComponents at(path); at.Next(); isEmpty = false)
        if (at.Name() == "..") return ZARVO_PROBLEM_PARENT;
    if (isEmpty) return ZARVO_PROBLEM_EMPTY;
    if (isFile && IsSeparator(path.back())) return ZARVO_PROBLEM_SEPARATOR;
    return ZARVO_PROBLEM_NONE;
}

UInt64 HashComponent(UInt64 folderHash, core::string_ref name) {
    UInt64 otherHalf = folderHash;
    SpookyHash::Hash128(name.data(), name.size(), &folderHash, &otherHalf);
    return folderHash;
}

UInt64 HashPath(core::string_ref path, UInt64 seed) {
    for (PathComponents at(path); at.Next();)
        seed = HashComponent(seed, at.Name());
    return seed;
}

bool HashFolders(core::string_ref path, UInt64 seed, dynamic_array<UInt64>* hashes) {
    hashes->clear();
    for (PathComponents at(path); at.Next();) {
        seed = HashComponent(seed, at.Name());
        if (!hashes->try_push_back(seed)) return false;
    }
    return true;
}

UInt64 RandomHashSeed() {
    UInt64 seed;
    if (getrandom(&seed, sizeof(seed), GRND_NONBLOCK) == static_cast<ssize_t>(sizeof(seed))) return seed;
    timespec now = {}; // without a random number, the time is the seed
    (void)clock_gettime(CLOCK_MONOTONIC, &now);
    return static_cast<UInt64>(now.tv_sec) << 32 ^ static_cast<UInt64>(now.tv_nsec);
}

size_t zarvo_normalize_path(const char* path, size_t length, char* out) {
    if (path == nullptr || out == nullptr) return 0;
    if (length == ZARVO_WHOLE) length = strlen(path);
    size_t written = 0;
    for (PathComponents at(core::string_ref(path, length)); at.Next();) {
        const core::string_ref name = at.Name();
        if (written != 0) out[written++] = '/';
        memmove(out + written, name.data(), name.size()); // out may be path: what is written lies at or before the name
        written += name.size();
    }
    out[written] = '\0';
    return written;
}
