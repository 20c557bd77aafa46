#include "Entries.h"

#include "ArchiveObject.h"
#include "Runs.h"

#include <new>
#include <utility>
#include <vector>

static PyObject* s_Kinds[2]; // their names, by ZARVO_FILE and ZARVO_FOLDER

bool LoadKinds() {
    s_Kinds[ZARVO_FILE] = PyUnicode_InternFromString("file");
    s_Kinds[ZARVO_FOLDER] = PyUnicode_InternFromString("folder");
    return s_Kinds[ZARVO_FILE] != nullptr && s_Kinds[ZARVO_FOLDER] != nullptr;
}

namespace {

// An entry: (number, path, kind, size, offset, flags). path: its own, or null to make it.
PyObject* MakeEntry(const ArchiveObject* self, uint64_t index, PyObject* path = nullptr) {
    zarvo_entry entry = ZARVO_ENTRY_INIT;
    if (zarvo_get_entry(self->archive, index, &entry) != ZARVO_OK) {
        PyErr_SetString(PyExc_IndexError, "no entry has that number");
        return nullptr;
    }
    path = path != nullptr ? Py_NewRef(path) : DecodePath({entry.path, entry.path_length});
    return Py_BuildValue("KNOKKI", index, path, s_Kinds[entry.kind], entry.size, entry.offset, entry.flags);
}

// Builds the tree of items at the first call. False with an exception set.
bool HasTree(ArchiveObject* self, LibraryCall* call) {
    if (!call->IsAllowed()) return false;
    if (self->hasTree) return true;
    zarvo_item root = ZARVO_ITEM_INIT;
    const zarvo_code code =
        WithoutInterpreter([&] { return zarvo_get_item(self->archive, ZARVO_ROOT, &root, call->Error()); });
    if (code != ZARVO_OK) call->Raise(code, *self->name);
    self->hasTree = code == ZARVO_OK;
    return self->hasTree;
}

// Finds the item with a path. False when there is none, or with an exception set.
bool FindPath(ArchiveObject* self, PyObject* path, uint64_t* item) {
    const Reference bytes = EncodePath(path);
    if (bytes == nullptr) {
        // A text that stands for no bytes is the path of nothing.
        if (PyErr_ExceptionMatches(PyExc_UnicodeEncodeError) != 0) PyErr_Clear();
        return false;
    }
    LibraryCall call(self);
    if (!HasTree(self, &call)) return false;
    const std::string_view text = GetBytes(bytes);
    const zarvo_code code = zarvo_find(self->archive, text.data(), text.size(), item, call.Error());
    if (code != ZARVO_OK && code != ZARVO_ERROR_NOT_FOUND) call.Raise(code, *self->name);
    return code == ZARVO_OK;
}

PyObject* ReturnNone() { return PyErr_Occurred() != nullptr ? nullptr : Py_NewRef(Py_None); }

// Whether the entry is what its own path finds.
bool IsFound(const ArchiveObject* self, uint64_t index) {
    zarvo_entry entry = ZARVO_ENTRY_INIT;
    uint64_t item = 0;
    return zarvo_get_entry(self->archive, index, &entry) == ZARVO_OK && entry.problem == ZARVO_PROBLEM_NONE &&
           zarvo_find(self->archive, entry.path, entry.path_length, &item, nullptr) == ZARVO_OK && item == index;
}

// False when memory is refused.
bool Append(std::vector<uint64_t>* numbers, uint64_t number) {
    try {
        numbers->push_back(number);
        return true;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

} // namespace

PyObject* GetInfo(PyObject* self, PyObject*) {
    zarvo_info info = ZARVO_INFO_INIT;
    (void)zarvo_get_info(AsArchive(self)->archive, &info); // fails only for null pointers
    return Py_BuildValue("iINNKKKK(KKKKKKKK)KKKK", info.layout, info.version, DecodePath(info.engine_version),
                         DecodePath(info.engine_revision), info.recorded_size, info.file_size, info.data_size,
                         info.stored_size, info.block_count, info.largest_block, info.streamed_blocks, info.blocks_none,
                         info.blocks_lzma, info.blocks_lz4, info.blocks_lz4hc, info.blocks_unknown, info.entry_count,
                         info.file_count, info.folder_count, info.file_bytes);
}

PyObject* GetDataSize(PyObject* self, PyObject*) {
    zarvo_info info = ZARVO_INFO_INIT;
    (void)zarvo_get_info(AsArchive(self)->archive, &info); // fails only for null pointers
    return PyLong_FromUnsignedLongLong(info.data_size);
}

PyObject* GetEntryCount(PyObject* self, PyObject*) {
    return PyLong_FromUnsignedLongLong(zarvo_entry_count(AsArchive(self)->archive));
}

PyObject* GetEntry(PyObject* self, PyObject* number) {
    const uint64_t index = PyLong_AsUnsignedLongLong(number);
    return PyErr_Occurred() != nullptr ? nullptr : MakeEntry(AsArchive(self), index);
}

PyObject* FindItem(PyObject* self, PyObject* path) {
    uint64_t item = 0;
    return FindPath(AsArchive(self), path, &item) ? PyLong_FromUnsignedLongLong(item) : ReturnNone();
}

PyObject* FindEntry(PyObject* object, PyObject* path) {
    ArchiveObject* const self = AsArchive(object);
    if (path == self->foundPath) return MakeEntry(self, self->foundIndex, path);
    uint64_t item = 0;
    if (!FindPath(self, path, &item) || item >= zarvo_entry_count(self->archive)) return ReturnNone();
    return MakeEntry(self, item);
}

PyObject* CountFound(PyObject* object, PyObject*) {
    ArchiveObject* const self = AsArchive(object);
    LibraryCall call(self);
    if (!HasTree(self, &call)) return nullptr;
    const uint64_t count = WithoutInterpreter([&] {
        uint64_t found = 0;
        for (uint64_t index = 0; index < zarvo_entry_count(self->archive); ++index)
            if (IsFound(self, index)) ++found;
        return found;
    });
    return PyLong_FromUnsignedLongLong(count);
}

PyObject* NextFound(PyObject* object, PyObject* number) {
    ArchiveObject* const self = AsArchive(object);
    uint64_t index = PyLong_AsUnsignedLongLong(number);
    if (PyErr_Occurred() != nullptr) return nullptr;
    LibraryCall call(self);
    if (!HasTree(self, &call)) return nullptr;
    zarvo_entry entry = ZARVO_ENTRY_INIT;
    while (zarvo_get_entry(self->archive, index, &entry) == ZARVO_OK) {
        if (!IsFound(self, index)) {
            ++index;
            continue;
        }
        PyObject* const path = DecodePath({entry.path, entry.path_length});
        if (path == nullptr) return nullptr;
        Py_XDECREF(std::exchange(self->foundPath, Py_NewRef(path)));
        self->foundIndex = index;
        return Py_BuildValue("KN", index, path);
    }
    return Py_NewRef(Py_None);
}

PyObject* GetKind(PyObject* object, PyObject* number) {
    ArchiveObject* const self = AsArchive(object);
    const uint64_t index = PyLong_AsUnsignedLongLong(number);
    if (PyErr_Occurred() != nullptr) return nullptr;
    LibraryCall call(self);
    if (!HasTree(self, &call)) return nullptr;
    zarvo_item item = ZARVO_ITEM_INIT;
    const zarvo_code code = zarvo_get_item(self->archive, index, &item, call.Error());
    return code == ZARVO_OK ? Py_NewRef(s_Kinds[item.kind]) : call.Raise(code, *self->name);
}

PyObject* GetChildren(PyObject* object, PyObject* number) {
    ArchiveObject* const self = AsArchive(object);
    const uint64_t folder = PyLong_AsUnsignedLongLong(number);
    if (PyErr_Occurred() != nullptr) return nullptr;
    LibraryCall call(self);
    if (!HasTree(self, &call)) return nullptr;
    Reference children(PyList_New(0));
    if (children == nullptr) return nullptr;
    zarvo_item item = ZARVO_ITEM_INIT;
    zarvo_code code = zarvo_get_item(self->archive, folder, &item, call.Error());
    for (uint64_t child = item.first_child; code == ZARVO_OK && child != ZARVO_NO_ITEM; child = item.next_sibling) {
        code = zarvo_get_item(self->archive, child, &item, call.Error());
        if (code != ZARVO_OK) break;
        zarvo_entry entry = ZARVO_ENTRY_INIT;
        if (item.is_implied == 0) (void)zarvo_get_entry(self->archive, child, &entry); // there is such an entry
        PyObject* const name = DecodePath({item.name, item.name_length});
        const unsigned long long size = item.kind == ZARVO_FILE ? entry.size : 0;
        if (!AppendTo(children, Py_BuildValue("KNOK", child, name, s_Kinds[item.kind], size))) return nullptr;
    }
    if (code != ZARVO_OK) return call.Raise(code, *self->name);
    return children.release();
}

PyObject* MatchEntries(PyObject* object, PyObject* patterns) {
    ArchiveObject* const self = AsArchive(object);
    LibraryCall call(self);
    if (!HasTree(self, &call)) return nullptr;
    Patterns matcher;
    if (!matcher.Add(patterns)) return nullptr;
    std::vector<uint64_t> matched;
    const bool hasMemory = WithoutInterpreter([&] {
        for (uint64_t index = 0; index < zarvo_entry_count(self->archive); ++index) {
            zarvo_entry entry = ZARVO_ENTRY_INIT;
            (void)zarvo_get_entry(self->archive, index, &entry); // there is such an entry
            const int matches = zarvo_patterns_match(matcher.Get(), entry.path, entry.path_length);
            if (matches < 0) return false;
            if (matches == 1 && IsFound(self, index) && !Append(&matched, index)) return false;
        }
        return true;
    });
    if (!hasMemory) return PyErr_NoMemory();
    Reference numbers(PyList_New(0));
    if (numbers == nullptr) return nullptr;
    for (const uint64_t index : matched)
        if (!AppendTo(numbers, PyLong_FromUnsignedLongLong(index))) return nullptr;
    return numbers.release();
}

PyObject* ReadEntry(PyObject* object, PyObject* const* arguments, Py_ssize_t argumentCount) {
    if (argumentCount != 3) {
        PyErr_SetString(PyExc_TypeError, "read takes index, offset and size");
        return nullptr;
    }
    ArchiveObject* const self = AsArchive(object);
    const uint64_t index = PyLong_AsUnsignedLongLong(arguments[0]);
    const uint64_t offset = PyLong_AsUnsignedLongLong(arguments[1]);
    const Py_ssize_t size = PyLong_AsSsize_t(arguments[2]);
    if (PyErr_Occurred() != nullptr) return nullptr;
    Reference bytes(PyBytes_FromStringAndSize(nullptr, size));
    if (bytes == nullptr) return nullptr;
    char* const buffer = PyBytes_AsString(bytes.get());
    LibraryCall call(self);
    if (!call.IsAllowed()) return nullptr;
    size_t count = 0;
    const zarvo_code code = WithoutInterpreter([&] {
        return zarvo_read(self->archive, index, offset, buffer, static_cast<size_t>(size), &count, call.Error());
    });
    if (code != ZARVO_OK) return call.Raise(code, DescribeEntry(self, index));
    if (count == static_cast<size_t>(size)) return bytes.release();
    return PyBytes_FromStringAndSize(buffer, static_cast<Py_ssize_t>(count));
}
