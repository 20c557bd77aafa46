// Reads files as a kernel asks for them: in requests of readahead's size or of a page, from several threads, and a bit
// out of order.
//
// Blocks that are decoded whole are the library's business, which caches them. None is decoded before it is asked for:
// of a file that is read on and on, the kernel asks for two at a time, and to decode a third made reading slower. A
// large streamed block can only be decoded from its start on, so it takes more: one thread decodes in a block at a
// time, from the nearest place where an earlier request has ended, and what it decodes is kept for a while in pieces
// that are larger than the kernel's requests. Any thread.
#pragma once

#include <zarvo.hpp>

#include <condition_variable>
#include <mutex>
#include <vector>

class MountReader {
public:
    // How many of so many threads may read so that the blocks that they hold, each as it is stored and as it is
    // decoded, take no more than twice maxBlockBytes; at least one.
    static size_t FitThreads(const zarvo::archive& archive, size_t threads, uint64_t maxBlockBytes);

    // archive outlives the reader. threads: how many will call it. maxBlockBytes: as the archive was opened with.
    MountReader(zarvo::archive& archive, size_t threads, uint64_t maxBlockBytes);

    // Reads a range that lies inside a file into buffer. Fewer bytes only with an error.
    zarvo::read_result Read(const zarvo::entry& entry, uint64_t offset, std::span<std::byte> buffer);

private:
    // What is decoded at a time. A streamed block is cut every kPieceSize bytes, and a range is what a file has between
    // two cuts.
    struct Range {
        uint64_t from; // in the file
        uint64_t to;
        uint64_t block;
        uint64_t first; // where the block, or the file, begins
    };
    struct Piece {
        uint64_t entry;
        uint64_t from;
        std::vector<std::byte> bytes; // of a damaged block those that can be read
        uint64_t lastUse;
    };
    // A place in a streamed block from which decoding can go on. While it is busy, it is its thread's.
    struct Place {
        zarvo::stream stream{nullptr};
        uint64_t entry = UINT64_MAX;
        uint64_t offset = 0;   // in the entry
        uint64_t position = 0; // the same in the data
        uint64_t block = UINT64_MAX;
        uint64_t lastUse = 0;
        bool isBusy = false;
    };
    using Lock = std::unique_lock<std::mutex>;

    // As large as the kernel's readahead, which asks for several such ranges at the same time.
    static constexpr uint64_t kPieceSize = 131'072;
    static constexpr uint64_t kMaxSkipped = 8 * kPieceSize; // before what is asked for, which are kept as well
    static constexpr uint64_t kMaxPieceBytes = 32 * kPieceSize;
    static constexpr size_t kMaxPieces = 128;

    uint64_t FindBlock(uint64_t position) const;
    static bool IsStreamed(const zarvo_block& block, uint64_t maxBlockBytes);
    Range FindRange(const zarvo::entry& entry, uint64_t offset) const;
    zarvo::read_result ReadStreamed(const zarvo::entry& entry, uint64_t offset, std::span<std::byte> buffer);
    size_t CopyPiece(uint64_t entry, const Range& range, uint64_t offset, std::span<std::byte> buffer);
    Piece* FindPiece(uint64_t entry, uint64_t from);
    void Keep(uint64_t entry, uint64_t from, uint64_t offset, std::span<const std::byte> bytes);
    Place* TakePlace(uint64_t block, uint64_t position);
    zarvo::error Decode(Lock& lock, Place& place, const zarvo::entry& entry, const Range& range);

    zarvo::archive& m_Archive;
    const uint64_t m_MaxBlockBytes;
    const uint64_t m_BlockCount;
    const uint64_t m_DataSize;
    bool m_HasStreams = false;
    std::mutex m_Lock; // not held while decoding
    std::condition_variable m_IsFree;
    std::vector<Place> m_Places;
    std::vector<Piece> m_Pieces;
    uint64_t m_PieceBytes = 0;
    uint64_t m_Uses = 0;
};
