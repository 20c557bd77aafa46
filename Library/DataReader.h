// Reads any range of an archive's data: from the file where it is stored as it is, past the cache where whole blocks
// are wanted, else through the cache. Any thread.
#pragma once

#include "Library/BlockCache.h"

class DataReader : private NonCopyable {
public:
    // decoder and cache outlive the reader. Blocks that are larger than maxBlockBytes are never decoded whole.
    DataReader(const BlockDecoder* decoder, BlockCache* cache, UInt64 maxBlockBytes)
        : m_Decoder(decoder), m_Cache(cache), m_MaxBlockBytes(maxBlockBytes), m_DataSize(decoder->DataSize()) {}

    // Reads bytes [position, position + size) of the data. *count is how many can be read, also after a failure. kept
    // is null, or a cursor that the caller keeps between reads (at first null), so that its next read goes on from
    // there; it is given back to the cache in the end.
    zarvo_code Read(UInt64 position, void* out, size_t size, size_t* count, StreamCursor** kept, Failure* failure);

    // Decodes a whole block into out, which has room for it.
    zarvo_code ReadBlock(UInt32 blockIndex, void* out, size_t* count, Failure* failure);

    void GiveBack(StreamCursor* cursor) { m_Cache->GiveCursorBack(cursor); }

private:
    zarvo_code ReadInBlock(UInt32 blockIndex, UInt64 offset, UInt8* out, size_t size, size_t* count,
                           StreamCursor** kept, Failure* failure);
    zarvo_code ReadFromCursor(UInt32 blockIndex, UInt64 offset, UInt8* out, size_t size, size_t* count,
                              StreamCursor** kept, Failure* failure);

    const BlockDecoder* m_Decoder;
    BlockCache* m_Cache;
    const UInt64 m_MaxBlockBytes;
    const UInt64 m_DataSize;
};
