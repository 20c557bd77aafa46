// The functions of zarvo.h that work on archives: arguments are looked at here, and nowhere below.
#include "Library/Archive.h"
#include "Library/Handles.h"
#include "Library/PathRules.h"
#include "Library/PublicStructures.h"
#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cstring>

constexpr UInt64 kDefaultMaxEntries = UInt64{1} << 26;
constexpr UInt64 kDefaultMaxDirectoryBytes = UInt64{1} << 30;
constexpr UInt64 kDefaultMaxBlockBytes = UInt64{1} << 31;
constexpr UInt64 kDefaultCacheBytes = UInt64{1} << 23;

struct zarvo_stream {
    zarvo_archive* archive;
    UInt64 entry;
    UInt64 position = 0;
    StreamCursor* kept = nullptr;
};

namespace {

zarvo_open_options FillInDefaults(const zarvo_open_options* given) {
    zarvo_open_options options = CopyIn(given);
    if (options.max_entries == 0) options.max_entries = kDefaultMaxEntries;
    if (options.max_directory_bytes == 0) options.max_directory_bytes = kDefaultMaxDirectoryBytes;
    if (options.max_block_bytes == 0) options.max_block_bytes = kDefaultMaxBlockBytes;
    if (options.cache_bytes == 0) options.cache_bytes = kDefaultCacheBytes;
    return options;
}

// openSource: opens a source at an offset, and answers as the functions of Source.h do.
template <typename OpenSource>
zarvo_code OpenArchive(const zarvo_open_options* givenOptions, zarvo_archive** archive, zarvo_error** error,
                       OpenSource&& openSource) {
    InstallMessageHook();
    if (!IsNullOrHasSize(givenOptions)) return RefuseArgument(kNoSize, error);
    Failure failure;
    const zarvo_open_options options = FillInDefaults(givenOptions);
    Owned<Source> source;
    if (const zarvo_code code = openSource(options.offset, &source, &failure); code != ZARVO_OK)
        return Deliver(code, failure, error);
    Owned<zarvo_archive> opened(New<zarvo_archive>(kMemLabelFileSystem, std::move(source), options),
                                kMemLabelFileSystem);
    if (!opened) return Deliver(failure.SetMemory(), failure, error);
    {
        MessageScope scope(opened->Messages());
        if (const zarvo_code code = opened->Open(&failure); code != ZARVO_OK) return Deliver(code, failure, error);
    }
    *archive = opened.release();
    AddHandle(*archive);
    return ZARVO_OK;
}

const EntryIndex* GetIndex(const zarvo_archive* archive, Failure* failure) {
    const EntryIndex* index = nullptr;
    // Building it changes nothing that a caller can see.
    (void)const_cast<zarvo_archive*>(archive)->GetIndex(&index, failure);
    return index;
}

UInt64 PublicItem(UInt32 item) {
    if (item == EntryIndex::kNoItem) return ZARVO_NO_ITEM;
    return item == EntryIndex::kRoot ? ZARVO_ROOT : item;
}

// The index, and its number of a caller's item; null after a failure.
const EntryIndex* FindItem(const zarvo_archive* archive, UInt64 item, UInt32* found, Failure* failure) {
    const EntryIndex* const index = GetIndex(archive, failure);
    if (index == nullptr) return nullptr;
    *found = item == ZARVO_ROOT ? EntryIndex::kRoot : static_cast<UInt32>(item);
    if (item == ZARVO_ROOT || item < index->ItemCount()) return index;
    (void)failure->SetArgument("no such item");
    return nullptr;
}

bool IsEntry(const zarvo_archive* archive, UInt64 index) {
    return IsLiveHandle(archive) && index < archive->Nodes().size();
}

constexpr char kNoArchive[] = "no open archive";
constexpr char kNoEntry[] = "no open archive, or no such entry";
constexpr char kNoRoom[] = "a null pointer where a result goes";

} // namespace

const char* zarvo_version(void) { return ZARVO_VERSION_TEXT; }

