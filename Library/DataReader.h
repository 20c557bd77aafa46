// Reads any range of an archive's data. Blocks that are stored as they are come from the source, whole blocks that are
// not in the cache are decoded into the caller's buffer, and everything else goes through the cache. Any thread.
#pragma once

#include "Library/BlockCache.h"

class DataReader : private NonCopyable {
public:
    // decoder and cache outlive the reader. Blocks with more bytes than maxBlockBytes, stored or
    // decoded, are never decoded whole.
    DataReader(const BlockDecoder* decoder, BlockCache* cache, UInt64 maxBlockBytes)
        : m_Decoder(decoder), m_Cache(cache), m_MaxBlockBytes(maxBlockBytes), m_DataSize(decoder->DataSize()) {}

    // Reads bytes [position, position + size) of the data. *count is how many can be read, even after a failure. kept
    // may be null. Otherwise *kept is a cursor that the caller keeps between reads, at first null, so that the next
    // read can go on from there; in the end the caller passes it to GiveBack.
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
