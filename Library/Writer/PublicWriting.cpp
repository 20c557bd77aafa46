// The functions of zarvo.h that make archives: arguments are looked at here, and nowhere below.
#include "Library/Handles.h"
#include "Library/PathRules.h"
#include "Library/PublicStructures.h"
#include "Library/Source.h"
#include "Library/Writer/Creation.h"
#include "Runtime/Allocator/Allocator.h"

#include <cstring>

// The entries of a caller, whose bytes come from sources.
struct zarvo_writer final : public EntrySource {
    ~zarvo_writer() override {
        for (Source* source : m_Sources)
            Delete(source, kMemLabelFileSystem);
    }

    EntryList& Entries() { return m_Entries; }

    // Adds a file, and takes over its source. False when memory is refused.
    [[nodiscard]] bool AddFile(core::string_ref path, Owned<Source> source) {
        const size_t count = m_Sources.size();
        if (!m_Sources.try_push_back(source.get())) return false;
        if (!m_Entries.Add(path, 0, source->Size(), static_cast<UInt32>(count))) {
            m_Sources.pop_back();
            return false;
        }
        (void)source.release(); // it is in m_Sources
        return true;
    }

    [[nodiscard]] bool PrepareToRead(UInt32) override { return true; }

    zarvo_code Read(UInt32, const EntryList&, const EntryList::Entry& entry, UInt64 offset, UInt8* bytes, size_t size,
                    Failure* failure) override {
        size_t count = 0;
        const zarvo_code code = m_Sources[entry.source]->ReadAt(offset, bytes, size, &count, failure);
        if (code != ZARVO_OK || count == size) return code;
        return failure->Set(ZARVO_ERROR_CHANGED, "the source ends too early");
    }

private:
    EntryList m_Entries;
    dynamic_array<Source*> m_Sources{kMemLabelFileSystem};
};

namespace {

// CopyIn, where no options at all mean the defaults.
zarvo_create_options CopyOptions(const zarvo_create_options* given) {
    const zarvo_create_options defaults = ZARVO_CREATE_OPTIONS_INIT;
    return CopyIn(given != nullptr ? given : &defaults);
}

// fill: (creation, failure) -> code; adds the entries, and writes them.
template <typename Fill>
zarvo_code Create(const char* path, const zarvo_run_options* options, const zarvo_create_options* how,
                  zarvo_summary* summary, zarvo_error** error, Fill&& fill) {
    if (!IsNullOrHasSize(options) || !IsNullOrHasSize(how) || !IsNullOrHasSize(summary))
        return RefuseArgument(kNoSize, error);
    const zarvo_run_options run = CopyIn(options);
    const zarvo_create_options given = CopyOptions(how);
    if (path == nullptr) return RefuseArgument("no path for the archive", error);
    if (run.wanted != nullptr) return RefuseArgument("patterns choose only what is left out", error);
    if (run.excluded != nullptr && !IsLiveHandle(run.excluded))
        return RefuseArgument("patterns that have been freed", error);
    Failure failure;
    Creation creation(path, run, given);
    zarvo_code code = creation.ReadOptions(&failure);
    if (code == ZARVO_OK) code = fill(&creation, &failure);
    if (summary != nullptr) CopyOut(creation.Summary(), summary);
    return Deliver(code, failure, error);
}

// Whether a path is as it comes out of an archive again.
bool IsPlainPath(core::string_ref path) {
    size_t size = 0;
    for (PathComponents at(path); at.Next();) {
        if (at.Name() == "..") return false;
        size += at.Name().size() + 1;
    }
    return size == path.size() + 1 && path.find('\\') == core::string_ref::npos &&
           path.find('\0') == core::string_ref::npos;
}

zarvo_code CheckPath(core::string_ref path, Failure* failure) {
    return IsPlainPath(path) ? ZARVO_OK : failure->Set(ZARVO_ERROR_REFUSED, "the path is not in its normal form");
}

core::string_ref PathOf(const char* path, size_t length) {
    return {path, length == ZARVO_WHOLE ? strlen(path) : length};
}

// code: of opening the source.
zarvo_code AddSource(zarvo_writer* writer, core::string_ref path, Owned<Source> source, zarvo_code code,
                     Failure* failure) {
    if (code == ZARVO_OK) code = CheckPath(path, failure);
    if (code != ZARVO_OK) return code;
    return writer->AddFile(path, std::move(source)) ? ZARVO_OK : failure->SetMemory();
}

constexpr char kNoWriter[] = "no writer, or no path";

} // namespace

