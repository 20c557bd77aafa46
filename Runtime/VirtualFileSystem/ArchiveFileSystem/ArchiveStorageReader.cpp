// The reader's set-up and tear-down: opening the file, loading what describes the archive, and learning the directory
// of a ZarvoWeb archive.
#include "Runtime/Utilities/Compression/Lz4Decompressor.h"
#include "Runtime/Utilities/Format.h"
#include "Runtime/Utilities/LogAssert.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/CachedBlock.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ReadAheadFile.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/MemoryFile.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/MultiBlocksMemoryFileData.h"
#include "Runtime/VirtualFileSystem/MemoryFileSystem/SingleBlockMemoryFileData.h"

#include <algorithm>

using namespace ArchiveStorageHeader;

static_assert(kHeaderShortRead == 1 && kHeaderNotAnArchive == -1, "Initialize answers with the parsers' codes");

constexpr UInt64 kMaxFilePosition = ~UInt64{0} >> 1;

ArchiveStorageReader::ArchiveStorageReader(MemLabelId memLabel)
    : ThreadSharedObject(memLabel),
      m_Header(memLabel),
      m_BlocksInfo(memLabel),
      m_DirectoryInfo(memLabel),
      m_UncompressedBlocksOffsets(memLabel),
      m_CompressedBlocksOffsets(memLabel),
      m_NextBlocks(memLabel),
      m_CachedBlocks(memLabel),
      m_BrokenBlocks(memLabel),
      m_Label(memLabel) {}

ArchiveStorageReader::~ArchiveStorageReader() {
    for (CachedBlock* block : m_CachedBlocks) {
        DeinitCachedBlock(block);
        Delete(block, m_Label);
    }
    for (std::atomic<IDecompressor*>& decompressor : m_Decompressors)
        Delete(decompressor.load(std::memory_order_relaxed), m_Label); // no other thread uses the reader any more
}

int ArchiveStorageReader::Initialize(const core::string& path, VFS::FileSize offset) {
    if (path.size() > kMaxPathLength) {
        // An entry would cut the path and name another file.
        ReportError(Format("Unable to open archive file: %s", path.c_str()).c_str());
        return kHeaderNotAnArchive;
    }
    FileSystemEntry entry(path);
    return Initialize(entry, offset, true, true);
}

int ArchiveStorageReader::Initialize(FileSystemEntry& entry, VFS::FileSize offset, bool canReleaseStorage,
                                     bool reportErrors) {
    m_Storage.SetEntry(entry, canReleaseStorage);
    if (!MakeStorageUsed(reportErrors)) return kHeaderNotAnArchive;

    HeaderResult result = ReadHeader(offset.Cast<UInt64>());
    if (result == kHeaderOk && !BuildOffsetTables()) result = kHeaderShortRead;
    if (result != kHeaderOk) {
        if (result == kHeaderNotAnArchive && reportErrors)
            ReportError(Format("Unable to read header from archive file: %s", entry.Path()).c_str());
        MakeStorageUnused();
        return result;
    }
    const FileSystemError timeError = m_Storage.GetEntry().lastError;
    if (timeError != kFileSystemErrorNone && timeError != kFileSystemErrorNotSupported)
        ReportFailedCheck(Format("Unexpected FileSystemError code %i after call to FileSystemEntry::LastModified() \n",
                                 static_cast<int>(timeError))
                              .c_str());
    return kHeaderOk;
}

bool ArchiveStorageReader::MakeStorageUsed(bool reportErrors) { return m_Storage.MakeUsed(reportErrors); }

void ArchiveStorageReader::MakeStorageUnused() {
    if (m_Storage.MakeUnused()) EmptyCache();
}

CompressionType ArchiveStorageReader::GetBlockType(UInt32 blockIndex) const {
    if (blockIndex == kNoBlock) return kCompressionNone;
    const UInt32 flags = m_BlocksInfo.storageBlocks[blockIndex].flags;
    return static_cast<CompressionType>(flags & kStorageBlockCompressionTypeMask);
}

bool ArchiveStorageReader::IsBlockStreamed(UInt32 blockIndex) const {
    return blockIndex != kNoBlock && (m_BlocksInfo.storageBlocks[blockIndex].flags & kStorageBlockStreamed) != 0;
}

