#include "StreamObject.h"

#include "ArchiveObject.h"

#include <algorithm>
#include <mutex>

static PyObject* s_StreamType = nullptr;

namespace {

struct StreamObject {
    PyObject base;          // first, as Python asks for
    ArchiveObject* archive; // owned
    zarvo_stream* stream;
    uint64_t index;
    std::mutex* lock; // held while the stream is used
};

StreamObject* AsStream(PyObject* self) { return reinterpret_cast<StreamObject*>(self); }

// Between pieces of this size, the user can interrupt.
constexpr size_t kPieceSize = 1 << 24;

// Reads up to size bytes. False with an exception set, unless bytes before damage were read: the next read tells.
bool ReadPiece(StreamObject* self, char* buffer, size_t size, size_t* count) {
    LibraryCall call(self->archive);
    if (!call.IsAllowed()) return false;
    const zarvo_code code = WithoutInterpreter([&] {
        const std::lock_guard lock(*self->lock);
        return zarvo_stream_read(self->stream, buffer, size, count, call.Error());
    });
    if (code == ZARVO_OK || *count != 0) return true;
    call.Raise(code, DescribeEntry(self->archive, self->index));
    return false;
}

// Fills a buffer, and returns how many bytes were read: fewer only at the end, or before damage.
PyObject* ReadInto(PyObject* self, PyObject* buffer) {
    Py_buffer view;
    if (PyObject_GetBuffer(buffer, &view, PyBUF_WRITABLE) != 0) return nullptr;
    const std::unique_ptr<Py_buffer, decltype(&PyBuffer_Release)> owned(&view, PyBuffer_Release);
    size_t count = 0;
    const bool isRead = ReadPiece(AsStream(self), static_cast<char*>(view.buf), static_cast<size_t>(view.len), &count);
    return isRead ? PyLong_FromSize_t(count) : nullptr;
}

// Up to size bytes: fewer only at the end.
PyObject* Read(PyObject* self, PyObject* number) {
    const Py_ssize_t size = PyLong_AsSsize_t(number);
    if (PyErr_Occurred() != nullptr) return nullptr;
    Reference bytes(PyBytes_FromStringAndSize(nullptr, size));
    if (bytes == nullptr) return nullptr;
    char* const buffer = PyBytes_AsString(bytes.get());
    size_t done = 0;
    while (done < static_cast<size_t>(size)) {
        size_t count = 0;
        const size_t piece = std::min(kPieceSize, static_cast<size_t>(size) - done);
        if (!ReadPiece(AsStream(self), buffer + done, piece, &count) || PyErr_CheckSignals() != 0) return nullptr;
        if (count == 0) return PyBytes_FromStringAndSize(buffer, static_cast<Py_ssize_t>(done));
        done += count;
    }
    return bytes.release();
}

PyObject* Seek(PyObject* object, PyObject* number) {
    StreamObject* const self = AsStream(object);
    const uint64_t position = PyLong_AsUnsignedLongLong(number);
    if (PyErr_Occurred() != nullptr) return nullptr;
    LibraryCall call(self->archive);
    if (!call.IsAllowed()) return nullptr;
    (void)WithoutInterpreter([&] {
        const std::lock_guard lock(*self->lock);
        return zarvo_stream_seek(self->stream, position); // takes any position
    });
    return Py_NewRef(Py_None);
}

int Traverse(PyObject* object, visitproc visit, void* arg) {
    Py_VISIT(Py_TYPE(object));
    Py_VISIT(AsStream(object)->archive);
    return 0;
}

void Deallocate(PyObject* object) {
    PyObject_GC_UnTrack(object);
    StreamObject* const self = AsStream(object);
    if (!self->archive->isLost) {
        LibraryCall call(self->archive);
        (void)WithoutInterpreter([&] {
            zarvo_stream_free(self->stream);
            return 0;
        });
    }
    Py_DECREF(self->archive);
    delete self->lock;
    PyTypeObject* const type = Py_TYPE(object);
    PyObject_GC_Del(object);
    Py_DECREF(type);
}

PyMethodDef s_Methods[] = {
    {"readinto", Guarded<ReadInto>::Call, METH_O, nullptr},
    {"read", Guarded<Read>::Call, METH_O, nullptr},
    {"seek", Guarded<Seek>::Call, METH_O, nullptr},
    {nullptr, nullptr, 0, nullptr},
};

PyType_Slot s_Slots[] = {
    {Py_tp_methods, s_Methods},
    {Py_tp_traverse, reinterpret_cast<void*>(Traverse)},
    {Py_tp_dealloc, reinterpret_cast<void*>(Deallocate)},
    {0, nullptr},
};

PyType_Spec s_Spec = {"zarvo._native.Stream", sizeof(StreamObject), 0,
                      Py_TPFLAGS_DEFAULT | Py_TPFLAGS_HAVE_GC | Py_TPFLAGS_DISALLOW_INSTANTIATION, s_Slots};

} // namespace

bool AddStreamType(PyObject* module) {
    s_StreamType = PyType_FromSpec(&s_Spec);
    return s_StreamType != nullptr && PyModule_AddObjectRef(module, "Stream", s_StreamType) == 0;
}

PyObject* OpenStream(PyObject* archive, PyObject* number) {
    ArchiveObject* const owner = AsArchive(archive);
    const uint64_t index = PyLong_AsUnsignedLongLong(number);
    if (PyErr_Occurred() != nullptr) return nullptr;
    LibraryCall call(owner);
    if (!call.IsAllowed()) return nullptr;
    auto lock = std::make_unique<std::mutex>();
    zarvo_stream* stream = nullptr;
    const zarvo_code code =
        WithoutInterpreter([&] { return zarvo_stream_open(owner->archive, index, &stream, call.Error()); });
    if (code != ZARVO_OK) return call.Raise(code, DescribeEntry(owner, index));
    auto* const self = PyObject_GC_New(StreamObject, reinterpret_cast<PyTypeObject*>(s_StreamType));
    if (self == nullptr) {
        zarvo_stream_free(stream);
        return nullptr;
    }
    Py_INCREF(archive);
    self->archive = owner;
    self->stream = stream;
    self->index = index;
    self->lock = lock.release();
    PyObject_GC_Track(self);
    return reinterpret_cast<PyObject*>(self);
}
