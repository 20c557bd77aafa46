// Properties of zarvo.h, whatever the bytes are: every range, stream and readable size is what the blocks give that are
// read whole; where the runtime's reader delivers a byte, too, it is the same. An archive that the writer has made and
// nobody has touched gives every byte of its stream. The tree leads to each item once, and back. A source that fails,
// lies or changes does no harm, and is closed once.
#include "Fuzz/FuzzArchives.h"
#include "Library/include/zarvo.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include <algorithm>
#include <cstring>
#include <memory>
#include <optional>
#include <string>
#include <sys/mman.h>
#include <unistd.h>

namespace {

constexpr UInt64 kMaxData = kMaxFuzzStream; // archives that say they have more are only walked
constexpr UInt64 kMaxBlocks = 1'000;
constexpr UInt64 kMaxEntries = 6; // that are read
constexpr UInt64 kMaxItems = 2'000;

// The runtime's reader on a file that holds the bytes: at its end, a MemoryFile reads otherwise than a source.
struct ReaderOfFile {
    explicit ReaderOfFile(const FuzzInput& bytes)
        : descriptor(memfd_create("archive", 0)), reader(kMemLabelFileSystem) {
        FuzzCheck(descriptor >= 0 &&
                  write(descriptor, bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size()));
        const std::string path = "/proc/self/fd/" + std::to_string(descriptor);
        result = reader.Initialize(core::string(path.c_str()), 0);
    }
    ~ReaderOfFile() { close(descriptor); }

    const int descriptor;
    ArchiveStorageReader reader;
    int result;
};

struct CloseArchive {
    void operator()(zarvo_archive* archive) const { zarvo_close(archive); }
};
using OwnedArchive = std::unique_ptr<zarvo_archive, CloseArchive>;

bool IsDamage(zarvo_code code) {
    return code == ZARVO_ERROR_DAMAGED || code == ZARVO_ERROR_UNSUPPORTED || code == ZARVO_ERROR_LIMIT;
}

// What the blocks give when each is read whole: the model that everything else is held against.
class DataModel {
public:
    explicit DataModel(zarvo_archive* archive) {
        for (UInt64 index = 0; index < zarvo_block_count(archive); ++index) {
            zarvo_block block = ZARVO_BLOCK_INIT;
            FuzzCheck(zarvo_get_block(archive, index, &block) == ZARVO_OK);
            FuzzCheck(block.position == m_Bytes.size());
            m_Bytes.resize(m_Bytes.size() + block.size);
            size_t count = 0;
            std::vector<UInt8> bytes(block.size + size_t{1}); // no null pointer for none
            const zarvo_code code = zarvo_read_block(archive, index, bytes.data(), &count, nullptr);
            FuzzCheck(code == ZARVO_OK ? count == block.size : IsDamage(code) && count <= block.size);
            std::copy_n(bytes.data(), count, m_Bytes.data() + block.position);
            m_Blocks.push_back({block.position + count, block.position + block.size});
        }
    }

    // How many of size bytes from position on are delivered.
    UInt64 Count(UInt64 position, UInt64 size) const {
        if (size == 0 || position >= m_Bytes.size()) return 0;
        const UInt64 end = position + std::min(size, m_Bytes.size() - position);
        UInt64 at = position;
        for (const Block& block : m_Blocks) {
            if (block.end <= at) continue;
            at = std::max(at, std::min(block.readableEnd, end));
            if (at < block.end) break;
        }
        return at - position;
    }

