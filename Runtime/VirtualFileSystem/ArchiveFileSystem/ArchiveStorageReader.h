// An archive as one readable stream of uncompressed data. The reader opens the file, loads header, block list and
// directory, and serves any range of the stream, decompressing blocks on demand and keeping them in a small cache.
//
//   ArchiveStorageReader reader(kMemLabelFileSystem);
//   if (reader.Initialize(core::string("archive.zarvo"), 0) != 0 || !reader.FindDirectory()) return;
//   for (const ArchiveStorageHeader::Node& node : reader.GetDirectoryInfo().nodes) {
//       UInt64 count = 0;                                     // may be less than asked: go on from there
//       reader.Read(node.offset, node.size, buffer, &count);
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
// Locks: m_StorageLock guards the open file, m_CacheLock the list of cached blocks. No operation holds both, neither is
// held while data is decompressed, and m_CacheLock is never held while the file is read.
#pragma once

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
                                 bool reportErrors) VARNEX_NO_THREAD_SAFETY_ANALYSIS; // no other thread uses it yet

    // Brackets a time of use: the file is open while there are more calls of the first than of the second (Initialize
    // counts as one call of MakeStorageUsed). False when the file can't be opened or has been changed since Initialize;
    // the call is to be balanced all the same. When the last use ends the cache is emptied, too: no read may be under
    // way then.
    [[nodiscard]] bool MakeStorageUsed(bool reportErrors);
    void MakeStorageUnused();

    // Copies up to size bytes of the data stream, from position from on, into buffer, and stores the number delivered
    // in *read. True when at least one byte was delivered, or when size is 0 and from lies inside the stream. A range
    // that passes the stream's end is refused whole. *read may be less than size when an archive is damaged or cut
    // short; on false it is unchanged or 0.
    bool Read(VFS::FileSize from, UInt64 size, void* buffer, UInt64* read, FileReadFlags flags = kFileReadFlagsNone);

    const ArchiveStorageHeader::Header& GetHeader() const { return m_Header; }
    const ArchiveStorageHeader::DirectoryInfo& GetDirectoryInfo() const { return m_DirectoryInfo; }

    // Whether GetDirectoryInfo holds the archive's directory.
    bool IsDirectoryReady() const { return m_DirectoryReady.load(std::memory_order_acquire); }

    // How FindDirectory cuts the stream.
    enum DirectoryPieces {
        kDirectoryPiecesUpToTheEnd, // the last is as short as the rest of the stream
        kDirectoryPiecesWhole,      // kDirectoryPieceSize each: in a stream with less left, the directory is not found
    };
    static constexpr UInt64 kDirectoryPieceSize = 65'536;

    // Makes sure that GetDirectoryInfo holds the directory: where it lies inside the compressed data, reads the stream
    // in order, as far as is needed. False when there is none to be found, when the data before its end is damaged, or
    // when memory is refused. Once Initialize has returned 0; by one thread, and no other reads meanwhile.
    [[nodiscard]] bool FindDirectory(DirectoryPieces pieces = kDirectoryPiecesUpToTheEnd);

    // False once what has been read shows that the stream holds no directory: reading on is then of no use. For callers
    // that read by themselves, from the start of the stream in order; only what follows the reads before counts. Once
    // Initialize has returned 0; by the thread that makes the reads.
    bool CanDirectoryBecomeReady() const;

    // For tools that work block by block: one storage block, and where it lies. All numbers are the archive's own and
    // nobody has compared them with the file: a piece may pass the file's end, and a size may be more than there is
    // memory for. Before its bytes are used, compare a piece with the file's size, as
    // offset <= fileSize && size <= fileSize - offset; a sum of its own could wrap.
    struct Block {
        struct Piece {
            UInt64 offset; // in the file, whatever the archive's own offset in it
            UInt64 size;
        };

        UInt64 position;      // of its first byte, in the data stream
        UInt32 size;          // in the data stream; 0 is allowed
        UInt32 storedSize;    // of the pieces together
        CompressionType type; // 0 to 63: also kinds that have no decompressor
        bool isStreamed;      // decompressed from its start on, as one stream; never true of a block stored as is

        // The stored bytes, in their order. Only a ZarvoWeb archive has a second piece that is not empty: 8 bytes
        // between the LZMA properties and the coded data belong to neither. Of a block stored as is, Read takes size
        // bytes from here, whatever storedSize says. A block that is not streamed, has two equal sizes and a
        // decompressor for its type holds plain bytes, too.
        Piece pieces[2];
    };

    // Blocks in the order of the data stream. Once Initialize has returned 0, from any thread; index is below the
    // count.
    UInt32 GetBlockCount() const { return static_cast<UInt32>(m_BlocksInfo.storageBlocks.size()); }
    Block GetBlock(UInt32 index) const;

