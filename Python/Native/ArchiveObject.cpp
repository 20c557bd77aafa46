#include "ArchiveObject.h"

#include "Creation.h"
#include "Entries.h"
#include "Errors.h"
#include "Runs.h"
#include "StreamObject.h"

#include <set>
#include <utility>

// All that live. Never destroyed: programs that embed Python may drop archives after the static objects.
static std::set<ArchiveObject*>& s_Archives = *new std::set<ArchiveObject*>;

static PyObject* s_ArchiveType = nullptr;

LibraryCall::~LibraryCall() {
    zarvo_error_free(m_Error);
    if (--m_Archive->calls == 0 && m_Archive->source != nullptr) m_Archive->source->DropExceptions();
}

bool LibraryCall::IsAllowed() const {
    if (!m_Archive->isLost) return true;
    SetError(ZARVO_ERROR_ARGUMENT, 0, "another thread was using the archive when this process was forked",
             *m_Archive->name);
    return false;
}

PyObject* LibraryCall::Raise(zarvo_code code, const std::string& subject) {
    const int systemCode = zarvo_error_errno(m_Error);
    if (PyObject* exception = m_Archive->source == nullptr ? nullptr : m_Archive->source->FindException(systemCode)) {
        RestoreError(Reference(exception));
        return nullptr;
    }
    return SetError(code, systemCode, zarvo_error_text(m_Error), subject);
}

std::string DescribeEntry(const ArchiveObject* self, uint64_t index) {
    zarvo_entry entry = ZARVO_ENTRY_INIT;
    if (zarvo_get_entry(self->archive, index, &entry) != ZARVO_OK) return *self->name;
    return *self->name + ": " + std::string(entry.path, entry.path_length);
}

PyObject* MarkLostArchives(PyObject*, PyObject*) {
    for (ArchiveObject* archive : s_Archives)
        archive->isLost = archive->isLost || archive->calls != 0;
    return Py_NewRef(Py_None);
}

