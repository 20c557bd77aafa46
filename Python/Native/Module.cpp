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

PyModuleDef s_Module = {
    PyModuleDef_HEAD_INIT, "zarvo._native", nullptr, -1, nullptr, nullptr, nullptr, nullptr, nullptr};

} // namespace

PyMODINIT_FUNC PyInit__native() {
    Reference module(PyModule_Create(&s_Module));
    if (module == nullptr || !LoadErrors() || !AddArchiveType(module.get()) || !AddStreamType(module.get()) ||
        PyModule_AddStringConstant(module.get(), "version", zarvo_version()) != 0 || !WatchForks())
        return nullptr;
    return module.release();
}
