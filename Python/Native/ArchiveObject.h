// The type _native.Archive: an open archive. It is closed when the last reference to it is dropped, so a call that goes
// on, and a stream, keep it open.
//
// Members are for threads that have the interpreter's lock.
#pragma once

#include "Interpreter.h"
#include "PythonSource.h"

#include <string>
#include <zarvo.h>

struct ArchiveObject {
    PyObject base;          // first, as Python asks for
    zarvo_archive* archive; // null when it could not be opened
    PythonSource* source;   // owned; null unless Python delivers the bytes
    std::string* name;      // owned; for messages
    int calls;              // that go on
    bool hasTree;           // zarvo_find no longer takes long
    PyObject* foundPath;    // owned; null or the path that iteration gave last: most are looked up right away
    uint64_t foundIndex;    // of its entry
    bool isLost;            // in a child process: another thread was in a call when the process forked
};

inline ArchiveObject* AsArchive(PyObject* self) { return reinterpret_cast<ArchiveObject*>(self); }

// Adds the type to the module, and the functions that open and make archives. False with an exception set.
bool AddArchiveType(PyObject* module);

// Python calls it in the child after a fork. Marks the archives that were in use: their locks will never be released.
PyObject* MarkLostArchives(PyObject* module, PyObject* unused);

// "ARCHIVE: ENTRY", for messages.
std::string DescribeEntry(const ArchiveObject* self, uint64_t index);

// One call of the library for an archive, which is counted as long as this lives.
//
//     LibraryCall call(self);
//     if (!call.IsAllowed()) return nullptr;
//     const zarvo_code code = WithoutInterpreter([&] { return zarvo_read(..., call.Error()); });
//     if (code != ZARVO_OK) return call.Raise(code, subject);
class LibraryCall {
public:
    explicit LibraryCall(ArchiveObject* archive) : m_Archive(archive) { ++m_Archive->calls; }
    ~LibraryCall();
    LibraryCall(const LibraryCall&) = delete;
    LibraryCall& operator=(const LibraryCall&) = delete;

    // False, with an exception set, when a fork has left the archive unusable.
    bool IsAllowed() const;

    zarvo_error** Error() { return &m_Error; }

    // Sets the exception for a failed call, and returns null.
    PyObject* Raise(zarvo_code code, const std::string& subject);

private:
    ArchiveObject* m_Archive;
    zarvo_error* m_Error = nullptr;
};