zarvo_code zarvo_create(const char* path, const char* folder, const zarvo_run_options* options,
                        const zarvo_create_options* how, zarvo_summary* summary, zarvo_error** error) {
    if (folder == nullptr) return RefuseArgument("no folder to read", error);
    return Create(path, options, how, summary, error, [&](Creation* creation, Failure* failure) {
        FolderEntries entries;
        const zarvo_code code = creation->AddFolder(&entries, folder, failure);
        return code == ZARVO_OK ? creation->Write(&entries, failure) : code;
    });
}

zarvo_code zarvo_writer_new(zarvo_writer** writer, zarvo_error** error) {
    if (writer == nullptr) return RefuseArgument("no place for the writer", error);
    zarvo_writer* const made = New<zarvo_writer>(kMemLabelFileSystem);
    if (made == nullptr) {
        Failure failure;
        return Deliver(failure.SetMemory(), failure, error);
    }
    AddHandle(made);
    *writer = made;
    return ZARVO_OK;
}

zarvo_code zarvo_writer_add_memory(zarvo_writer* writer, const char* path, size_t length, const void* data, size_t size,
                                   zarvo_error** error) {
    if (!IsLiveHandle(writer) || path == nullptr) return RefuseArgument(kNoWriter, error);
    if (data == nullptr && size != 0) return RefuseArgument("no data", error);
    Failure failure;
    Owned<Source> source;
    const zarvo_code code = OpenMemory(data, size, 0, &source, &failure);
    return Deliver(AddSource(writer, PathOf(path, length), std::move(source), code, &failure), failure, error);
}

zarvo_code zarvo_writer_add_source(zarvo_writer* writer, const char* path, size_t length, const zarvo_source* source,
                                   zarvo_error** error) {
    const zarvo_source callbacks = CopyIn(source);
    const bool isWhole = callbacks.read_at != nullptr && callbacks.get_size != nullptr;
    if (!IsLiveHandle(writer) || path == nullptr || !isWhole) {
        if (callbacks.close != nullptr) callbacks.close(callbacks.context);
        return RefuseArgument("no writer, no path, or a source without its callbacks", error);
    }
    Failure failure;
    Owned<Source> opened;
    const zarvo_code code = OpenCallbacks(callbacks, 0, &opened, &failure);
    return Deliver(AddSource(writer, PathOf(path, length), std::move(opened), code, &failure), failure, error);
}

zarvo_code zarvo_writer_add_folder(zarvo_writer* writer, const char* path, size_t length, zarvo_error** error) {
    if (!IsLiveHandle(writer) || path == nullptr) return RefuseArgument(kNoWriter, error);
    Failure failure;
    const core::string_ref plain = PathOf(path, length);
    zarvo_code code = CheckPath(plain, &failure);
    if (code == ZARVO_OK && !writer->Entries().Add(plain, EntryList::kFolder, 0)) code = failure.SetMemory();
    return Deliver(code, failure, error);
}

zarvo_code zarvo_writer_write(zarvo_writer* writer, const char* path, const zarvo_run_options* options,
                              const zarvo_create_options* how, zarvo_summary* summary, zarvo_error** error) {
    if (!IsLiveHandle(writer)) return RefuseArgument("no writer", error);
    return Create(path, options, how, summary, error, [&](Creation* creation, Failure* failure) {
        const zarvo_code code = creation->AddEntries(writer->Entries(), failure);
        return code == ZARVO_OK ? creation->Write(writer, failure) : code;
    });
}

void zarvo_writer_free(zarvo_writer* writer) {
    if (!IsLiveHandle(writer)) return;
    RemoveHandle(writer);
    Delete(writer, kMemLabelFileSystem);
}