    const std::vector<UInt8>& Bytes() const { return m_Bytes; }

private:
    struct Block {
        UInt64 readableEnd;
        UInt64 end;
    };
    std::vector<UInt8> m_Bytes;
    std::vector<Block> m_Blocks;
};

struct File {
    UInt64 index;
    UInt64 offset;
    UInt64 size;
};

// What is read of a file from some byte on is what the model says.
void CheckDelivered(const DataModel& model, const File& file, UInt64 from, UInt64 wanted, const UInt8* bytes,
                    UInt64 count, zarvo_code code) {
    wanted = from < file.size ? std::min(wanted, file.size - from) : 0;
    const UInt64 position = from <= ~file.offset ? file.offset + from : ~UInt64{0};
    FuzzCheck(count == model.Count(position, wanted));
    FuzzCheck(code == ZARVO_OK ? count == wanted : IsDamage(code) && count < wanted);
    FuzzCheck(count == 0 || memcmp(bytes, model.Bytes().data() + position, static_cast<size_t>(count)) == 0);
}

void CheckFile(zarvo_archive* archive, const DataModel& model, const File& file, FuzzInput& input) {
    std::vector<UInt8> buffer(static_cast<size_t>(std::min(file.size, kMaxData)) + 1);
    const UInt64 room = buffer.size();
    size_t count = 0;
    zarvo_code code = zarvo_read(archive, file.index, 0, buffer.data(), buffer.size(), &count, nullptr);
    CheckDelivered(model, file, 0, room, buffer.data(), count, code);

    uint64_t readable = 0;
    code = zarvo_get_readable(archive, file.index, &readable, nullptr);
    FuzzCheck(code == ZARVO_OK || code == ZARVO_ERROR_LIMIT);
    if (code == ZARVO_OK) FuzzCheck(readable == model.Count(file.offset, file.size));

    zarvo_stream* streams[2] = {};
    UInt64 positions[2] = {};
    for (zarvo_stream*& stream : streams)
        FuzzCheck(zarvo_stream_open(archive, file.index, &stream, nullptr) == ZARVO_OK);
    for (int round = 0; round < 8; ++round) {
        const UInt64 from = input.TakeBelow(room + 1);
        const UInt64 size = input.TakeBelow(room);
        code = zarvo_read(archive, file.index, from, buffer.data(), static_cast<size_t>(size), &count, nullptr);
        CheckDelivered(model, file, from, size, buffer.data(), count, code);

        const UInt64 choice = input.TakeBelow(4);
        zarvo_stream* const stream = streams[choice & 1];
        UInt64& position = positions[choice & 1];
        if (choice < 2) FuzzCheck(zarvo_stream_seek(stream, position = from) == ZARVO_OK);
        code = zarvo_stream_read(stream, buffer.data(), static_cast<size_t>(size), &count, nullptr);
        CheckDelivered(model, file, position, size, buffer.data(), count, code);
        position += count;
    }
    for (zarvo_stream* stream : streams)
        zarvo_stream_free(stream);
}

void CheckEntriesAndBlocks(zarvo_archive* archive) {
    zarvo_info info = ZARVO_INFO_INIT;
    FuzzCheck(zarvo_get_info(archive, &info) == ZARVO_OK);
    FuzzCheck(info.entry_count == zarvo_entry_count(archive) && info.block_count == zarvo_block_count(archive));
    UInt64 folders = 0;
    for (UInt64 index = 0; index < info.entry_count; ++index) {
        zarvo_entry entry = ZARVO_ENTRY_INIT;
        FuzzCheck(zarvo_get_entry(archive, index, &entry) == ZARVO_OK);
        FuzzCheck(entry.path[entry.path_length] == '\0' && strlen(entry.path) == entry.path_length);
        folders += entry.kind == ZARVO_FOLDER ? 1 : 0;
    }
    FuzzCheck(info.folder_count == folders && info.file_count == info.entry_count - folders);
    UInt64 size = 0;
    UInt64 stored = 0;
    for (UInt64 index = 0; index < info.block_count; ++index) {
        zarvo_block block = ZARVO_BLOCK_INIT;
        FuzzCheck(zarvo_get_block(archive, index, &block) == ZARVO_OK && block.position == size);
        size += block.size;
        stored += block.stored_size;
    }
    FuzzCheck(info.data_size == size && info.stored_size == stored);
}

// Returns how many items are below a folder.
UInt64 CheckTree(zarvo_archive* archive, UInt64 folder, const std::string& folderPath, UInt64 left) {
    zarvo_item item = ZARVO_ITEM_INIT;
    FuzzCheck(zarvo_get_item(archive, folder, &item, nullptr) == ZARVO_OK);
    UInt64 below = 0;
    for (UInt64 child = item.first_child; child != ZARVO_NO_ITEM; child = item.next_sibling) {
        FuzzCheck(below < left); // else it goes round
        FuzzCheck(zarvo_get_item(archive, child, &item, nullptr) == ZARVO_OK);
        std::string path = folderPath;
        if (!path.empty()) path += '/';
        path.append(item.name, item.name_length);
        std::string written(item.path_length, '?');
        FuzzCheck(zarvo_get_item_path(archive, child, written.data(), nullptr) == ZARVO_OK && written == path);
        uint64_t found = 0;
        FuzzCheck(zarvo_find(archive, path.data(), path.size(), &found, nullptr) == ZARVO_OK && found == child);
        below += 1 + CheckTree(archive, child, path, left - below - 1);
    }
    return below;
}

// Where the runtime's reader delivers bytes, they are the model's.
void CheckAgainstReader(const FuzzInput& bytes, const DataModel& model, FuzzInput& input) {
    ReaderOfFile opened(bytes);
    FuzzCheck(opened.result == 0);
    std::vector<UInt8> range;
    for (int round = 0; round < 8; ++round) {
        const UInt64 from = input.TakeBelow(model.Bytes().size() + 1);
        range.resize(static_cast<size_t>(input.TakeBelow(model.Bytes().size() - from + 1)));
        UInt64 delivered = 0;
        if (range.empty() || !opened.reader.Read(from, range.size(), range.data(), &delivered)) continue;
        const UInt64 both = std::min(delivered, model.Count(from, range.size()));
        FuzzCheck(both == 0 || memcmp(range.data(), model.Bytes().data() + from, static_cast<size_t>(both)) == 0);
    }
}

void CheckOpenArchive(zarvo_archive* archive, const FuzzInput& bytes, FuzzInput& input, const std::string* stream) {
    CheckEntriesAndBlocks(archive);
    if (zarvo_item_count(archive) <= kMaxItems) CheckTree(archive, ZARVO_ROOT, "", zarvo_item_count(archive));
    zarvo_info info = ZARVO_INFO_INIT;
    FuzzCheck(zarvo_get_info(archive, &info) == ZARVO_OK);
    if (info.data_size > kMaxData || info.block_count > kMaxBlocks) return;

    const DataModel model(archive);
    if (stream != nullptr) {
        FuzzCheck(model.Count(0, stream->size()) == stream->size() && model.Bytes().size() == stream->size());
        FuzzCheck(memcmp(model.Bytes().data(), stream->data(), stream->size()) == 0);
    }
    for (UInt64 index = 0; index < std::min<UInt64>(info.entry_count, kMaxEntries); ++index) {
        zarvo_entry entry = ZARVO_ENTRY_INIT;
        FuzzCheck(zarvo_get_entry(archive, index, &entry) == ZARVO_OK);
        CheckFile(archive, model, {index, entry.offset, entry.kind == ZARVO_FILE ? entry.size : 0}, input);
    }
    CheckAgainstReader(bytes, model, input);
}

// The bytes of an archive, as a source that now and then fails, lies or changes.
struct FaultySource {
    FuzzInput bytes;
    FuzzInput faults;
    int closed = 0;

