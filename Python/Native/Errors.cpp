#include "Errors.h"

static PyObject* s_Classes = nullptr; // the module zarvo._errors

bool LoadErrors() {
    s_Classes = PyImport_ImportModule("zarvo._errors");
    return s_Classes != nullptr;
}

// Python's own class for an error, or null.
static PyObject* FindBuiltin(zarvo_code code) {
    switch (code) {
    case ZARVO_ERROR_ARGUMENT: return PyExc_ValueError;
    case ZARVO_ERROR_MEMORY: return PyExc_MemoryError;
    case ZARVO_ERROR_NOT_FOUND: return PyExc_KeyError;
    default: return nullptr;
    }
}

static const char* FindOurs(zarvo_code code) {
    switch (code) {
    case ZARVO_ERROR_NOT_AN_ARCHIVE: return "BadArchive";
    case ZARVO_ERROR_DAMAGED: return "DamagedData";
    case ZARVO_ERROR_UNSUPPORTED: return "UnsupportedData";
    case ZARVO_ERROR_LIMIT: return "LimitExceeded";
    case ZARVO_ERROR_CHANGED: return "ArchiveChanged";
    case ZARVO_ERROR_REFUSED: return "EntryRefused";
    default: return "Error";
    }
}

PyObject* SetError(zarvo_code code, int systemCode, const char* text, const std::string& subject) {
    if (code == ZARVO_ERROR_SYSTEM) {
        // OSError chooses the subclass by the errno: FileNotFoundError and so on.
        const Reference name(DecodePath(subject));
        const Reference reason(DecodePath(text));
        if (name == nullptr || reason == nullptr) return nullptr;
        const Reference error(PyObject_CallFunction(PyExc_OSError, "iOO", systemCode, reason.get(), name.get()));
        if (error != nullptr) PyErr_SetObject(reinterpret_cast<PyObject*>(Py_TYPE(error.get())), error.get());
        return nullptr;
    }
    const Reference message(DecodePath(subject + ": " + text));
    if (message == nullptr) return nullptr;
    if (PyObject* builtin = FindBuiltin(code)) {
        PyErr_SetObject(builtin, message.get());
        return nullptr;
    }
    const Reference ours(PyObject_GetAttrString(s_Classes, FindOurs(code)));
    if (ours != nullptr) PyErr_SetObject(ours.get(), message.get());
    return nullptr;
}

PyObject* TakeError() {
    PyObject* type = nullptr;
    PyObject* value = nullptr;
    PyObject* traceback = nullptr;
    PyErr_Fetch(&type, &value, &traceback);
    PyErr_NormalizeException(&type, &value, &traceback);
    if (traceback != nullptr) PyException_SetTraceback(value, traceback);
    Py_XDECREF(type);
    Py_XDECREF(traceback);
    return value;
}

void RestoreError(Reference error) { PyErr_SetObject(reinterpret_cast<PyObject*>(Py_TYPE(error.get())), error.get()); }
