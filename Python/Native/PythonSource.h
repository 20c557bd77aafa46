// The bytes of an archive that a Python function delivers, and the exceptions that it raises.
//
// The library reports a failed read by an errno. So that the call that fails can raise the exception itself, each gets
// a number that no errno has. Exceptions are kept until no call uses the archive.
//
// All members are for threads that have the interpreter's lock.
#pragma once

#include "Interpreter.h"

#include <map>
#include <zarvo.h>

class PythonSource {
public:
    // read_at(offset, size) returns up to size bytes.
    PythonSource(PyObject* readAt, uint64_t size);

    // For zarvo_open_source. This source outlives the archive.
    zarvo_source MakeCallbacks();

    // The exception that an errno stands for, or null with none set.
    PyObject* FindException(int systemCode) const;

    // How many exceptions there were so far, and the last one.
    int ExceptionCount() const { return m_Count; }
    PyObject* LastException() const { return FindException(kFirstNumber + m_Count - 1); }

    void DropExceptions() { m_Exceptions.clear(); }

    // For the garbage collector.
    int Traverse(visitproc visit, void* arg) const;
    void Clear();

private:
    static constexpr int kFirstNumber = 1 << 20; // the system's are below 4,096

    static int64_t ReadAt(void* context, void* buffer, size_t size, uint64_t offset);
    static int GetSize(void* context, uint64_t* size);
    int64_t CallReadAt(void* buffer, size_t size, uint64_t offset);
    int64_t KeepException();

    Reference m_ReadAt; // null after Clear
    const uint64_t m_Size;
    std::map<int, Reference> m_Exceptions; // the last ones, by number
    int m_Count = 0;
};
