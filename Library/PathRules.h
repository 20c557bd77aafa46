// The normal form of a stored path, by which paths are compared and files are named on disk: "\" becomes "/", and empty
// and "." components are dropped. Any thread.
#pragma once

#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/StringRef.h"
#include "Runtime/Core/Types.h"

inline bool IsSeparator(char character) { return character == '/' || character == '\\'; }

// The components of a path's normal form, from first to last.
//
//   for (PathComponents at(path); at.Next();) use(at.Name());
class PathComponents {
public:
    explicit PathComponents(core::string_ref path) : m_Path(path) {}

    // Moves to the next component; false after the last.
    bool Next();

    core::string_ref Name() const { return m_Path.substr(m_Begin, m_End - m_Begin); }
    size_t End() const { return m_End; } // of Name, in the path

private:
    core::string_ref m_Path;
    size_t m_Begin = 0;
    size_t m_End = 0;
};

// The last component of the normal form; empty if the normal form is empty.
core::string_ref LastComponent(core::string_ref path);

// The path without its last component and the separators before it. Not in normal form.
core::string_ref WithoutLastComponent(core::string_ref path);

// Whether two paths have the same normal form.
bool IsSamePath(core::string_ref a, core::string_ref b);

// Why extraction refuses an entry: ZARVO_PROBLEM_...
SInt32 GetPathProblem(core::string_ref path, bool isFile);

// Hashes a normal form component by component: from the hash of a folder and a name, the hash of what has that name in
// the folder. The hash of the root is a seed, which the makers of archives should not know.
UInt64 HashComponent(UInt64 folderHash, core::string_ref name);

// The hash of a path's normal form.
UInt64 HashPath(core::string_ref path, UInt64 seed);

// The hashes of the folders above a path, the outermost first, and then of the path. False when memory is refused.
[[nodiscard]] bool HashFolders(core::string_ref path, UInt64 seed, dynamic_array<UInt64>* hashes);

// A seed for such hashes that differs from run to run.
UInt64 RandomHashSeed();
