#include "Library/BlockDecoder.h"

#include "Library/Lz4Coder.h"
#include "Runtime/Utilities/Compression/Lz4Decompressor.h"
#include "Runtime/Utilities/LogAssert.h"

#include <algorithm>
#include <cstdio>

using Block = BlockDecoder::Block;

static zarvo_code SetDamaged(UInt32 index, const char* why, Failure* failure) {
    return failure->Set(ZARVO_ERROR_DAMAGED, "block %u %s", index, why);
}

static zarvo_code NameBlock(UInt32 index, Failure* failure) {
    char name[32];
    (void)snprintf(name, sizeof(name), "block %u", index);
    return failure->code == ZARVO_ERROR_SYSTEM ? failure->SetSystem(failure->systemCode, name) : failure->code;
}

zarvo_code SetOutsideData(Failure* failure) {
    return failure->Set(ZARVO_ERROR_DAMAGED, "lies outside the archive's data");
}

zarvo_code SetTooLarge(UInt32 index, UInt64 bytes, Failure* failure) {
    return failure->Set(ZARVO_ERROR_LIMIT, "block %u of %llu bytes is too large to be held in memory", index,
                        static_cast<unsigned long long>(bytes));
}

static bool HasLz4(const Block& block) { return block.type == kCompressionLz4 || block.type == kCompressionLz4HC; }

bool BlockDecoder::IsStoredAsIs(const Block& block) {
    if (block.type == kCompressionNone) return true;
    const bool hasDecoder = block.type == kCompressionLzma || HasLz4(block);
    return hasDecoder && !block.isStreamed && block.storedSize == block.size;
}

bool BlockDecoder::IsReadInPieces(const Block& block, UInt64 maxBlockBytes) {
    if (block.type != kCompressionLzma || IsStoredAsIs(block)) return false;
    return block.size > maxBlockBytes || (block.isStreamed && block.size > kLargestWholeStream);
}

UInt64 BlockDecoder::DataSize() const {
    const UInt32 count = BlockCount();
    if (count == 0) return 0;
    const Block last = GetBlock(count - 1);
    return last.position + last.size;
}

UInt32 BlockDecoder::FindBlock(UInt64 position) const {
    UInt32 low = 0;
    UInt32 high = BlockCount();
    while (high - low > 1) {
        const UInt32 middle = low + (high - low) / 2;
        if (GetBlock(middle).position <= position)
            low = middle;
        else
            high = middle;
    }
    return low;
}

bool BlockDecoder::IsThere(const Block& block, UInt64 offset) const {
    const UInt64 start = block.pieces[0].offset;
    return start < m_Source->Size() && offset < m_Source->Size() - start;
}

// No more than the archive can have: a header's word alone is no reason to ask for 4 GiB.
UInt64 BlockDecoder::StoredBytesThere(const Block& block) const {
    const UInt64 start = block.pieces[0].offset;
    return std::min<UInt64>(block.storedSize, start < m_Source->Size() ? m_Source->Size() - start : 0);
}

zarvo_code BlockDecoder::ReadStored(UInt32 index, UInt64 from, void* out, size_t size, size_t* count,
                                    Failure* failure) const {
    *count = 0;
    const Block block = GetBlock(index);
    for (const Block::Piece& piece : block.pieces) {
        if (from >= piece.size) {
            from -= piece.size;
            continue;
        }
        const size_t wanted = static_cast<size_t>(std::min<UInt64>(size - *count, piece.size - from));
        size_t got = 0;
        const zarvo_code code =
            m_Source->ReadBeforeDamage(piece.offset + from, static_cast<UInt8*>(out) + *count, wanted, &got, failure);
        *count += got;
        if (code != ZARVO_OK) return NameBlock(index, failure);
        if (got < wanted || *count == size) break;
        from = 0;
    }
    return ZARVO_OK;
}

zarvo_code BlockDecoder::ReadStoredAsIs(UInt32 index, UInt64 offset, void* out, size_t size, size_t* count,
                                        Failure* failure) const {
    // As many bytes as the block has decoded, whatever its stored size says.
    const UInt64 position = GetBlock(index).pieces[0].offset + offset;
    if (m_Source->ReadBeforeDamage(position, out, size, count, failure) != ZARVO_OK) return NameBlock(index, failure);
    return *count == size ? ZARVO_OK : SetDamaged(index, "ends after the archive's last byte", failure);
}

UInt64 BlockDecoder::FindEndOfDamage(UInt32 index, UInt64 offset, UInt64 end) const {
    const UInt64 start = GetBlock(index).pieces[0].offset;
    return m_Source->FindEndOfDamage(start + offset, start + end) - start;
}

