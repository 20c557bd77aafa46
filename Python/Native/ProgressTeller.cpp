#include "ProgressTeller.h"

#include "Errors.h"

#include <utility>

bool ProgressTeller::Tell(const zarvo_progress& progress) {
    if (m_Exception != nullptr) return false;
    Reference answer;
    if (PyErr_CheckSignals() == 0)
        answer.reset(m_Function == Py_None
                         ? Py_NewRef(Py_None)
                         : PyObject_CallFunction(m_Function, "KKKK", progress.bytes, progress.bytes_total,
                                                 progress.files, progress.files_total));
    if (answer == nullptr) m_Exception.reset(TakeError());
    return answer != nullptr;
}

bool ProgressTeller::SetException() {
    if (m_Exception == nullptr) return false;
    RestoreError(std::move(m_Exception));
    return true;
}