private:
    friend struct ArchiveStorageReaderTestAccess;

    // Decompressed data of one block: the whole of a chunk block, or a window of a streamed one.
    //
    // States by operations (w: beingWritten, r: bufferReaders):
    //
    //                       acquire of its block    victim scan     release or end of fill      EmptyCache
    //   idle     w 0, r 0   chunk: r 1, shared      w 1, r 1,       (not held)                  freed
    //                       streamed: w 1, r 1,     filling another
    //                       owned                   block
    //   filling  w 1, r 1   chunk: r + 1, then      skipped         filled: owned, or a chunk   kept
    //                       waits for w 0                           w 0, shared; failed: names
    //                       streamed: skipped                       no block, r - 1, w 0
    //   shared   w 0, r n   r + 1                   given back      r - 1                       kept
    //   owned    w 1, r 1   skipped                 skipped         r 0, w 0                    kept
    //
    // Acquiring, scanning, naming a block or none, and stamps are done under m_CacheLock; the rest of a record is its
    // filler's (or owner's), and once it is shared only read. A record with readers is never pointed at another block;
    // only its filler (or owner), whose fill has failed, makes it name none. Those who waited for it see that.
    struct CachedBlock {
        explicit CachedBlock(MemLabelId label) : buffer(label), compressedBuffer(label) {}

        UInt32 blockIndex = kNoBlock;
        UInt32 blockOffset = ~UInt32{0}; // of buffer's first byte, in the block's data
        dynamic_array<UInt8> buffer;
        std::atomic<SInt32> bufferReaders{0};
        std::atomic<SInt32> beingWritten{1};   // a new record is its maker's
        UInt32 lastAccess = 0;                 // a smaller stamp is less recently used
        void* streamState = nullptr;           // of a streamed block whose kind can be streamed
        dynamic_array<UInt8> compressedBuffer; // stored bytes: a whole chunk, or a piece of a stream
        UInt32 compressedPos = 0;              // streamed: what of compressedBuffer has been consumed
        UInt32 compressedLoaded = 0;           // streamed: how many of the block's stored bytes have been loaded
    };

    enum CacheResult : SInt32 {
        kCacheResultReadError = -2,
        kCacheResultDecompressError = -1, // or no decompressor, or the wrong size
        kCacheResultOk = 0,
        kCacheResultIncomplete = 1, // stored bytes, or the stream, ended early
    };

    // Delivers stored bytes to one Read call: straight from the file, or, when the call spans blocks, out of a window
    // that is read ahead. Positions are relative to m_DataOffset.
    class BatchingFileReader {
    public:
        BatchingFileReader(ArchiveStorageReader* reader, UInt64 batchSize, UInt64 startPos, UInt64 endPos,
                           UInt64 wantedEnd);
        bool Read(void* destination, UInt64 position, UInt64 size, UInt64* delivered);

    private:
        ArchiveStorageReader* m_Reader;
        UInt64 m_BatchSize; // 0: no window
        UInt64 m_StartPos;  // the call may read [m_StartPos, m_EndPos)
        UInt64 m_EndPos;
        UInt64 m_WantedEnd; // no more is read ahead, unless more is asked for
        UInt64 m_LoadedWindowStart = 0;
        UInt64 m_LoadedWindowEnd = 0;
        dynamic_array<UInt8> m_Buffer;
    };

    static constexpr UInt32 kNoBlock = ~UInt32{0};
    static constexpr UInt32 kStreamWindowSize = 65'536; // of output, and of the input pieces that it is made from
    static constexpr UInt64 kBatchSize = 4'194'304;
    static constexpr UInt32 kLzmaPropertiesSize = 5;
    static constexpr UInt32 kLzmaSizeFieldSize = 8; // behind the properties, in ZarvoWeb archives

    // Set-up, in ArchiveStorageReader.cpp. Runs while no other thread uses the reader, so it takes no lock.
    int ReadHeader(UInt64 offset) VARNEX_NO_THREAD_SAFETY_ANALYSIS;
    int ReadBlockBasedHeader(FileAccessor& file, UInt64 offset);
    int ReadCompressedBlocksInfo(FileAccessor& file, CompressionType type);
    int ReadBlocksInfoSection(FileAccessor& file);
    [[nodiscard]] bool BuildOffsetTables();
    void TryToReadDirectoryFromBlockData(UInt64 from, const void* data, size_t size);
    bool TryReadDirectoryInfoFromFile(IFile* file);

    // The block cache, in ArchiveStorageReaderCache.cpp.
    CachedBlock* AcquireCachedBlock(UInt32 blockIndex, UInt32 offsetInBlock);
    CachedBlock* AcquireAndPrefillUnusedBlock(UInt32 blockIndex, CacheResult* result, BatchingFileReader* reader);
    CachedBlock* FindChunk(UInt32 blockIndex) VARNEX_REQUIRES(m_CacheLock);
    CachedBlock* ClaimStream(UInt32 blockIndex, UInt32 offsetInBlock) VARNEX_REQUIRES(m_CacheLock);
    CachedBlock* ClaimVictim() VARNEX_REQUIRES(m_CacheLock);
    CachedBlock* AddCachedBlock() VARNEX_REQUIRES(m_CacheLock);
    void ReleaseCachedBlock(CachedBlock* block, bool isStreamed);
    void ReinitCachedBlock(CachedBlock* block, UInt32 blockIndex);
    void DeinitCachedBlock(CachedBlock* block);
    CacheResult FillStreamCachedBlock(CachedBlock* block, UInt64 maxSize, BatchingFileReader* reader);
    CacheResult FillChunkCachedBlock(CachedBlock* block, BatchingFileReader* reader);
    void StampCachedBlock(CachedBlock* block);
    void EmptyCache();
    void NoteBrokenBlock(const BrokenBlocks::Record& record);
    BrokenBlocks::Record FindBrokenBlock(UInt32 blockIndex);
    IDecompressor* GetDecompressor(CompressionType type);
    CompressionType GetBlockType(UInt32 blockIndex) const;
    bool IsBlockStreamed(UInt32 blockIndex) const;

    // Reads, in ArchiveStorageReaderRead.cpp.
    bool FindBlock(UInt64 position, UInt32* blockIndex) const;
    UInt32 NextBlock(UInt32 blockIndex) const;
    bool ReadCompleteBlock(UInt32 blockIndex, void* destination, UInt64* delivered, BatchingFileReader* batch);
    bool ReadBlock(UInt32 blockIndex, UInt64 offsetInBlock, UInt64 size, void* destination, UInt64* delivered,
                   BatchingFileReader* batch);
    CacheResult CopyFromCachedBlock(CachedBlock* record, UInt64 offsetInBlock, UInt64 size, void* destination,
                                    UInt64* delivered, BatchingFileReader* batch);
    bool ReadFromStorage(UInt64 position, UInt64 size, void* destination, UInt64* delivered);
    bool IsBehindStorageEnd(UInt64 position);

    ArchiveStorageHeader::Header m_Header;
    ArchiveStorageHeader::BlocksInfo m_BlocksInfo;
    ArchiveStorageHeader::DirectoryInfo m_DirectoryInfo;

    // Block count + 1 entries each, once initialised: where block i starts in the data stream, and where its stored
    // bytes start, relative to m_DataOffset; the last entry is the end.
    dynamic_array<UInt64> m_UncompressedBlocksOffsets;
    dynamic_array<UInt64> m_CompressedBlocksOffsets;

    // For each block and the end, the first block at or behind it that a read can't leave out. Without an entry when
    // that is always the next one.
    dynamic_array<UInt32> m_NextBlocks;

    MemoryFile* m_DirectoryFile = nullptr; // owned; the start of the stream, until a directory can be parsed from it
    LegacyDirectoryScanner m_DirectoryScanner;
    std::atomic<bool> m_DirectoryReady{false};
    FileSystemEntry m_FileEntry VARNEX_GUARDED_BY(m_StorageLock); // queries of it leave a code in it
    FileAccessor m_File VARNEX_GUARDED_BY(m_StorageLock);
    bool m_ReleaseStorageWhenUnused = true;
    UInt64 m_DataOffset = 0; // in the file, of the first stored byte of block 0
    SInt32 m_StorageUseCount VARNEX_GUARDED_BY(m_StorageLock) = 0;
    Mutex m_StorageLock;

    // ZarvoWeb: stored positions are counted as if the 8 bytes behind the 5 bytes of LZMA properties were not there.
    bool m_HideLzmaSizeField = false;

    bool m_CheckModificationTime = true;
    DateTime m_LastModified;
    dynamic_array<CachedBlock*> m_CachedBlocks VARNEX_GUARDED_BY(m_CacheLock);

    // A stream of which only a decoding in one window has failed is noted as broken from its end on.
    BrokenBlocks m_BrokenBlocks VARNEX_GUARDED_BY(m_CacheLock);
    std::atomic<bool> m_HasBrokenBlocks{false};

    Mutex m_CacheLock;
    std::atomic<UInt32> m_AccessCounter{0};
    std::atomic<IDecompressor*> m_Decompressors[kCompressionCount] = {}; // owned; made on first use
    MemLabelId m_Label;
};
