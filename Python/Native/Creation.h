// Archives that are made of folders.
#pragma once

#include <Python.h>

// _native.create(path, folder, exclude, threads, memory, layout, compression, level, streamed, block_size,
// engine_version, engine_revision, force, dry_run, progress). Returns files, folders, bytes, bytes of the archive, what
// was left out as (path, reason), and what failed as (path, exception): if anything did, no archive was made.
PyObject* CreateArchive(PyObject* module, PyObject* arguments);
