// Helpers for Python's C interface, which the build asks for in its stable form (Py_LIMITED_API): one build of the
// module serves Python 3.11 and whatever comes later.
//
// Functions that return a PyObject* return a new reference, or null with an exception set, unless they say otherwise.
#pragma once

#include <Python.h>

#include <cstdint>
#include <cxxabi.h>
#include <memory>
#include <new>
#include <string_view>

struct ReferenceDrop {
    void operator()(PyObject* object) const { Py_DECREF(object); }
};

// Owns one reference, or none. Destroyed by a thread that has the interpreter's lock.
using Reference = std::unique_ptr<PyObject, ReferenceDrop>;

// Paths are any bytes, and texts in Python: what is not UTF-8 becomes lone surrogates, as in the names of files.
PyObject* DecodePath(std::string_view path);

// The bytes of a text, as a bytes object. A TypeError for anything but a str.
Reference EncodePath(PyObject* text);

// What lies in a bytes object, as long as that lives.
std::string_view GetBytes(const Reference& bytes);

// A converter of PyArg_ParseTuple ("O&"): stores a number from 0 on in a uint64_t.
int ConvertCount(PyObject* number, void* count);

// When the interpreter is ending, Python up to 3.13 ends a thread that asks for the lock, by unwinding its stack: the
// references on it would be dropped without the lock. The thread waits here for the process to end instead, as later
// versions of Python let it do.
[[noreturn]] void WaitForProcessToEnd();

// Runs a function without the interpreter's lock. The function must not throw.
template <typename Function>
auto WithoutInterpreter(Function function) {
    PyThreadState* const state = PyEval_SaveThread();
    try {
        const auto result = function();
        PyEval_RestoreThread(state);
        return result;
    } catch (const abi::__forced_unwind&) {
        WaitForProcessToEnd();
    }
}

// Runs a function with the interpreter's lock, in any thread. The function must not throw.
template <typename Function>
auto WithInterpreter(Function function) {
    try {
        const PyGILState_STATE state = PyGILState_Ensure();
        const auto result = function();
        PyGILState_Release(state);
        return result;
    } catch (const abi::__forced_unwind&) {
        WaitForProcessToEnd();
    }
}

// A function that Python calls. Memory that is refused to it becomes a MemoryError: Python's C code can't be unwound.
//
//     {"find", Guarded<FindItem>::Call, METH_O, nullptr},
template <auto kFunction>
struct Guarded;

template <typename... Parameters, PyObject* (*kFunction)(Parameters...)>
struct Guarded<kFunction> {
    static PyObject* Call(Parameters... parameters) {
        try {
            return kFunction(parameters...);
        } catch (const std::bad_alloc&) {
            return PyErr_NoMemory();
        }
    }
};

// Appends to a list. False with an exception set; null is one that is set already.
bool AppendTo(const Reference& list, PyObject* item);
