#include "Tools/Zarvo/MountReader.h"

#include <algorithm>

size_t MountReader::FitThreads(const zarvo::archive& archive, size_t threads, uint64_t maxBlockBytes) {
    const uint64_t fileSize = archive.info().file_size;
    uint64_t largest = 1;
    for (uint64_t index = 0; index < archive.block_count(); ++index) {
        const zarvo_block block = archive.block(index);
        if (block.kind == ZARVO_KIND_NONE || IsStreamed(block, maxBlockBytes)) continue;
        const uint64_t bytes = std::max<uint64_t>(block.size, std::min<uint64_t>(block.stored_size, fileSize));
        if (bytes <= maxBlockBytes) largest = std::max(largest, bytes); // larger ones are refused
    }
    return std::clamp<uint64_t>(maxBlockBytes / largest, 1, threads);
}

MountReader::MountReader(zarvo::archive& archive, size_t threads, uint64_t maxBlockBytes)
    : m_Archive(archive),
      m_MaxBlockBytes(maxBlockBytes),
      m_BlockCount(archive.block_count()),
      m_DataSize(archive.info().data_size),
      m_Places(std::max<size_t>(threads, 2)) {
    for (uint64_t index = 0; index < m_BlockCount && !m_HasStreams; ++index)
        m_HasStreams = IsStreamed(archive.block(index), maxBlockBytes);
}

bool MountReader::IsStreamed(const zarvo_block& block, uint64_t maxBlockBytes) {
    return block.kind == ZARVO_KIND_LZMA && (block.is_streamed == 1 || block.size > maxBlockBytes);
}

// The block that holds a position, which lies below the data's size.
uint64_t MountReader::FindBlock(uint64_t position) const {
    uint64_t low = 0, high = m_BlockCount;
    while (high - low > 1) {
        const uint64_t middle = low + (high - low) / 2;
        (m_Archive.block(middle).position <= position ? low : high) = middle;
    }
    return low;
}

zarvo::read_result MountReader::Read(const zarvo::entry& entry, uint64_t offset, std::span<std::byte> buffer) {
    if (!m_HasStreams) return m_Archive.read(entry.index(), offset, buffer);
    zarvo::read_result read;
    while (read.count < buffer.size() && !read.error) {
        const uint64_t at = offset + read.count;
        const std::span<std::byte> rest = buffer.subspan(read.count);
        if (entry.offset() >= m_DataSize || at >= m_DataSize - entry.offset()) { // which is an error
            zarvo::read_result outside = m_Archive.read(entry.index(), at, rest);
            return {.count = read.count, .error = std::move(outside.error)};
        }
        const zarvo_block block = m_Archive.block(FindBlock(entry.offset() + at));
        const uint64_t left = block.position + block.size - (entry.offset() + at);
        const std::span<std::byte> inBlock = rest.first(std::min<uint64_t>(rest.size(), left));
        zarvo::read_result part = IsStreamed(block, m_MaxBlockBytes) ? ReadStreamed(entry, at, inBlock)
                                                                     : m_Archive.read(entry.index(), at, inBlock);
        read.count += part.count;
        read.error = std::move(part.error);
    }
    return read;
}

MountReader::Range MountReader::FindRange(const zarvo::entry& entry, uint64_t offset) const {
    const uint64_t index = FindBlock(entry.offset() + offset);
    const zarvo_block block = m_Archive.block(index);
    const uint64_t inBlock = (entry.offset() + offset - block.position) / kPieceSize * kPieceSize;
    const uint64_t from = std::max(block.position + inBlock, entry.offset()) - entry.offset();
    const uint64_t to = block.position + std::min<uint64_t>(inBlock + kPieceSize, block.size) - entry.offset();
    const uint64_t first = std::max(block.position, entry.offset()) - entry.offset();
    return {.from = from, .to = std::min(to, entry.size()), .block = index, .first = first};
}

zarvo::read_result MountReader::ReadStreamed(const zarvo::entry& entry, uint64_t offset, std::span<std::byte> buffer) {
    zarvo::read_result read;
    Lock lock(m_Lock);
    while (read.count < buffer.size()) {
        const Range range = FindRange(entry, offset + read.count);
        const size_t copied = CopyPiece(entry.index(), range, offset + read.count, buffer.subspan(read.count));
        read.count += copied;
        if (copied != 0) continue;
        Place* const place = TakePlace(range.block, entry.offset() + range.from);
        if (place == nullptr) {
            m_IsFree.wait(lock);
            continue;
        }
        zarvo::error error = Decode(lock, *place, entry, range);
        if (!error) continue;
        read.count += CopyPiece(entry.index(), range, offset + read.count, buffer.subspan(read.count));
        if (read.count < buffer.size()) read.error = std::move(error);
        break;
    }
    return read;
}

// Copies what is kept of a range from offset on. Returns how many bytes.
size_t MountReader::CopyPiece(uint64_t entry, const Range& range, uint64_t offset, std::span<std::byte> buffer) {
    Piece* const piece = FindPiece(entry, range.from);
    if (piece == nullptr || piece->bytes.size() <= offset - range.from) return 0;
    piece->lastUse = m_Uses++;
    const std::span<std::byte> bytes = std::span(piece->bytes).subspan(offset - range.from);
    const size_t count = std::min(bytes.size(), buffer.size());
    std::copy_n(bytes.begin(), count, buffer.begin());
    return count;
}

