// An archive as one readable stream of uncompressed data. The reader opens the file, loads header, block list and
// directory, and serves any range of the stream, decompressing blocks on demand and keeping them in a small cache.
//
//   ArchiveStorageReader reader(kMemLabelFileSystem);
//   if (reader.Initialize(core::string("archive.zarvo"), 0) != 0 || !reader.FindDirectory()) return;
//   for (const ArchiveStorageHeader::Node& node : reader.GetDirectoryInfo().nodes) {
//       UInt64 count = 0;
//       if (!reader.Read(node.offset, node.size, buffer, &count)) ...   // damaged
//       if (count < node.size) ...                                      // read on from node.offset + count
//   }
//
// Threads: once Initialize has returned 0, Read, MakeStorageUsed and MakeStorageUnused may be called from any thread.
// While IsDirectoryReady is false (a ZarvoWeb archive keeps its directory inside the compressed data), only one thread
// calls FindDirectory or reads, until it is true. The object is shared by reference count.
//
// States by operations (n: calls of MakeStorageUsed less those of MakeStorageUnused; Initialize counts as one):
//
//            MakeStorageUsed           MakeStorageUnused                              Read
//   n < 1    n + 1; at 0 opens         reported, n - 1                                fails at the file
//   n = 1    n + 1                     n 0, closes the file, then empties the cache   delivers
//   n > 1    n + 1                     n - 1                                          delivers
//
// Locks: Storage locks the open file for itself and never calls the reader; m_CacheLock guards the list of cached
// blocks. So no operation holds both. No lock is held while data is decompressed, and m_CacheLock is not held while the
// file is read.
#pragma once

#include "Runtime/Allocator/Owned.h"
#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/Core/Containers/String.h"
#include "Runtime/Core/SharedObject.h"
#include "Runtime/Threads/Mutex.h"
#include "Runtime/Threads/ThreadAnnotations.h"
#include "Runtime/Utilities/Compression/Compression.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/BrokenBlocks.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/LegacyDirectoryScanner.h"
#include "Runtime/VirtualFileSystem/IFile.h"
#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include <atomic>

class MemoryFile;

class ArchiveStorageReader : public ThreadSharedObject<ArchiveStorageReader> {
public:
    // An idle reader. Everything that it allocates for itself carries label.
    explicit ArchiveStorageReader(MemLabelId label);
    virtual ~ArchiveStorageReader();

    // Opens the archive that starts at byte offset of the file and loads what describes it. 0 on success; -1 when the
    // file can't be used as an archive; 1 when a seek, a read or the decompression of the blocks info failed. A reader
    // whose Initialize failed may only be destroyed.
    [[nodiscard]] int Initialize(const core::string& path, VFS::FileSize offset);

    // canReleaseStorage: whether MakeStorageUnused may close the file. reportErrors: whether a file that can't be
    // opened, has been changed or has an unreadable header is reported as an error.
    [[nodiscard]] int Initialize(FileSystemEntry& entry, VFS::FileSize offset, bool canReleaseStorage,
                                 bool reportErrors);

    // A pair of calls brackets a time of use: the file is open while there have been more calls of MakeStorageUsed than
    // of MakeStorageUnused (Initialize counts as one of the first). MakeStorageUsed is false when the file can't be
    // opened or has been changed since Initialize; even then, call MakeStorageUnused for it. The end of the last use
    // also empties the cache, so no read may be under way.
    [[nodiscard]] bool MakeStorageUsed(bool reportErrors);
    void MakeStorageUnused();

    // Copies bytes [from, from + size) of the data stream into buffer and sets *read to the number delivered, which is
    // less than size when the archive is damaged or cut short. True when at least one byte was delivered, or when size
    // is 0 and from lies inside the stream; after false, *read is unchanged or 0. A range that passes the end of the
    // stream is refused whole.
    [[nodiscard]] bool Read(VFS::FileSize from, UInt64 size, void* buffer, UInt64* read,
                            FileReadFlags flags = kFileReadFlagsNone);

    const ArchiveStorageHeader::Header& GetHeader() const { return m_Header; }
    const ArchiveStorageHeader::DirectoryInfo& GetDirectoryInfo() const { return m_DirectoryInfo; }

    // Whether GetDirectoryInfo holds the archive's directory.
    bool IsDirectoryReady() const { return m_DirectoryReady.load(std::memory_order_acquire); }

    // The pieces in which FindDirectory reads the stream: kDirectoryPieceSize bytes each.
    enum DirectoryPieces {
        kDirectoryPiecesUpToTheEnd, // the last one may be shorter
        kDirectoryPiecesWhole,      // a directory that ends in a shorter last piece is not found
    };
    static constexpr UInt64 kDirectoryPieceSize = 65'536;

    // Makes GetDirectoryInfo hold the directory. If that lies inside the compressed data, reads the stream from its
    // start, as far as needed. False when the stream holds no directory, when the data up to its end is damaged, or
    // when memory is refused. Call it once Initialize has returned 0, from one thread, and with no other read under
    // way.
    [[nodiscard]] bool FindDirectory(DirectoryPieces pieces = kDirectoryPiecesUpToTheEnd);

