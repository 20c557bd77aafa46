// The module zarvo._native: zarvo.h for Python. The classes that users see are made of it in Python.
#include "ArchiveObject.h"
#include "Errors.h"
#include "StreamObject.h"

namespace {

PyMethodDef s_AfterFork = {"mark_lost_archives", MarkLostArchives, METH_NOARGS, nullptr};

bool WatchForks() {
    const Reference os(PyImport_ImportModule("os"));
    const Reference afterFork(PyCFunction_New(&s_AfterFork, nullptr));
    if (os == nullptr || afterFork == nullptr) return false;
    const Reference watch(PyObject_GetAttrString(os.get(), "register_at_fork"));
    const Reference none(PyTuple_New(0));
    const Reference names(Py_BuildValue("{sO}", "after_in_child", afterFork.get()));
    if (watch == nullptr || none == nullptr || names == nullptr) return false;
    return Reference(PyObject_Call(watch.get(), none.get(), names.get())) != nullptr;
}

int Fill(PyObject* module) {
    // Callbacks of the library take the main interpreter's lock, and there is one set of types.
    if (PyInterpreterState_GetID(PyInterpreterState_Get()) != 0) {
        PyErr_SetString(PyExc_ImportError, "zarvo can only be used in the main interpreter");
        return -1;
    }
    const bool isFilled = LoadErrors() && AddArchiveType(module) && AddStreamType(module) &&
                          PyModule_AddStringConstant(module, "version", zarvo_version()) == 0 && WatchForks();
    return isFilled ? 0 : -1;
}

PyModuleDef_Slot s_Slots[] = {{Py_mod_exec, reinterpret_cast<void*>(Fill)}, {0, nullptr}};

PyModuleDef s_Module = {
    PyModuleDef_HEAD_INIT, "zarvo._native", nullptr, 0, nullptr, s_Slots, nullptr, nullptr, nullptr};

} // namespace

PyMODINIT_FUNC PyInit__native() { return PyModuleDef_Init(&s_Module); }
