// The exceptions for errors of the library. The classes come from zarvo/_errors.py.
#pragma once

#include "Interpreter.h"

#include <string>
#include <zarvo.h>

// Imports the classes; false with an exception set. Call it first.
bool LoadErrors();

// Sets an exception, and returns null. subject says what the error is about: an archive, or an archive and an entry.
PyObject* SetError(zarvo_code code, int systemCode, const char* text, const std::string& subject);

// The exception that was set, which is set no longer.
PyObject* TakeError();

// Sets an exception that TakeError returned.
void RestoreError(Reference error);
