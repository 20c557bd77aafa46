#include "Library/Archive.h"

#include "Runtime/Allocator/Allocator.h"

#include <algorithm>

using namespace ArchiveStorageHeader;

zarvo_archive::zarvo_archive(Owned<Source> source, const zarvo_open_options& options)
    : m_Options(options),
      m_Messages(options.log, options.log_context),
      m_Source(std::move(source)),
      m_File(m_Source.get()),
      m_Reader(kMemLabelFileSystem),
      m_Blocks(&m_Reader, m_Source.get()),
      m_Cache(&m_Blocks, options.cache_bytes),
      m_Index(m_Reader.GetDirectoryInfo().nodes) {}

zarvo_code zarvo_archive::Open(Failure* failure) {
    const UInt64 refusedBefore = CountRefusedRequests();
    const zarvo_code code = SetUp(failure);
    // The reader does not say what it has failed for: memory, or the file, whose failure it may take for its end.
    if (code == ZARVO_ERROR_NOT_AN_ARCHIVE && CountRefusedRequests() != refusedBefore) return failure->SetMemory();
    if (m_File.FirstFailure().code != ZARVO_OK) *failure = m_File.FirstFailure();
    if (code != ZARVO_OK || failure->code != ZARVO_OK) return failure->code;
    if (Nodes().size() > m_Options.max_entries)
        return failure->Set(ZARVO_ERROR_LIMIT, "%llu entries; the limit (max_entries) is %llu",
                            static_cast<unsigned long long>(Nodes().size()),
                            static_cast<unsigned long long>(m_Options.max_entries));
    if (const UInt64 bytes = DirectoryBytes(); bytes > m_Options.max_directory_bytes)
        return RefuseDirectory(bytes, failure);
    m_Data = {New<DataReader>(kMemLabelFileSystem, &m_Blocks, &m_Cache, m_Options.max_block_bytes),
              kMemLabelFileSystem};
    if (!m_Data) return failure->SetMemory();
    DescribeBlocks();
    DescribeEntries();
    return ZARVO_OK;
}

// An entry that opens the source, for the runtime's reader and parsers.
bool zarvo_archive::MakeEntry(FileSystemEntry* entry) {
    FileEntryData data;
    data.accessorHandler = New<IFileAdapter>(kMemLabelGeneral, &m_File, kMemLabelGeneral, false);
    *entry = FileSystemEntry(data);
    return data.accessorHandler != nullptr;
}

zarvo_code zarvo_archive::SetUp(Failure* failure) {
    if (const zarvo_code code = CheckDirectorySize(failure); code != ZARVO_OK) return code;
    FileSystemEntry entry;
    if (!MakeEntry(&entry)) return failure->SetMemory();
    const int result = m_Reader.Initialize(entry, VFS::FileSize(UInt64{0}), false, false);
    if (result == kHeaderNotAnArchive) return failure->Set(ZARVO_ERROR_NOT_AN_ARCHIVE, "not a Zarvo archive");
    if (result != kHeaderOk)
        return failure->Set(ZARVO_ERROR_NOT_AN_ARCHIVE, "the archive's header or directory is damaged");
    return FindDirectory(failure);
}

// Looks at a block-based header before the reader does, which asks for all the memory that it names.
zarvo_code zarvo_archive::CheckDirectorySize(Failure* failure) {
    FileSystemEntry entry;
    FileAccessor file;
    if (!MakeEntry(&entry)) return failure->SetMemory();
    Header header(kMemLabelGeneral);
    const bool isBlockBased = file.Open(entry, kFilePermissionRead) && file.Seek(0, kFileOriginBegin) &&
                              ReadHeaderSignature(file, header) == kHeaderOk && header.signature == kSignature &&
                              ReadHeader(file, header) == kHeaderOk;
    if (!isBlockBased || header.uncompressedBlocksInfoSize <= m_Options.max_directory_bytes) return ZARVO_OK;
    return RefuseDirectory(header.uncompressedBlocksInfoSize, failure);
}

zarvo_code zarvo_archive::RefuseDirectory(UInt64 bytes, Failure* failure) const {
    return failure->Set(ZARVO_ERROR_LIMIT, "a directory of %llu bytes; the limit (max_directory_bytes) is %llu",
                        static_cast<unsigned long long>(bytes),
                        static_cast<unsigned long long>(m_Options.max_directory_bytes));
}

// The directory and the list of blocks, as they are stored; 0 for the block-based layout: CheckDirectorySize has looked
// at its header.
UInt64 zarvo_archive::DirectoryBytes() const {
    const core::string& signature = m_Reader.GetHeader().signature;
    const bool hasLongNodes = signature == kSignatureArchive;
    if (!hasLongNodes && signature != kSignatureWeb && signature != kSignatureRaw) return 0;
    const UInt64 bytesOfNode = 1 + (hasLongNodes ? 20 : 8); // beside the path
    UInt64 bytes = hasLongNodes ? UInt64{24} * m_Blocks.BlockCount() : 0;
    for (const Node& node : Nodes())
        bytes += node.path.size() + bytesOfNode;
    return bytes;
}