MountReader::Piece* MountReader::FindPiece(uint64_t entry, uint64_t from) {
    const auto found =
        std::ranges::find_if(m_Pieces, [&](const Piece& piece) { return piece.entry == entry && piece.from == from; });
    return found != m_Pieces.end() ? &*found : nullptr;
}

// Adds bytes, which begin at offset of an entry, to the piece that begins at from.
void MountReader::Keep(uint64_t entry, uint64_t from, uint64_t offset, std::span<const std::byte> bytes) {
    if (bytes.empty()) return;
    Piece* piece = FindPiece(entry, from);
    if (piece == nullptr) {
        if (offset != from) return; // its start has been given up
        m_Pieces.push_back({.entry = entry, .from = from, .bytes = {}, .lastUse = 0});
        piece = &m_Pieces.back();
    }
    piece->lastUse = m_Uses++;
    const uint64_t end = from + piece->bytes.size();
    if (offset > end || bytes.size() <= end - offset) return;
    bytes = bytes.subspan(end - offset); // those before it are kept since an attempt that failed
    piece->bytes.insert(piece->bytes.end(), bytes.begin(), bytes.end());
    m_PieceBytes += bytes.size();
    while (m_PieceBytes > kMaxPieceBytes || m_Pieces.size() > kMaxPieces) {
        const auto oldest = std::ranges::min_element(m_Pieces, {}, &Piece::lastUse);
        m_PieceBytes -= oldest->bytes.size();
        m_Pieces.erase(oldest);
    }
}

// The nearest place before a position, or the one that has not been used for longest. nullptr: wait until one is free.
MountReader::Place* MountReader::TakePlace(uint64_t block, uint64_t position) {
    Place* nearest = nullptr;
    Place* oldest = nullptr;
    for (Place& place : m_Places) {
        if (place.isBusy && place.block == block) return nullptr;
        if (place.isBusy) continue;
        if (place.block == block && place.position <= position &&
            (nearest == nullptr || place.position > nearest->position))
            nearest = &place;
        if (oldest == nullptr || place.lastUse < oldest->lastUse) oldest = &place;
    }
    Place* const taken = nearest != nullptr ? nearest : oldest;
    if (taken == nullptr) return nullptr;
    if (taken != nearest) {
        taken->entry = UINT64_MAX;
        taken->position = 0;
    }
    taken->block = block;
    taken->isBusy = true;
    taken->lastUse = m_Uses++;
    return taken;
}

// Decodes a range, and what lies between it and the place, if that is little. The lock is not held meanwhile.
zarvo::error MountReader::Decode(Lock& lock, Place& place, const zarvo::entry& entry, const Range& range) {
    struct Release {
        ~Release() {
            if (!lock.owns_lock()) lock.lock();
            place.isBusy = false;
            reader.m_IsFree.notify_all();
        }
        MountReader& reader;
        Lock& lock;
        Place& place;
    } const release = {*this, lock, place};

    // Of a range that ends in damage, the start may be kept. To decode it again would take the block from its start on.
    const Piece* const piece = FindPiece(entry.index(), range.from);
    const uint64_t kept = piece != nullptr ? piece->bytes.size() : 0;
    const uint64_t from = range.from + kept;
    lock.unlock();
    if (place.entry != entry.index()) {
        place.stream = zarvo::stream(nullptr); // gives back where it was, from which the new one goes on
        place.entry = UINT64_MAX;
        zarvo::result<zarvo::stream> stream = m_Archive.open_stream(entry.index());
        if (!stream) return std::move(stream).error();
        place.stream = *std::move(stream);
        place.entry = entry.index();
        place.offset = std::max(place.position, entry.offset()) - entry.offset(); // files may share bytes
        place.stream.seek(place.offset);
    }
    // What lies shortly before is kept, too, as it is decoded in any case: whoever reads nearly in order asks for it
    // next.
    const uint64_t start = FindRange(entry, std::max(range.first, from - std::min(from, kMaxSkipped))).from;
    if (place.offset > from || place.offset < start) {
        place.offset = kept != 0 ? from : start;
        place.stream.seek(place.offset);
    }
    zarvo::error error;
    std::vector<std::byte> bytes(kPieceSize);
    while (place.offset < range.to && !error) {
        const Range next = FindRange(entry, place.offset);
        const uint64_t offset = place.offset;
        const size_t wanted = next.to - offset;
        size_t count = 0;
        while (count < wanted && !error) {
            zarvo::read_result read = place.stream.read(std::span(bytes).subspan(count, wanted - count));
            count += read.count;
            error = std::move(read.error);
        }
        place.offset += count;
        lock.lock();
        Keep(entry.index(), next.from, offset, std::span(bytes).first(count));
        lock.unlock();
    }
    place.position = entry.offset() + place.offset;
    return error;
}
