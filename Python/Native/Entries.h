// The methods of _native.Archive for its entries, for the tree of items, and for reading. An entry is a tuple: number,
// path, kind, size, offset, flags. Kinds are "file" and "folder".
#pragma once

#include <Python.h>

// Makes the names of kinds; false with an exception set. Call it first.
bool LoadKinds();

// info(): what zarvo_info has, in its order, the blocks in a tuple of their own.
PyObject* GetInfo(PyObject* self, PyObject* unused);

// data_size(): that of info().
PyObject* GetDataSize(PyObject* self, PyObject* unused);

// entry_count() and entry(number), of the directory.
PyObject* GetEntryCount(PyObject* self, PyObject* unused);
PyObject* GetEntry(PyObject* self, PyObject* number);

// find(path): the number of an item, or None. find_entry(path): an entry, or None.
PyObject* FindItem(PyObject* self, PyObject* path);
PyObject* FindEntry(PyObject* self, PyObject* path);

// count_found(): how many entries are what their own paths find. next_found(number): the first of these from a number
// on, as number and path, or None.
PyObject* CountFound(PyObject* self, PyObject* unused);
PyObject* NextFound(PyObject* self, PyObject* number);

// kind(item), and children(item): a list of item, name, kind and size.
PyObject* GetKind(PyObject* self, PyObject* item);
PyObject* GetChildren(PyObject* self, PyObject* item);

// match(patterns): the numbers of the entries that patterns choose, of those with equal paths only the one that find
// finds.
PyObject* MatchEntries(PyObject* self, PyObject* patterns);

// read(number, offset, size): up to size bytes of an entry.
PyObject* ReadEntry(PyObject* self, PyObject* const* arguments, Py_ssize_t argumentCount);
