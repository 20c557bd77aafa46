// The type _native.Stream: a file of an archive that is read from its start on. It keeps the archive open.
#pragma once

#include <Python.h>

bool AddStreamType(PyObject* module);

// Archive.open_stream(index).
PyObject* OpenStream(PyObject* archive, PyObject* number);
