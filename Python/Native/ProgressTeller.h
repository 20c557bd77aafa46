// Tells a Python function how far a run has come, and lets the user interrupt the run.
#pragma once

#include "Interpreter.h"

#include <zarvo.h>

class ProgressTeller {
public:
    // function: called with the four numbers of zarvo_progress, or None. It outlives the teller.
    explicit ProgressTeller(PyObject* function) : m_Function(function) {}

    // False when the run must stop: the function has raised an exception, or the user has interrupted.
    bool Tell(const zarvo_progress& progress);

    // True, with the exception set, when a call of Tell was false.
    bool SetException();

private:
    PyObject* m_Function;
    Reference m_Exception;
};