zarvo_code zarvo_open_path(const char* path, const zarvo_open_options* options, zarvo_archive** archive,
                           zarvo_error** error) {
    if (path == nullptr || archive == nullptr) return RefuseArgument("no path, or no place for the archive", error);
    return OpenArchive(options, archive, error, [&](UInt64 offset, Owned<Source>* source, Failure* failure) {
        return OpenPath(path, offset, source, failure);
    });
}

zarvo_code zarvo_open_descriptor(int descriptor, const zarvo_open_options* options, zarvo_archive** archive,
                                 zarvo_error** error) {
    if (archive == nullptr) return RefuseArgument(kNoRoom, error);
    return OpenArchive(options, archive, error, [&](UInt64 offset, Owned<Source>* source, Failure* failure) {
        return OpenDescriptor(descriptor, offset, source, failure);
    });
}

zarvo_code zarvo_open_memory(const void* data, size_t size, const zarvo_open_options* options, zarvo_archive** archive,
                             zarvo_error** error) {
    if ((data == nullptr && size != 0) || archive == nullptr)
        return RefuseArgument("no data, or no place for the archive", error);
    return OpenArchive(options, archive, error, [&](UInt64 offset, Owned<Source>* source, Failure* failure) {
        return OpenMemory(data, size, offset, source, failure);
    });
}

zarvo_code zarvo_open_source(const zarvo_source* source, const zarvo_open_options* options, zarvo_archive** archive,
                             zarvo_error** error) {
    if (!IsNullOrHasSize(source)) return RefuseArgument(kNoSize, error);
    const zarvo_source callbacks = CopyIn(source);
    const bool isComplete = callbacks.read_at != nullptr && callbacks.get_size != nullptr && archive != nullptr;
    if (!isComplete || !IsNullOrHasSize(options)) {
        if (callbacks.close != nullptr) callbacks.close(callbacks.context);
        return RefuseArgument(
            isComplete ? kNoSize : "no source, a source without its callbacks, or no place for the archive", error);
    }
    return OpenArchive(options, archive, error, [&](UInt64 offset, Owned<Source>* opened, Failure* failure) {
        return OpenCallbacks(callbacks, offset, opened, failure);
    });
}

void zarvo_close(zarvo_archive* archive) {
    if (!IsLiveHandle(archive)) return;
    RemoveHandle(archive);
    Delete(archive, kMemLabelFileSystem);
}

zarvo_code zarvo_get_info(const zarvo_archive* archive, zarvo_info* info) {
    if (!IsLiveHandle(archive) || info == nullptr || !HasSize(info)) return ZARVO_ERROR_ARGUMENT;
    CopyOut(archive->Info(), info);
    return ZARVO_OK;
}

uint64_t zarvo_entry_count(const zarvo_archive* archive) { return IsLiveHandle(archive) ? archive->Nodes().size() : 0; }

zarvo_code zarvo_get_entry(const zarvo_archive* archive, uint64_t index, zarvo_entry* entry) {
    if (!IsEntry(archive, index) || entry == nullptr || !HasSize(entry)) return ZARVO_ERROR_ARGUMENT;
    const zarvo_archive::Node& node = archive->Nodes()[index];
    const bool isFolder = zarvo_archive::IsFolder(node);
    zarvo_entry filled = ZARVO_ENTRY_INIT;
    filled.path = node.path.c_str();
    filled.path_length = node.path.size();
    filled.kind = isFolder ? ZARVO_FOLDER : ZARVO_FILE;
    filled.problem = GetPathProblem(node.path, !isFolder);
    filled.size = node.size;
    filled.offset = node.offset;
    filled.flags = node.flags;
    CopyOut(filled, entry);
    return ZARVO_OK;
}

uint64_t zarvo_item_count(const zarvo_archive* archive) {
    if (!IsLiveHandle(archive)) return 0;
    Failure failure;
    const EntryIndex* index = GetIndex(archive, &failure);
    return index != nullptr ? index->ItemCount() : 0;
}

