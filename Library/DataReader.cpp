#include "Library/DataReader.h"

#include <algorithm>
#include <cstring>

zarvo_code DataReader::Read(UInt64 position, void* out, size_t size, size_t* count, StreamCursor** kept,
                            Failure* failure) {
    *count = 0;
    if (size == 0) return ZARVO_OK;
    const UInt64 there = position < m_DataSize ? m_DataSize - position : 0;
    const size_t wanted = static_cast<size_t>(std::min<UInt64>(size, there));
    while (*count < wanted) {
        const UInt32 blockIndex = m_Decoder->FindBlock(position + *count);
        const BlockDecoder::Block block = m_Decoder->GetBlock(blockIndex);
        const UInt64 offset = position + *count - block.position;
        const size_t amount = static_cast<size_t>(std::min<UInt64>(wanted - *count, block.size - offset));
        size_t got = 0;
        const zarvo_code code =
            ReadInBlock(blockIndex, offset, static_cast<UInt8*>(out) + *count, amount, &got, kept, failure);
        *count += got;
        if (code != ZARVO_OK) return code;
    }
    if (*count == size) return ZARVO_OK;
    return SetOutsideData(failure);
}

zarvo_code DataReader::ReadInBlock(UInt32 blockIndex, UInt64 offset, UInt8* out, size_t size, size_t* count,
                                   StreamCursor** kept, Failure* failure) {
    const BlockDecoder::Block block = m_Decoder->GetBlock(blockIndex);
    if (BlockDecoder::IsStoredAsIs(block))
        return m_Decoder->ReadStoredAsIs(blockIndex, offset, out, size, count, failure);
    if (BlockDecoder::IsReadInPieces(block, m_MaxBlockBytes))
        return ReadFromCursor(blockIndex, offset, out, size, count, kept, failure);
    if (m_Decoder->BytesToHold(block) > m_MaxBlockBytes)
        return SetTooLarge(blockIndex, m_Decoder->BytesToHold(block), failure);
    if (size == block.size && !m_Cache->Has(blockIndex)) return m_Decoder->DecodeWhole(blockIndex, out, count, failure);

    BlockCache::Use use(m_Cache);
    const zarvo_code code = m_Cache->Acquire(blockIndex, &use, failure);
    const UInt64 readable = use.Readable() > offset ? use.Readable() - offset : 0;
    *count = static_cast<size_t>(std::min<UInt64>(size, readable));
    if (*count != 0) memcpy(out, use.Data() + offset, *count);
    return *count == size ? ZARVO_OK : code; // the damage may lie after it
}

zarvo_code DataReader::ReadFromCursor(UInt32 blockIndex, UInt64 offset, UInt8* out, size_t size, size_t* count,
                                      StreamCursor** kept, Failure* failure) {
    StreamCursor* ofThisCall = nullptr;
    StreamCursor** const cursor = kept != nullptr ? kept : &ofThisCall;
    const bool fits = *cursor != nullptr && (*cursor)->BlockIndex() == blockIndex && (*cursor)->Position() <= offset;
    if (!fits) {
        m_Cache->GiveCursorBack(*cursor);
        *cursor = m_Cache->TakeCursor(blockIndex, offset);
        if (*cursor == nullptr) return failure->SetMemory();
    }
    const zarvo_code code = (*cursor)->Read(offset, out, size, count, failure);
    m_Cache->GiveCursorBack(ofThisCall);
    return code;
}

zarvo_code DataReader::ReadBlock(UInt32 blockIndex, void* out, size_t* count, Failure* failure) {
    const BlockDecoder::Block block = m_Decoder->GetBlock(blockIndex);
    return Read(block.position, out, block.size, count, nullptr, failure);
}
