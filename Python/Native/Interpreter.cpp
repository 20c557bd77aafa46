#include "Interpreter.h"

#include <unistd.h>

PyObject* DecodePath(std::string_view path) {
    return PyUnicode_DecodeUTF8(path.data(), static_cast<Py_ssize_t>(path.size()), "surrogateescape");
}

Reference EncodePath(PyObject* text) {
    if (PyUnicode_Check(text) != 0) return Reference(PyUnicode_AsEncodedString(text, "utf-8", "surrogateescape"));
    PyErr_Format(PyExc_TypeError, "expected a str, not %R", text);
    return nullptr;
}

std::string_view GetBytes(const Reference& bytes) {
    return {PyBytes_AsString(bytes.get()), static_cast<size_t>(PyBytes_Size(bytes.get()))};
}

int ConvertCount(PyObject* number, void* count) {
    *static_cast<uint64_t*>(count) = PyLong_AsUnsignedLongLong(number);
    if (PyErr_Occurred() == nullptr) return 1;
    if (PyErr_ExceptionMatches(PyExc_OverflowError) != 0)
        PyErr_Format(PyExc_ValueError, "%S is not a number from 0 to 2^64 - 1", number);
    else if (PyErr_ExceptionMatches(PyExc_TypeError) != 0)
        PyErr_Format(PyExc_TypeError, "expected an int, not %R", number);
    return 0;
}

void WaitForProcessToEnd() {
    while (true)
        pause();
}

bool AppendTo(const Reference& list, PyObject* item) {
    const Reference owned(item);
    return owned != nullptr && PyList_Append(list.get(), owned.get()) == 0;
}