zarvo_code zarvo_find(const zarvo_archive* archive, const char* path, size_t length, uint64_t* item,
                      zarvo_error** error) {
    if (!IsLiveHandle(archive)) return RefuseArgument(kNoArchive, error);
    if (path == nullptr || item == nullptr) return RefuseArgument("no path, or no place for the item", error);
    Failure failure;
    const EntryIndex* index = GetIndex(archive, &failure);
    if (index == nullptr) return Deliver(failure.code, failure, error);
    const UInt32 found = index->Find({path, length == ZARVO_WHOLE ? strlen(path) : length});
    if (found == EntryIndex::kNoItem)
        return Deliver(failure.Set(ZARVO_ERROR_NOT_FOUND, "no such entry"), failure, error);
    *item = PublicItem(found);
    return ZARVO_OK;
}

zarvo_code zarvo_get_item(const zarvo_archive* archive, uint64_t item, zarvo_item* out, zarvo_error** error) {
    if (!IsLiveHandle(archive)) return RefuseArgument(kNoArchive, error);
    if (out == nullptr) return RefuseArgument(kNoRoom, error);
    if (!HasSize(out)) return RefuseArgument(kNoSize, error);
    Failure failure;
    UInt32 found;
    const EntryIndex* index = FindItem(archive, item, &found, &failure);
    if (index == nullptr) return Deliver(failure.code, failure, error);

    const bool isRoot = found == EntryIndex::kRoot;
    const core::string_ref path = index->Path(found);
    const core::string_ref name = LastComponent(path);
    zarvo_item filled = ZARVO_ITEM_INIT;
    filled.name = isRoot ? "" : name.data();
    filled.name_length = name.size();
    filled.is_implied = isRoot || index->IsImplied(found) ? 1 : 0;
    filled.kind = filled.is_implied || zarvo_archive::IsFolder(archive->Nodes()[found]) ? ZARVO_FOLDER : ZARVO_FILE;
    filled.first_child = PublicItem(index->FirstChild(found));
    filled.next_sibling = isRoot ? ZARVO_NO_ITEM : PublicItem(index->NextSibling(found));
    filled.path_length = index->NormalLength(found);
    CopyOut(filled, out);
    return ZARVO_OK;
}

zarvo_code zarvo_get_item_path(const zarvo_archive* archive, uint64_t item, char* out, zarvo_error** error) {
    if (!IsLiveHandle(archive)) return RefuseArgument(kNoArchive, error);
    if (out == nullptr) return RefuseArgument(kNoRoom, error);
    Failure failure;
    UInt32 found;
    const EntryIndex* index = FindItem(archive, item, &found, &failure);
    if (index == nullptr) return Deliver(failure.code, failure, error);
    const core::string_ref path = index->Path(found);
    out[0] = '\0';
    if (!path.empty()) (void)zarvo_normalize_path(path.data(), path.size(), out);
    return ZARVO_OK;
}

zarvo_code zarvo_read(zarvo_archive* archive, uint64_t index, uint64_t offset, void* buffer, size_t size, size_t* count,
                      zarvo_error** error) {
    if (count != nullptr) *count = 0;
    if (!IsEntry(archive, index)) return RefuseArgument(kNoEntry, error);
    if ((buffer == nullptr && size != 0) || count == nullptr) return RefuseArgument(kNoRoom, error);
    MessageScope scope(archive->Messages());
    Failure failure;
    return Deliver(archive->Read(index, offset, buffer, size, count, nullptr, &failure), failure, error);
}

zarvo_code zarvo_get_readable(zarvo_archive* archive, uint64_t index, uint64_t* readable, zarvo_error** error) {
    constexpr size_t kPieceSize = 262'144;
    if (!IsEntry(archive, index)) return RefuseArgument(kNoEntry, error);
    if (readable == nullptr) return RefuseArgument(kNoRoom, error);
    MessageScope scope(archive->Messages());
    Failure failure;
    dynamic_array<UInt8> piece(kMemLabelGeneral);
    const UInt64 size = zarvo_archive::SizeOf(archive->Nodes()[index]);
    if (!piece.resize_uninitialized(static_cast<size_t>(std::min<UInt64>(size, kPieceSize)), kResizeExact))
        return Deliver(failure.SetMemory(), failure, error);
    StreamCursor* kept = nullptr;
    UInt64 position = 0;
    zarvo_code code = ZARVO_OK;
    while (position < size && code == ZARVO_OK) {
        size_t count = 0;
        code = archive->Read(index, position, piece.data(), piece.size(), &count, &kept, &failure);
        position += count;
    }
    archive->Data().GiveBack(kept);
    if (code != ZARVO_OK && code != ZARVO_ERROR_DAMAGED && code != ZARVO_ERROR_UNSUPPORTED)
        return Deliver(code, failure, error);
    *readable = position;
    return ZARVO_OK;
}