// A ZarvoWeb archive keeps its directory at the start of its data.
zarvo_code zarvo_archive::FindDirectory(Failure* failure) {
    constexpr UInt64 kPieceSize = ArchiveStorageReader::kDirectoryPieceSize;
    if (m_Reader.IsDirectoryReady()) return ZARVO_OK;
    dynamic_array<UInt8> piece(kMemLabelGeneral);
    if (!piece.resize_uninitialized(kPieceSize, kResizeExact)) return failure->SetMemory();
    const UInt64 dataSize = m_Blocks.DataSize();
    UInt64 position = 0;
    while (!m_Reader.IsDirectoryReady()) {
        if (position >= m_Options.max_directory_bytes)
            return failure->Set(ZARVO_ERROR_LIMIT,
                                "the directory does not end in %llu bytes, which is the limit (max_directory_bytes)",
                                static_cast<unsigned long long>(m_Options.max_directory_bytes));
        UInt64 delivered = 0;
        if (!m_Reader.Read(position, std::min(kPieceSize, dataSize - position), piece.data(), &delivered) ||
            !m_Reader.CanDirectoryBecomeReady())
            return failure->Set(ZARVO_ERROR_NOT_AN_ARCHIVE, "the archive's data does not begin with a directory");
        position += delivered;
    }
    return ZARVO_OK;
}

void zarvo_archive::DescribeBlocks() {
    for (UInt32 index = 0; index < m_Blocks.BlockCount(); ++index) {
        const BlockDecoder::Block block = m_Blocks.GetBlock(index);
        ++m_Info.block_count;
        m_Info.data_size += block.size;
        m_Info.stored_size += block.storedSize;
        m_Info.largest_block = std::max<UInt64>(m_Info.largest_block, block.size);
        if (block.isStreamed) ++m_Info.streamed_blocks;
        switch (block.type) {
        case kCompressionNone: ++m_Info.blocks_none; break;
        case kCompressionLzma: ++m_Info.blocks_lzma; break;
        case kCompressionLz4: ++m_Info.blocks_lz4; break;
        case kCompressionLz4HC: ++m_Info.blocks_lz4hc; break;
        default: ++m_Info.blocks_unknown; break;
        }
    }
}

void zarvo_archive::DescribeEntries() {
    const Header& header = m_Reader.GetHeader();
    m_Info.layout = ZARVO_LAYOUT_FS;
    if (header.signature == kSignatureWeb) m_Info.layout = ZARVO_LAYOUT_WEB;
    if (header.signature == kSignatureRaw) m_Info.layout = ZARVO_LAYOUT_RAW;
    if (header.signature == kSignatureArchive) m_Info.layout = ZARVO_LAYOUT_ARCHIVE;
    m_Info.version = header.version;
    m_Info.engine_version = header.engineVersion.c_str();
    m_Info.engine_revision = header.engineRevision.c_str();
    m_Info.recorded_size = header.size;
    m_Info.file_size = m_Source->Size();
    m_Info.entry_count = Nodes().size();
    for (const Node& node : Nodes()) {
        ++(IsFolder(node) ? m_Info.folder_count : m_Info.file_count);
        if (__builtin_add_overflow(m_Info.file_bytes, SizeOf(node), &m_Info.file_bytes)) m_Info.file_bytes = UINT64_MAX;
    }
}

zarvo_code zarvo_archive::GetIndex(const EntryIndex** index, Failure* failure) {
    if (!m_HasIndex.load(std::memory_order_acquire)) {
        Mutex::AutoLock lock(m_IndexLock);
        if (!m_HasIndex.load(std::memory_order_relaxed)) {
            if (const zarvo_code code = m_Index.Build(failure); code != ZARVO_OK) return code;
            m_HasIndex.store(true, std::memory_order_release); // the index comes before it
        }
    }
    *index = &m_Index;
    return ZARVO_OK;
}

zarvo_code zarvo_archive::Read(UInt64 entry, UInt64 offset, void* buffer, size_t size, size_t* count,
                               StreamCursor** kept, Failure* failure) {
    *count = 0;
    const Node& node = Nodes()[entry];
    const UInt64 fileSize = SizeOf(node);
    if (offset >= fileSize) return ZARVO_OK;
    const size_t wanted = static_cast<size_t>(std::min<UInt64>(size, fileSize - offset));
    // Where the sum wraps, the entry lies outside the data in any case.
    UInt64 position = 0;
    if (__builtin_add_overflow(node.offset, offset, &position)) position = UINT64_MAX;
    return m_Data->Read(position, buffer, wanted, count, kept, failure);
}