// Whether a read may skip a block: it holds no data, and reading it could not fail.
static bool CanBeLeftOut(const StorageBlock& block) {
    if (block.uncompressedSize != 0) return false;
    const UInt32 type = block.flags & kStorageBlockCompressionTypeMask;
    if (type == kCompressionNone) return true;
    if ((block.flags & kStorageBlockStreamed) != 0) return type == kCompressionLzma;
    return block.compressedSize == 0 && type < kCompressionReserved;
}

bool ArchiveStorageReader::BuildOffsetTables() {
    const size_t count = m_BlocksInfo.storageBlocks.size();
    if (!m_UncompressedBlocksOffsets.resize_uninitialized(count + 1, kResizeExact)) return false;
    if (!m_CompressedBlocksOffsets.resize_uninitialized(count + 1, kResizeExact)) return false;
    m_UncompressedBlocksOffsets[0] = 0;
    m_CompressedBlocksOffsets[0] = 0;
    for (size_t index = 0; index < count; ++index) {
        const StorageBlock& block = m_BlocksInfo.storageBlocks[index];
        m_UncompressedBlocksOffsets[index + 1] = m_UncompressedBlocksOffsets[index] + block.uncompressedSize;
        m_CompressedBlocksOffsets[index + 1] = m_CompressedBlocksOffsets[index] + block.compressedSize;
    }

    if (std::none_of(m_BlocksInfo.storageBlocks.begin(), m_BlocksInfo.storageBlocks.end(), CanBeLeftOut)) return true;
    if (!m_NextBlocks.resize_uninitialized(count + 1, kResizeExact)) return false;
    m_NextBlocks[count] = static_cast<UInt32>(count);
    for (size_t index = count; index-- > 0;)
        m_NextBlocks[index] =
            CanBeLeftOut(m_BlocksInfo.storageBlocks[index]) ? m_NextBlocks[index + 1] : static_cast<UInt32>(index);
    return true;
}

// Lets the parsers read a file that no handler serves. The caller keeps the file until the accessor is closed.
static bool OpenFile(IFile* file, FileAccessor* accessor) {
    FileEntryData data;
    data.accessorHandler = RequireMemory(New<IFileAdapter>(kMemLabelGeneral, file, kMemLabelGeneral, false));
    FileSystemEntry entry(data);
    return accessor->Open(entry, kFilePermissionRead);
}

HeaderResult ArchiveStorageReader::ReadHeader(UInt64 offset) {
    FileAccessor& archive = m_Storage.GetFile();
    if (!archive.Seek(VFS::FileOffset(VFS::FileSize(offset)), kFileOriginBegin)) return kHeaderNotAnArchive;
    ReadAheadFile ahead(&archive);
    FileAccessor file;
    if (!OpenFile(&ahead, &file)) return kHeaderNotAnArchive;
    if (ReadHeaderSignature(file, m_Header) != kHeaderOk) return kHeaderNotAnArchive;

    HeaderResult result;
    if (m_Header.signature == kSignatureArchive || m_Header.signature == kSignatureRaw) {
        result = ReadAll(file, m_Header, m_BlocksInfo, m_DirectoryInfo);
        SetDirectoryReady(result == kHeaderOk);
    } else if (m_Header.signature == kSignatureWeb) {
        result = ReadHeaderAndBlocksInfo_ZarvoWebAndZarvoRaw(file, m_Header, m_BlocksInfo);
        SetDirectoryReady(false);
    } else {
        result = ReadBlockBasedHeader(file, offset);
    }
    if (result != kHeaderOk) return result;

    const UInt64 dataOffset = GetDataOffset(m_Header);
    if (offset > kMaxFilePosition - dataOffset) return kHeaderShortRead;
    if (!archive.Seek(VFS::FileOffset(VFS::FileSize(dataOffset + offset)), kFileOriginBegin)) return kHeaderShortRead;
    m_Storage.SetDataOffset(dataOffset + offset);

    if (m_Header.signature == kSignatureWeb && !m_BlocksInfo.storageBlocks.empty()) {
        UInt32& compressedSize = m_BlocksInfo.storageBlocks[0].compressedSize;
        // A smaller block has no size field.
        if (compressedSize > kLzmaSizeFieldSize) {
            m_Storage.HideLzmaSizeField();
            compressedSize -= kLzmaSizeFieldSize;
        }
    }
    return kHeaderOk;
}