    static int64_t ReadAt(void* context, void* buffer, size_t size, uint64_t offset) {
        auto* const self = static_cast<FaultySource*>(context);
        const UInt64 start = std::min<UInt64>(offset, self->bytes.size());
        UInt64 count = std::min<UInt64>(size, self->bytes.size() - start);
        if (count != 0) memcpy(buffer, self->bytes.data() + start, static_cast<size_t>(count));
        switch (self->faults.TakeBelow(256)) {
        case 1: return -EIO;
        case 2: return INT64_MIN;
        case 3: return static_cast<int64_t>(size) + 1;
        case 4: return 0;
        case 5: count /= 2; break;
        case 6:
            if (count != 0) static_cast<UInt8*>(buffer)[count / 2] ^= 0x10;
            break;
        default: break;
        }
        return static_cast<int64_t>(count);
    }
    static int GetSize(void* context, uint64_t* size) {
        auto* const self = static_cast<FaultySource*>(context);
        *size = self->bytes.size();
        switch (self->faults.TakeBelow(32)) {
        case 1: return -EIO;
        case 2: return INT32_MIN;
        case 3: return 1;
        case 4: *size = UINT64_MAX; break;
        case 5: *size /= 2; break;
        default: break;
        }
        return 0;
    }
    static void Close(void* context) { ++static_cast<FaultySource*>(context)->closed; }
};

void UseFaultySource(const FuzzInput& bytes, const FuzzInput& input, const zarvo_open_options& options) {
    FaultySource source{bytes, input};
    zarvo_source callbacks = ZARVO_SOURCE_INIT;
    callbacks.context = &source;
    callbacks.read_at = FaultySource::ReadAt;
    callbacks.get_size = FaultySource::GetSize;
    callbacks.close = FaultySource::Close;
    zarvo_archive* archive = nullptr;
    if (zarvo_open_source(&callbacks, &options, &archive, nullptr) == ZARVO_OK) {
        CheckEntriesAndBlocks(archive);
        zarvo_info info = ZARVO_INFO_INIT;
        FuzzCheck(zarvo_get_info(archive, &info) == ZARVO_OK);
        std::vector<UInt8> buffer(10'000);
        for (UInt64 index = 0; info.data_size <= kMaxData && index < std::min<UInt64>(info.entry_count, kMaxEntries);
             ++index) {
            zarvo_stream* stream = nullptr;
            FuzzCheck(zarvo_stream_open(archive, index, &stream, nullptr) == ZARVO_OK);
            for (int round = 0; round < 20; ++round) {
                size_t count = 0;
                // Any answer will do: the source decides.
                (void)zarvo_stream_read(stream, buffer.data(), buffer.size(), &count, nullptr);
                FuzzCheck(count <= buffer.size());
            }
            zarvo_stream_free(stream);
        }
        zarvo_close(archive);
    } else {
        FuzzCheck(archive == nullptr);
    }
    FuzzCheck(source.closed == 1);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    [[maybe_unused]] static const bool isSilent = (SilenceConsole(), true);
    FuzzInput input(data, size);
    zarvo_open_options options = ZARVO_OPEN_OPTIONS_INIT;
    options.max_directory_bytes = kMaxData;
    const UInt64 mode = input.TakeBelow(8);
    // A small one lets blocks be decoded piece by piece that else are whole.
    if (input.TakeBelow(2) == 1) options.max_block_bytes = 1 + input.TakeBelow(10'000);
    if (input.TakeBelow(2) == 1) options.cache_bytes = 1 + input.TakeBelow(100'000);

    std::optional<BuiltArchive> built;
    FuzzInput bytes = input;
    if (mode == 1) {
        options.max_block_bytes = 0; // every block can be read
        built = BuildArchiveFrom(input);
        bytes = FuzzInput(reinterpret_cast<const UInt8*>(built->bytes.data()), built->bytes.size());
    }
    if (mode == 2) {
        UseFaultySource(bytes, input, options);
        return 0;
    }
    zarvo_archive* opened = nullptr;
    const zarvo_code code = zarvo_open_memory(bytes.data(), bytes.size(), &options, &opened, nullptr);
    const OwnedArchive archive(opened);
    FuzzCheck((code == ZARVO_OK) == (opened != nullptr));
    if (code != ZARVO_ERROR_LIMIT) {
        ReaderOfFile reader(bytes);
        FuzzCheck((code == ZARVO_OK) == (reader.result == 0 && reader.reader.FindDirectory()));
    }
    FuzzCheck(!built || code == ZARVO_OK);
    if (code == ZARVO_OK) CheckOpenArchive(opened, bytes, input, built ? &built->stream : nullptr);
    return 0;
}