    // False once the bytes read so far show that the stream holds no directory, so that reading on is useless. For
    // callers that read the stream themselves, from its start and in order; other reads don't count. Call it once
    // Initialize has returned 0, from the thread that reads.
    bool CanDirectoryBecomeReady() const;

    // For tools that work block by block: one storage block, and where it lies. The numbers are the archive's own,
    // compared with nothing: a piece may pass the end of the file, and a size may exceed the memory there is. Before
    // you use a piece, check that offset <= fileSize && size <= fileSize - offset; offset + size may wrap.
    struct Block {
        struct Piece {
            UInt64 offset; // in the file, whatever the archive's own offset in it
            UInt64 size;
        };

        UInt64 position;      // of its first byte, in the data stream
        UInt32 size;          // in the data stream; 0 is allowed
        UInt32 storedSize;    // of the pieces together
        CompressionType type; // 0 to 63: also kinds that have no decompressor
        bool isStreamed;      // decompressed from its start on, as one stream; false for a block stored as is

        // The stored bytes, in order. The second piece is empty except in a ZarvoWeb archive, where 8 bytes between the
        // LZMA properties and the coded data belong to neither piece. Read takes size bytes of a block stored as is,
        // whatever storedSize says. The stored bytes are plain, too, when the block is not streamed, its two sizes are
        // equal and its type has a decompressor.
        Piece pieces[2];
    };

    // Blocks in the order of the data stream. Once Initialize has returned 0, from any thread; index is below the
    // count.
    UInt32 GetBlockCount() const { return static_cast<UInt32>(m_BlocksInfo.storageBlocks.size()); }
    Block GetBlock(UInt32 index) const;

private:
    friend struct ArchiveStorageReaderTestAccess;

    struct CachedBlock;       // CachedBlock.h
    class BatchingFileReader; // BatchingFileReader.h

    enum CacheResult : SInt32 {
        kCacheResultReadError = -2,
        kCacheResultDecompressError = -1, // or no decompressor, or the wrong size
        kCacheResultOk = 0,
        kCacheResultIncomplete = 1, // stored bytes, or the stream, ended early
    };

    // The archive file, how many use it, and where its data starts. Positions are those of stored bytes: 0 is the first
    // byte of block 0. The lock is private and no operation calls the reader, so nobody can hold it together with
    // m_CacheLock; and nobody calls Storage under m_CacheLock. In ArchiveStorageReaderStorage.cpp.
    class Storage {
    public:
        // Set-up, while no other thread uses the reader; so these take no lock.
        void SetEntry(FileSystemEntry& entry, bool canRelease) VARNEX_NO_THREAD_SAFETY_ANALYSIS;
        FileAccessor& GetFile() VARNEX_NO_THREAD_SAFETY_ANALYSIS { return m_File; }
        const FileSystemEntry& GetEntry() const VARNEX_NO_THREAD_SAFETY_ANALYSIS { return m_Entry; }
        void SetDataOffset(UInt64 dataOffset) { m_DataOffset = dataOffset; }
        void HideLzmaSizeField() { m_HideLzmaSizeField = true; }

        // See MakeStorageUsed and MakeStorageUnused.
        [[nodiscard]] bool MakeUsed(bool reportErrors);
        // Whether the file has been closed.
        [[nodiscard]] bool MakeUnused();

        [[nodiscard]] bool ReadFromStorage(UInt64 position, UInt64 size, void* destination, UInt64* delivered);
        // Whether the file ends at or before this position.
        bool EndsBy(UInt64 position);
        // Where stored bytes lie in the file: pieces[1] is empty unless they lie on both sides of a hidden field.
        void Locate(UInt64 position, UInt64 size, Block::Piece (&pieces)[2]) const;

    private:
        FileSystemEntry m_Entry VARNEX_GUARDED_BY(m_Lock); // queries of it leave a code in it
        FileAccessor m_File VARNEX_GUARDED_BY(m_Lock);
        SInt32 m_UseCount VARNEX_GUARDED_BY(m_Lock) = 0;
        Mutex m_Lock;
        UInt64 m_DataOffset = 0; // in the file, of the first stored byte of block 0
        // ZarvoWeb: positions are counted as if the 8 bytes after the 5 bytes of LZMA properties were not there.
        bool m_HideLzmaSizeField = false;
        bool m_CanRelease = true;
        bool m_CheckModificationTime = true;
        DateTime m_LastModified;
    };

    static constexpr UInt32 kNoBlock = ~UInt32{0};
    static constexpr UInt32 kStreamWindowSize = 65'536; // of output, and of the input pieces that it is made from
    static constexpr UInt32 kLzmaPropertiesSize = 5;
    static constexpr UInt32 kLzmaSizeFieldSize = 8; // after the properties, in ZarvoWeb archives