HeaderResult ArchiveStorageReader::ReadBlockBasedHeader(FileAccessor& file, UInt64 offset) {
    if (const HeaderResult result = ArchiveStorageHeader::ReadHeader(file, m_Header); result != kHeaderOk)
        return result;

    const UInt64 sectionOffset = GetBlocksInfoOffset(m_Header);
    if (sectionOffset > kMaxFilePosition || offset > kMaxFilePosition - sectionOffset) {
        VFS::ReportValueTooLarge();
        return kHeaderShortRead;
    }
    if (!file.Seek(VFS::FileOffset(VFS::FileSize(sectionOffset + offset)), kFileOriginBegin)) return kHeaderShortRead;

    const auto type = static_cast<CompressionType>(m_Header.flags & kArchiveCompressionTypeMask);
    if (type != kCompressionNone) return ReadCompressedBlocksInfo(file, type);
    Check(m_Header.compressedBlocksInfoSize == m_Header.uncompressedBlocksInfoSize,
          "Archive file has invalid uncompressed header size!");
    return ReadBlocksInfoSection(file);
}

// Reads the block list and, when the header says so, the directory that follows it.
HeaderResult ArchiveStorageReader::ReadBlocksInfoSection(FileAccessor& file) {
    HeaderResult result = ReadBlocksInfo(file, m_Header, m_BlocksInfo);
    if (result == kHeaderOk && (m_Header.flags & kArchiveDirectoryInBlocksInfo) != 0)
        result = ReadDirectoryInfo(file, m_Header, m_DirectoryInfo);
    SetDirectoryReady(result == kHeaderOk);
    return result;
}

namespace {

// A buffer for one call, on the stack when it is small. Null when the size is 0 or memory is refused.
class ScratchBuffer : private NonCopyable {
public:
    explicit ScratchBuffer(size_t size) {
        if (size >= sizeof(m_Stack))
            m_Heap = {
                static_cast<char*>(malloc_internal(size, 1, kMemLabelGeneral, kAllocateOptionNone, __FILE__, __LINE__)),
                kMemLabelGeneral};
        m_Data = size == 0 ? nullptr : size < sizeof(m_Stack) ? m_Stack : m_Heap.get();
    }

    void* Data() { return m_Data; }

private:
    char m_Stack[2000];
    Owned<char> m_Heap;
    char* m_Data;
};

// LZ4 makes at most this many bytes of one; a header that promises more is damaged.
constexpr UInt64 kMaxLz4Expansion = 255;

bool IsPossibleSize(CompressionType type, UInt64 compressedSize, UInt64 uncompressedSize) {
    const bool isLz4 = type == kCompressionLz4 || type == kCompressionLz4HC;
    // The decompressor itself refuses and reports sizes that it doesn't take.
    return !isLz4 || uncompressedSize >= Lz4Decompressor::kSizeLimit ||
           uncompressedSize <= compressedSize * kMaxLz4Expansion;
}

} // namespace

HeaderResult ArchiveStorageReader::ReadCompressedBlocksInfo(FileAccessor& file, CompressionType type) {
    const Owned<IDecompressor> decompressor(CreateDecompressor(type, kMemLabelGeneral), kMemLabelGeneral);
    if (!decompressor) return kHeaderNotAnArchive;

    const size_t compressedSize = m_Header.compressedBlocksInfoSize;
    const size_t uncompressedSize = m_Header.uncompressedBlocksInfoSize;
    if (!IsPossibleSize(type, compressedSize, uncompressedSize)) return kHeaderShortRead;

    ScratchBuffer compressed(compressedSize);
    if (compressedSize != 0) {
        UInt64 delivered = 0;
        if (compressed.Data() == nullptr || !file.Read(compressedSize, compressed.Data(), &delivered) ||
            delivered != compressedSize)
            return kHeaderShortRead;
    }
    ScratchBuffer uncompressed(uncompressedSize);
    if (uncompressed.Data() == nullptr && uncompressedSize != 0) return kHeaderShortRead;
    size_t consumed = compressedSize;
    size_t produced = uncompressedSize;
    if (!decompressor->DecompressMemory(compressed.Data(), &consumed, uncompressed.Data(), &produced) ||
        produced != uncompressedSize)
        return kHeaderShortRead;

    FileSystemEntry section = MemoryFile::CreateFileSystemEntry(kMemLabelGeneral, kFilePermissionRead,
                                                                uncompressed.Data(), uncompressedSize, false);
    FileAccessor sectionFile;
    if (!sectionFile.Open(section, kFilePermissionRead)) return kHeaderShortRead;
    return ReadBlocksInfoSection(sectionFile);
}