zarvo_code BlockDecoder::DecodeWhole(UInt32 index, UInt8* out, size_t* count, Failure* failure) const {
    *count = 0;
    const Block block = GetBlock(index);
    if (IsStoredAsIs(block)) return ReadStoredAsIs(index, 0, out, block.size, count, failure);
    if (block.type != kCompressionLzma && !HasLz4(block)) {
        // Not ReportError, which takes a lock: another thread may have held it when this process was forked, and a
        // process that ends destroys it while threads still read.
        printf_console("Decompressing this format (%u) is not supported on this platform.\n",
                       static_cast<UInt32>(block.type));
        return failure->Set(ZARVO_ERROR_UNSUPPORTED, "block %u has compression kind %u, which is not supported", index,
                            static_cast<UInt32>(block.type));
    }

    dynamic_array<UInt8> stored(kMemLabelReadBatch);
    if (!stored.resize_uninitialized(static_cast<size_t>(StoredBytesThere(block)), kResizeExact))
        return failure->SetMemory();
    size_t loaded = 0;
    const zarvo_code code = ReadStored(index, 0, stored.data(), stored.size(), &loaded, failure);
    if (code != ZARVO_OK && code != ZARVO_ERROR_SYSTEM) return code;
    stored.truncate(loaded);
    if (code == ZARVO_OK) return DecodeLoaded(index, block, stored, out, count, failure);
    // The bytes before those that can't be read give some of the block.
    Failure ofTheRest;
    const zarvo_code decoded = DecodeLoaded(index, block, stored, out, count, &ofTheRest);
    if (decoded == ZARVO_OK || decoded == ZARVO_ERROR_MEMORY) *failure = ofTheRest;
    return failure->code;
}

zarvo_code BlockDecoder::DecodeLoaded(UInt32 index, const Block& block, const dynamic_array<UInt8>& stored, UInt8* out,
                                      size_t* count, Failure* failure) const {
    LzmaResult result = kLzmaOk;
    if (block.type == kCompressionLzma) {
        result = DecodeLzma(stored.data(), stored.size(), out, block.size, count);
    } else if (block.isStreamed || std::max(block.size, block.storedSize) >= Lz4Decompressor::kSizeLimit) {
        return SetDamaged(index, "is LZ4 of a form that can't be decoded", failure);
    } else {
        *count = DecodeLz4(stored.data(), stored.size(), out, block.size);
    }
    if (result == kLzmaNoMemory) return failure->SetMemory();
    if (*count == block.size) return ZARVO_OK;
    return SetDamaged(index, stored.size() < block.storedSize ? "ends after the archive's last byte" : "is damaged",
                      failure);
}

zarvo_code StreamCursor::Start(Failure* failure) {
    m_Position = 0;
    m_Loaded = 0;
    m_InputUsed = 0;
    m_Input.clear();
    m_IsStarted = true;
    m_IsBroken = true; // until it has begun
    zarvo_code code = LoadInput(failure);
    if (code != ZARVO_OK) {
        m_IsStarted = false;
        return code;
    }
    if (m_Input.size() < lzma::kPropertiesSize) return ZARVO_OK;
    const LzmaResult result = m_Lzma.Begin(m_Input.data(), m_Block.size);
    m_IsStarted = result != kLzmaNoMemory;
    if (result == kLzmaNoMemory) return failure->SetMemory();
    m_InputUsed = lzma::kPropertiesSize;
    m_IsBroken = result != kLzmaOk;
    return ZARVO_OK;
}

// Once all input is used: the next piece of it, or none when there is no more.
zarvo_code StreamCursor::LoadInput(Failure* failure) {
    const size_t wanted = static_cast<size_t>(std::min<UInt64>(kPieceSize, m_Block.storedSize - m_Loaded));
    if (!m_Input.resize_uninitialized(wanted, kResizeExact)) return failure->SetMemory();
    size_t got = 0;
    const zarvo_code code = m_Decoder->ReadStored(m_BlockIndex, m_Loaded, m_Input.data(), wanted, &got, failure);
    m_Input.truncate(got);
    m_InputUsed = 0;
    m_Loaded += got;
    if (code != ZARVO_ERROR_SYSTEM || got == 0) return code;
    *failure = {};
    return ZARVO_OK; // what could be read is used first; then this fails again
}

// Makes the next size bytes, at most; *count is how many. Fewer without a failure: the block is broken there.
zarvo_code StreamCursor::Decode(UInt8* out, size_t size, size_t* count, Failure* failure) {
    *count = 0;
    while (*count < size && !m_IsBroken) {
        if (m_InputUsed == m_Input.size() && m_Loaded < m_Block.storedSize) {
            const zarvo_code code = LoadInput(failure);
            if (code != ZARVO_OK) return code;
        }
        static constexpr UInt8 kNoInput = 0; // never read
        const UInt8* in = m_Input.empty() ? &kNoInput : m_Input.data() + m_InputUsed;
        size_t taken = m_Input.size() - m_InputUsed;
        size_t made = size - *count;
        m_IsBroken = m_Lzma.Decode(in, &taken, out + *count, &made) != kLzmaOk || (taken == 0 && made == 0);
        m_InputUsed += taken;
        m_Position += made;
        *count += made;
    }
    return ZARVO_OK;
}

zarvo_code StreamCursor::Read(UInt64 offset, UInt8* out, size_t size, size_t* count, Failure* failure) {
    *count = 0;
    if (!m_IsStarted || offset < m_Position) {
        const zarvo_code code = Start(failure);
        if (code != ZARVO_OK) return code;
    }
    while (m_Position < offset && !m_IsBroken) {
        if (!m_Skipped.resize_uninitialized(kPieceSize, kResizeExact)) return failure->SetMemory();
        size_t made = 0;
        const size_t wanted = static_cast<size_t>(std::min<UInt64>(kPieceSize, offset - m_Position));
        const zarvo_code code = Decode(m_Skipped.data(), wanted, &made, failure);
        if (code != ZARVO_OK) return code;
    }
    zarvo_code code = ZARVO_OK;
    if (m_Position == offset) code = Decode(out, size, count, failure);
    if (code != ZARVO_OK) return code;
    return *count == size ? ZARVO_OK : SetDamaged(m_BlockIndex, "is damaged", failure);
}