zarvo_code zarvo_stream_open(zarvo_archive* archive, uint64_t index, zarvo_stream** stream, zarvo_error** error) {
    if (!IsEntry(archive, index)) return RefuseArgument(kNoEntry, error);
    if (stream == nullptr) return RefuseArgument(kNoRoom, error);
    zarvo_stream* opened = New<zarvo_stream>(kMemLabelFileSystem, zarvo_stream{archive, index});
    if (opened == nullptr) {
        Failure failure;
        return Deliver(failure.SetMemory(), failure, error);
    }
    AddHandle(opened);
    *stream = opened;
    return ZARVO_OK;
}

zarvo_code zarvo_stream_read(zarvo_stream* stream, void* buffer, size_t size, size_t* count, zarvo_error** error) {
    if (count != nullptr) *count = 0;
    if (!IsLiveHandle(stream) || !IsLiveHandle(stream->archive)) return RefuseArgument("no open stream", error);
    if ((buffer == nullptr && size != 0) || count == nullptr) return RefuseArgument(kNoRoom, error);
    MessageScope scope(stream->archive->Messages());
    Failure failure;
    const zarvo_code code =
        stream->archive->Read(stream->entry, stream->position, buffer, size, count, &stream->kept, &failure);
    stream->position += *count;
    return Deliver(code, failure, error);
}

zarvo_code zarvo_stream_seek(zarvo_stream* stream, uint64_t position) {
    if (!IsLiveHandle(stream)) return ZARVO_ERROR_ARGUMENT;
    stream->position = position;
    return ZARVO_OK;
}

void zarvo_stream_free(zarvo_stream* stream) {
    if (!IsLiveHandle(stream)) return;
    RemoveHandle(stream);
    if (IsLiveHandle(stream->archive)) stream->archive->Data().GiveBack(stream->kept);
    Delete(stream, kMemLabelFileSystem);
}

uint64_t zarvo_block_count(const zarvo_archive* archive) {
    return IsLiveHandle(archive) ? archive->Blocks().BlockCount() : 0;
}

zarvo_code zarvo_get_block(const zarvo_archive* archive, uint64_t index, zarvo_block* block) {
    if (index >= zarvo_block_count(archive) || block == nullptr || !HasSize(block)) return ZARVO_ERROR_ARGUMENT;
    const BlockDecoder::Block found = archive->Blocks().GetBlock(static_cast<UInt32>(index));
    zarvo_block filled = ZARVO_BLOCK_INIT;
    filled.position = found.position;
    filled.size = found.size;
    filled.stored_size = found.storedSize;
    filled.kind = static_cast<SInt32>(found.type);
    filled.is_streamed = found.isStreamed ? 1 : 0;
    CopyOut(filled, block);
    return ZARVO_OK;
}

zarvo_code zarvo_read_block(zarvo_archive* archive, uint64_t index, void* buffer, size_t* count, zarvo_error** error) {
    if (count != nullptr) *count = 0;
    if (index >= zarvo_block_count(archive)) return RefuseArgument("no open archive, or no such block", error);
    const bool hasRoom = buffer != nullptr || archive->Blocks().GetBlock(static_cast<UInt32>(index)).size == 0;
    if (!hasRoom || count == nullptr) return RefuseArgument(kNoRoom, error);
    MessageScope scope(archive->Messages());
    Failure failure;
    return Deliver(archive->Data().ReadBlock(static_cast<UInt32>(index), buffer, count, &failure), failure, error);
}