bool ArchiveStorageReader::FindDirectory(DirectoryPieces pieces) {
    if (IsDirectoryReady()) return true;
    dynamic_array<UInt8> piece(kMemLabelGeneral);
    if (!piece.resize_uninitialized(kDirectoryPieceSize, kResizeExact)) return false;
    const bool isWhole = pieces == kDirectoryPiecesWhole;
    // Through the cache, a stream that is cut short still delivers the bytes it holds.
    const FileReadFlags flags = isWhole ? kFileReadFlagsNone : kFileReadFlagsThroughCache;
    UInt64 position = m_DirectoryScanner.Position();
    while (!IsDirectoryReady() && CanDirectoryBecomeReady()) {
        const UInt64 rest = m_UncompressedBlocksOffsets.back() - position;
        UInt64 delivered = 0;
        if (!Read(position, isWhole ? kDirectoryPieceSize : std::min(kDirectoryPieceSize, rest), piece.data(),
                  &delivered, flags))
            return false;
        position += delivered;
    }
    return IsDirectoryReady();
}

bool ArchiveStorageReader::CanDirectoryBecomeReady() const {
    return m_DirectoryScanner.CanCompleteWithin(m_UncompressedBlocksOffsets.back());
}

// Publishes the directory: a thread that sees it ready sees all of it.
void ArchiveStorageReader::SetDirectoryReady(bool isReady) {
    m_DirectoryReady.store(isReady, std::memory_order_release);
}

void ArchiveStorageReader::TryToReadDirectoryFromBlockData(UInt64 from, const void* data, size_t size) {
    const UInt64 collected = m_DirectoryFile ? m_DirectoryFile->Size().Cast<UInt64>() : 0;
    // Collect only bytes that follow each other from the start of the stream: a gap would read as an empty directory.
    if (from != collected || from != m_DirectoryScanner.Position()) return;
    const bool isComplete = m_DirectoryScanner.Scan(static_cast<const UInt8*>(data), size);
    // Don't collect a stream that can't hold a directory.
    if (!CanDirectoryBecomeReady()) return;

    if (isComplete && !m_DirectoryFile) {
        // The whole directory lies in the caller's buffer: parse it there.
        auto* contents = RequireMemory(
            New<SingleBlockMemoryFileData>(kMemLabelGeneral, kMemLabelGeneral, const_cast<void*>(data), size, false));
        MemoryFile file(kMemLabelGeneral, contents, kFilePermissionRead);
        contents->Release();
        SetDirectoryReady(TryReadDirectoryInfoFromFile(&file));
        return;
    }

    if (!m_DirectoryFile) {
        auto* contents = RequireMemory(
            New<MultiBlocksMemoryFileData>(m_Label, m_Label, MultiBlocksMemoryFileData::kDefaultBlockSize));
        m_DirectoryFile = {RequireMemory(New<MemoryFile>(m_Label, m_Label, contents, kFilePermissionReadWrite)),
                           m_Label};
        contents->Release();
    }
    UInt64 written = 0;
    if (!m_DirectoryFile->Write(VFS::FileSize(from), size, data, &written) || written != size) return;
    if (!isComplete) return;
    SetDirectoryReady(TryReadDirectoryInfoFromFile(m_DirectoryFile.get()));
    if (IsDirectoryReady()) m_DirectoryFile = {};
}

bool ArchiveStorageReader::TryReadDirectoryInfoFromFile(IFile* file) {
    FileAccessor accessor;
    if (!OpenFile(file, &accessor)) return false;
    (void)accessor.Seek(0, kFileOriginBegin); // a memory file has a start
    return ReadDirectoryInfo(accessor, m_Header, m_DirectoryInfo) == kHeaderOk;
}