    // Set-up, in ArchiveStorageReader.cpp. Runs while no other thread uses the reader, so it takes no lock.
    ArchiveStorageHeader::HeaderResult ReadHeader(UInt64 offset);
    ArchiveStorageHeader::HeaderResult ReadBlockBasedHeader(FileAccessor& file, UInt64 offset);
    ArchiveStorageHeader::HeaderResult ReadCompressedBlocksInfo(FileAccessor& file, CompressionType type);
    ArchiveStorageHeader::HeaderResult ReadBlocksInfoSection(FileAccessor& file);
    [[nodiscard]] bool BuildOffsetTables();
    void SetDirectoryReady(bool isReady);
    void TryToReadDirectoryFromBlockData(UInt64 from, const void* data, size_t size);
    [[nodiscard]] bool TryReadDirectoryInfoFromFile(IFile* file);

    // Blocks, in ArchiveStorageReader.cpp. kNoBlock counts as stored as is, and not streamed.
    CompressionType GetBlockType(UInt32 blockIndex) const;
    bool IsBlockStreamed(UInt32 blockIndex) const;

    // Reads, in ArchiveStorageReaderRead.cpp.
    bool FindBlock(UInt64 position, UInt32* blockIndex) const;
    UInt32 NextBlock(UInt32 blockIndex) const;
    bool ReadCompleteBlock(UInt32 blockIndex, void* destination, UInt64* delivered, BatchingFileReader* batch);
    bool ReadBlock(UInt32 blockIndex, UInt64 offsetInBlock, UInt64 size, void* destination, UInt64* delivered,
                   BatchingFileReader* batch);

    // The block cache, in ArchiveStorageReaderCache.cpp.
    CachedBlock* AcquireCachedBlock(UInt32 blockIndex, UInt32 offsetInBlock);
    CachedBlock* AcquireAndPrefillUnusedBlock(UInt32 blockIndex, CacheResult* result, BatchingFileReader* reader);
    CachedBlock* FindChunk(UInt32 blockIndex) VARNEX_REQUIRES(m_CacheLock);
    CachedBlock* ClaimStream(UInt32 blockIndex, UInt32 offsetInBlock) VARNEX_REQUIRES(m_CacheLock);
    CachedBlock* ClaimVictim() VARNEX_REQUIRES(m_CacheLock);
    CachedBlock* AddCachedBlock() VARNEX_REQUIRES(m_CacheLock);
    CacheResult CopyFromCachedBlock(CachedBlock* record, UInt64 offsetInBlock, UInt64 size, void* destination,
                                    UInt64* delivered, BatchingFileReader* reader);
    void ReleaseCachedBlock(CachedBlock* block, CacheResult result);
    void ReinitCachedBlock(CachedBlock* block, UInt32 blockIndex);
    void DeinitCachedBlock(CachedBlock* block);
    CacheResult FillStreamCachedBlock(CachedBlock* block, UInt64 maxSize, BatchingFileReader* reader);
    CacheResult LoadStreamInput(CachedBlock* block, UInt64 brokenFrom, BatchingFileReader* reader);
    CacheResult FillChunkCachedBlock(CachedBlock* block, BatchingFileReader* reader);
    void StampCachedBlock(CachedBlock* block);
    void EmptyCache();
    void NoteBrokenBlock(const BrokenBlocks::Record& record);
    void NoteBrokenStream(const CachedBlock& block, UInt64 from);
    BrokenBlocks::Record FindBrokenBlock(UInt32 blockIndex);
    IDecompressor* GetDecompressor(CompressionType type);

    ArchiveStorageHeader::Header m_Header;
    ArchiveStorageHeader::BlocksInfo m_BlocksInfo;
    ArchiveStorageHeader::DirectoryInfo m_DirectoryInfo;

    // Block count + 1 entries each, once initialised: where block i starts in the data stream, and where its stored
    // bytes start; the last entry is the end.
    dynamic_array<UInt64> m_UncompressedBlocksOffsets;
    dynamic_array<UInt64> m_CompressedBlocksOffsets;

    // For each block and the end, the first block from it on that a read can't leave out. Empty when no block can be
    // left out.
    dynamic_array<UInt32> m_NextBlocks;

    Owned<MemoryFile> m_DirectoryFile; // the start of the stream, until a directory can be parsed from it
    LegacyDirectoryScanner m_DirectoryScanner;
    std::atomic<bool> m_DirectoryReady{false};
    Storage m_Storage;

    dynamic_array<CachedBlock*> m_CachedBlocks VARNEX_GUARDED_BY(m_CacheLock); // owned
    // A stream is noted as broken from its end on when it has failed only as a whole, in one window.
    BrokenBlocks m_BrokenBlocks VARNEX_GUARDED_BY(m_CacheLock);
    std::atomic<bool> m_HasBrokenBlocks{false};
    Mutex m_CacheLock;
    std::atomic<UInt32> m_AccessCounter{0};

    std::atomic<IDecompressor*> m_Decompressors[kCompressionCount] = {}; // owned; made on first use
    MemLabelId m_Label;
};
