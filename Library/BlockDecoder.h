// Decodes the blocks of an archive, without the cache and locks of the runtime's reader. It also decides, for the whole
// library, what can be read of a damaged block: the bytes before the first one that its decoder does not deliver,
// whichever way they are read.
//
//   kind                              decoded
//   none, or two equal sizes          as they are stored (of a streamed block: kind none alone)
//   LZ4, LZ4HC                        whole
//   LZ4, LZ4HC, streamed              never: LZ4 has no streams
//   LZMA                              whole, or piece by piece by a StreamCursor
//   any other                         never
//
// Any thread; a cursor belongs to one thread at a time.
#pragma once

#include "Library/LzmaCoder.h"
#include "Library/Source.h"
#include "Runtime/Core/Containers/DynamicArray.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageReader.h"

#include <algorithm>

class BlockDecoder : private NonCopyable {
public:
    using Block = ArchiveStorageReader::Block;

    // Both outlive the decoder.
    BlockDecoder(const ArchiveStorageReader* reader, const Source* source) : m_Reader(reader), m_Source(source) {}

    UInt32 BlockCount() const { return m_Reader->GetBlockCount(); }
    Block GetBlock(UInt32 index) const { return m_Reader->GetBlock(index); }
    UInt64 DataSize() const;

    // The block that holds a position below DataSize. Never a block without bytes.
    UInt32 FindBlock(UInt64 position) const;

    static bool IsStoredAsIs(const Block& block);

    // Whether a block is decoded piece by piece: a large LZMA stream, or any LZMA block of more than maxBlockBytes.
    // Smaller streams are decoded whole, like other blocks, so that reads in them may come in any order.
    static bool IsReadInPieces(const Block& block, UInt64 maxBlockBytes);

    // Whether the source has the byte at an offset of a block that is stored as is, or ends before it.
    bool IsThere(const Block& block, UInt64 offset) const;

    // The larger of a block's decoded size and its stored bytes: decoding it whole takes at most twice as much memory.
    UInt64 BytesToHold(const Block& block) const { return std::max<UInt64>(block.size, StoredBytesThere(block)); }

    // Reads bytes [offset, offset + size) of a block that is stored as is. *count is how many can be read, even after a
    // failure.
    zarvo_code ReadStoredAsIs(UInt32 index, UInt64 offset, void* out, size_t size, size_t* count,
                              Failure* failure) const;

    // Byte offset of a block that is stored as is could not be read. Where, up to end, reading can go on.
    UInt64 FindEndOfDamage(UInt32 index, UInt64 offset, UInt64 end) const;

    // Decodes a whole block into out, which has room for its size. *count is how many bytes can be read, even after a
    // failure.
    zarvo_code DecodeWhole(UInt32 index, UInt8* out, size_t* count, Failure* failure) const;

private:
    friend class StreamCursor;

    static constexpr UInt64 kLargestWholeStream = 1'048'576;

    UInt64 StoredBytesThere(const Block& block) const;

    // Reads stored bytes [from, from + size) of a block; *count is how many the archive has, or could be read before a
    // failure.
    zarvo_code ReadStored(UInt32 index, UInt64 from, void* out, size_t size, size_t* count, Failure* failure) const;
    zarvo_code DecodeLoaded(UInt32 index, const Block& block, const dynamic_array<UInt8>& stored, UInt8* out,
                            size_t* count, Failure* failure) const;

    const ArchiveStorageReader* m_Reader;
    const Source* m_Source;
};

// The failure of an entry that lies outside the data, and that of a block too large to be held in memory.
zarvo_code SetOutsideData(Failure* failure);
zarvo_code SetTooLarge(UInt32 index, UInt64 bytes, Failure* failure);

// A place inside an LZMA block from which decoding can go on.
class StreamCursor : private NonCopyable {
public:
    StreamCursor(const BlockDecoder* decoder, UInt32 blockIndex)
        : m_Decoder(decoder),
          m_BlockIndex(blockIndex),
          m_Block(decoder->GetBlock(blockIndex)),
          m_Input(kMemLabelFileSystem),
          m_Skipped(kMemLabelFileSystem) {}

    UInt32 BlockIndex() const { return m_BlockIndex; }
    UInt64 Position() const { return m_Position; } // of the next byte to be decoded
    UInt64 MemoryUsed() const { return sizeof(*this) + 2 * kPieceSize + m_Lzma.MemoryUsed(); }

    // Reads bytes [offset, offset + size) of the block. Starts the block again if offset is less than Position. *count
    // is how many bytes can be read, even after a failure.
    zarvo_code Read(UInt64 offset, UInt8* out, size_t size, size_t* count, Failure* failure);

private:
    static constexpr size_t kPieceSize = 65'536; // of input, and of output that nobody asked for

    zarvo_code Start(Failure* failure);
    zarvo_code LoadInput(Failure* failure);
    zarvo_code Decode(UInt8* out, size_t size, size_t* count, Failure* failure);

    const BlockDecoder* m_Decoder;
    const UInt32 m_BlockIndex;
    const BlockDecoder::Block m_Block;
    LzmaStream m_Lzma;
    bool m_IsStarted = false;
    bool m_IsBroken = false; // decoding fails at m_Position
    UInt64 m_Position = 0;
    UInt64 m_Loaded = 0; // stored bytes that are or have been in m_Input
    size_t m_InputUsed = 0;
    dynamic_array<UInt8> m_Input;
    dynamic_array<UInt8> m_Skipped;
};
