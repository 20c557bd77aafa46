#include "PythonSource.h"

#include "Errors.h"

#include <cerrno>
#include <cstring>

// Of exceptions that are raised while other calls go on, so many are kept.
static constexpr size_t kMostExceptions = 64;

PythonSource::PythonSource(PyObject* readAt, uint64_t size) : m_ReadAt(Py_NewRef(readAt)), m_Size(size) {}

zarvo_source PythonSource::MakeCallbacks() {
    zarvo_source callbacks = ZARVO_SOURCE_INIT;
    callbacks.context = this;
    callbacks.read_at = ReadAt;
    callbacks.get_size = GetSize;
    return callbacks;
}

int64_t PythonSource::ReadAt(void* context, void* buffer, size_t size, uint64_t offset) {
    return WithInterpreter([&] { return static_cast<PythonSource*>(context)->CallReadAt(buffer, size, offset); });
}

int PythonSource::GetSize(void* context, uint64_t* size) {
    *size = static_cast<PythonSource*>(context)->m_Size;
    return 0;
}

int64_t PythonSource::CallReadAt(void* buffer, size_t size, uint64_t offset) {
    if (m_ReadAt == nullptr) return -EIO;
    const Reference bytes(PyObject_CallFunction(m_ReadAt.get(), "Kn", static_cast<unsigned long long>(offset),
                                                static_cast<Py_ssize_t>(size)));
    if (bytes == nullptr) return KeepException();
    Py_buffer view;
    if (PyObject_GetBuffer(bytes.get(), &view, PyBUF_SIMPLE) != 0) return KeepException();
    const int64_t count = view.len;
    if (static_cast<size_t>(view.len) <= size) memcpy(buffer, view.buf, static_cast<size_t>(view.len));
    PyBuffer_Release(&view);
    return count; // the library refuses more than it has asked for
}

// The answer of a read that raised an exception.
int64_t PythonSource::KeepException() {
    const int number = kFirstNumber + m_Count++;
    m_Exceptions[number] = Reference(TakeError());
    if (m_Exceptions.size() > kMostExceptions) m_Exceptions.erase(m_Exceptions.begin());
    return -number;
}

PyObject* PythonSource::FindException(int systemCode) const {
    const auto found = m_Exceptions.find(systemCode);
    return found == m_Exceptions.end() ? nullptr : Py_NewRef(found->second.get());
}

int PythonSource::Traverse(visitproc visit, void* arg) const {
    Py_VISIT(m_ReadAt.get());
    for (const auto& [number, exception] : m_Exceptions)
        Py_VISIT(exception.get());
    return 0;
}

void PythonSource::Clear() {
    m_ReadAt.reset();
    m_Exceptions.clear();
}