namespace {

// ---- Opening

// Opens an archive by a function of the library, which gets a pointer for the archive and one for the error.
template <typename Open>
PyObject* OpenWith(PyObject* name, std::unique_ptr<PythonSource> source, Open open) {
    const Reference nameBytes = EncodePath(name);
    if (nameBytes == nullptr) return nullptr;
    auto* const self = PyObject_GC_New(ArchiveObject, reinterpret_cast<PyTypeObject*>(s_ArchiveType));
    if (self == nullptr) return nullptr;
    Reference owner(reinterpret_cast<PyObject*>(self));
    self->archive = nullptr;
    self->source = source.release();
    self->name = nullptr;
    self->calls = 0;
    self->hasTree = false;
    self->foundPath = nullptr;
    self->foundIndex = 0;
    self->isLost = false;
    self->name = new std::string(GetBytes(nameBytes)); // now that the object can be dropped
    s_Archives.insert(self);
    PyObject_GC_Track(self);

    LibraryCall call(self);
    zarvo_archive* archive = nullptr;
    const zarvo_code code = WithoutInterpreter([&] { return open(&archive, call.Error()); });
    if (code != ZARVO_OK) return call.Raise(code, *self->name);
    self->archive = archive;
    return owner.release();
}

// A converter of PyArg_ParseTuple ("O&"): stores the tuple (offset, max_entries, max_directory_bytes, max_block_bytes,
// cache_bytes) in a zarvo_open_options.
int ConvertOptions(PyObject* numbers, void* options) {
    auto* const stored = static_cast<zarvo_open_options*>(options);
    return PyArg_ParseTuple(numbers, "O&O&O&O&O&", ConvertCount, &stored->offset, ConvertCount, &stored->max_entries,
                            ConvertCount, &stored->max_directory_bytes, ConvertCount, &stored->max_block_bytes,
                            ConvertCount, &stored->cache_bytes);
}

PyObject* OpenPath(PyObject*, PyObject* arguments) {
    PyObject* path = nullptr;
    PyObject* name = nullptr;
    zarvo_open_options options = ZARVO_OPEN_OPTIONS_INIT;
    if (!PyArg_ParseTuple(arguments, "O&UO&", PyUnicode_FSConverter, &path, &name, ConvertOptions, &options))
        return nullptr;
    const Reference owned(path);
    const char* const text = PyBytes_AsString(path);
    return OpenWith(name, nullptr, [&](zarvo_archive** archive, zarvo_error** error) {
        return zarvo_open_path(text, &options, archive, error);
    });
}

PyObject* OpenDescriptor(PyObject*, PyObject* arguments) {
    int descriptor = -1;
    PyObject* name = nullptr;
    zarvo_open_options options = ZARVO_OPEN_OPTIONS_INIT;
    if (!PyArg_ParseTuple(arguments, "iUO&", &descriptor, &name, ConvertOptions, &options)) return nullptr;
    return OpenWith(name, nullptr, [&](zarvo_archive** archive, zarvo_error** error) {
        return zarvo_open_descriptor(descriptor, &options, archive, error);
    });
}

PyObject* OpenSource(PyObject*, PyObject* arguments) {
    PyObject* readAt = nullptr;
    uint64_t size = 0;
    PyObject* name = nullptr;
    zarvo_open_options options = ZARVO_OPEN_OPTIONS_INIT;
    if (!PyArg_ParseTuple(arguments, "OO&UO&", &readAt, ConvertCount, &size, &name, ConvertOptions, &options))
        return nullptr;
    auto source = std::make_unique<PythonSource>(readAt, size);
    const zarvo_source callbacks = source->MakeCallbacks();
    return OpenWith(name, std::move(source), [&](zarvo_archive** archive, zarvo_error** error) {
        return zarvo_open_source(&callbacks, &options, archive, error);
    });
}

// ---- Life

int Traverse(PyObject* object, visitproc visit, void* arg) {
    Py_VISIT(Py_TYPE(object));
    const PythonSource* const source = AsArchive(object)->source;
    return source == nullptr ? 0 : source->Traverse(visit, arg);
}

int Clear(PyObject* object) {
    if (AsArchive(object)->source != nullptr) AsArchive(object)->source->Clear();
    return 0;
}

void Deallocate(PyObject* object) {
    PyObject_GC_UnTrack(object);
    ArchiveObject* const self = AsArchive(object);
    s_Archives.erase(self);
    if (self->archive != nullptr && !self->isLost)
        (void)WithoutInterpreter([&] {
            zarvo_close(self->archive);
            return 0;
        });
    Py_XDECREF(self->foundPath);
    delete self->source;
    delete self->name;
    PyTypeObject* const type = Py_TYPE(object);
    PyObject_GC_Del(object);
    Py_DECREF(type);
}

PyMethodDef s_Methods[] = {
    {"info", Guarded<GetInfo>::Call, METH_NOARGS, nullptr},
    {"data_size", Guarded<GetDataSize>::Call, METH_NOARGS, nullptr},
    {"entry_count", Guarded<GetEntryCount>::Call, METH_NOARGS, nullptr},
    {"entry", Guarded<GetEntry>::Call, METH_O, nullptr},
    {"find", Guarded<FindItem>::Call, METH_O, nullptr},
    {"find_entry", Guarded<FindEntry>::Call, METH_O, nullptr},
    {"count_found", Guarded<CountFound>::Call, METH_NOARGS, nullptr},
    {"next_found", Guarded<NextFound>::Call, METH_O, nullptr},
    {"kind", Guarded<GetKind>::Call, METH_O, nullptr},
    {"children", Guarded<GetChildren>::Call, METH_O, nullptr},
    {"match", Guarded<MatchEntries>::Call, METH_O, nullptr},
    {"read", reinterpret_cast<PyCFunction>(reinterpret_cast<void (*)()>(Guarded<ReadEntry>::Call)), METH_FASTCALL,
     nullptr},
    {"open_stream", Guarded<OpenStream>::Call, METH_O, nullptr},
    {"extract", Guarded<ExtractArchive>::Call, METH_VARARGS, nullptr},
    {"test", Guarded<TestArchive>::Call, METH_VARARGS, nullptr},
    {nullptr, nullptr, 0, nullptr},
};

PyType_Slot s_Slots[] = {
    {Py_tp_methods, s_Methods},
    {Py_tp_traverse, reinterpret_cast<void*>(Traverse)},
    {Py_tp_clear, reinterpret_cast<void*>(Clear)},
    {Py_tp_dealloc, reinterpret_cast<void*>(Deallocate)},
    {0, nullptr},
};

PyType_Spec s_Spec = {"zarvo._native.Archive", sizeof(ArchiveObject), 0,
                      Py_TPFLAGS_DEFAULT | Py_TPFLAGS_HAVE_GC | Py_TPFLAGS_DISALLOW_INSTANTIATION, s_Slots};

PyMethodDef s_Functions[] = {
    {"open_path", Guarded<OpenPath>::Call, METH_VARARGS, nullptr},
    {"open_descriptor", Guarded<OpenDescriptor>::Call, METH_VARARGS, nullptr},
    {"open_source", Guarded<OpenSource>::Call, METH_VARARGS, nullptr},
    {"create", Guarded<CreateArchive>::Call, METH_VARARGS, nullptr},
    {nullptr, nullptr, 0, nullptr},
};

} // namespace

bool AddArchiveType(PyObject* module) {
    s_ArchiveType = PyType_FromSpec(&s_Spec);
    return s_ArchiveType != nullptr && LoadKinds() && PyModule_AddFunctions(module, s_Functions) == 0 &&
           PyModule_AddObjectRef(module, "Archive", s_ArchiveType) == 0;
}
