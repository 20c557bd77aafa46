// Decodes an archive's blocks in several threads, each block once, and hands the files' bytes to a sink while they are
// in the processor's cache.
//
// The data is cut into units. A unit is about 1 MiB of whole blocks or of data that is stored as it is (less for many
// threads), or one block that is decoded piece by piece. The rest of a block that is stored as it is and lies past the
// archive's end is a unit, too. A thread takes the next unit, decodes it, and hands over whole files that lie in it and
// the parts of others. Files are visited in the order of their places in the data, not in that of the directory, so
// nothing is decoded twice however the directory is sorted. A thread that decodes a block piece by piece passes its
// pieces on to threads that have nothing to do.
//
//   DataRun run(decoder, nodes, maxBlockBytes, threads, &sink);
//   run.ReserveFiles(count);
//   run.AddFile(entry) ..., or run.AddAllBlocks(); run.AddOther(entry) ...
//   run.Prepare();
//   run.Work(worker);   // in each thread, each with a number of its own
//
// Any number of threads may call Work at once; everything else is for one thread.
#pragma once

#include "Library/BlockDecoder.h"
#include "Runtime/Threads/Mutex.h"

#include <algorithm>
#include <condition_variable>
#include <mutex>

// A file that lies in more than one piece, from its first part to its last.
struct SharedFile : private NonCopyable {
    SharedFile(UInt32 index, UInt64 size) : entry(index), left(size) {}

    const UInt32 entry;
    std::atomic<UInt64> left; // bytes of parts that have not been handed over

    Mutex lock;                                           // for what follows, and the sink's
    UInt64 readable VARNEX_GUARDED_BY(lock) = ~UInt64{0}; // bytes before the first damage that has been met
    RareFailure damage VARNEX_GUARDED_BY(lock);

    // Used by the run only.
    UInt64 inOrder = 0; // bytes that have been handed over, if the run keeps the order
    size_t liveIndex = 0;
};

class DataRun : private NonCopyable {
public:
    using Nodes = dynamic_array<ArchiveStorageHeader::Node>;

    // What becomes of the bytes. Called by all workers at once, with their numbers.
    class Sink {
    public:
        virtual ~Sink() = default;

        // A whole file: its readable bytes, and why there are no more (null: these are all).
        virtual void TakeFile(UInt32 worker, UInt32 entry, const UInt8* bytes, UInt64 readable,
                              const Failure* damage) = 0;

        // A file that lies in several pieces. ShareFile makes its state, TakePart is called for each part (in any
        // order, unless the run keeps the order), and EndFile after the last part.
        virtual SharedFile* ShareFile(UInt32 entry, UInt64 size) = 0; // null when memory is refused
        virtual void TakePart(UInt32 worker, SharedFile* file, UInt64 offset, const UInt8* bytes, UInt64 size) = 0;
        virtual void EndFile(UInt32 worker, SharedFile* file) = 0; // deletes the state
        virtual void DropFile(SharedFile* file) = 0;               // instead, if the run was stopped; deletes it

        // An entry that was added without data.
        virtual void TakeOther(UInt32 worker, UInt32 entry) = 0;

        // Data [begin, end) of a block that can't be read.
        virtual void TakeDamage(UInt32 blockIndex, UInt64 begin, UInt64 end, const Failure& damage) = 0;

        // Data [begin, end) has been tried. Only if the run takes all blocks.
        virtual void TakeData(UInt64, UInt64) {}

        // Called after each file, and after each piece of data, with no lock held.
        virtual void BetweenFiles() {}
    };

    // decoder, nodes and sink outlive the run. Blocks of more than maxBlockBytes are not decoded whole. threads: how
    // many may call Work.
    DataRun(const BlockDecoder* decoder, const Nodes& nodes, UInt64 maxBlockBytes, UInt32 threads, Sink* sink);
    ~DataRun();

    // Call these before Prepare. False when memory is refused. AddFile is for files that have bytes and start in the
    // data; there may be no more of them than were reserved.
    [[nodiscard]] bool ReserveFiles(size_t count) { return m_Files.reserve(count); }
    void AddFile(UInt32 entry);
    [[nodiscard]] bool AddOther(UInt32 entry);
    void AddAllBlocks() { m_TakesAllBlocks = true; }
    void KeepOrder() { m_KeepsOrder = true; } // parts of a file come one after the other, from its start on

    void Prepare();

    // Works until nothing is left to do, or the run is stopped.
    void Work(UInt32 worker);
    void StopFor(const Failure& failure); // which becomes the FatalFailure if there is none yet
    void StopWithoutMemory();             // as StopFor
    bool IsStopped() const { return m_IsStopped.load(std::memory_order_relaxed); } // a hint: data is under the lock

    // After all workers have ended: drops the files that a stopped run left unfinished.
    void DropUnended();

    // After all workers have ended: the failure that stopped the run, if one did.
    const Failure& FatalFailure() const { return m_Fatal; }

    UInt64 BytesTotal() const { return m_BytesTotal; }
    UInt64 BytesTaken() const { return m_BytesTaken.load(std::memory_order_relaxed); } // for progress

private:
    struct PieceFile {
        UInt32 entry;
        SharedFile* shared; // null: the file lies in the piece whole
    };
    // A range that can't be read.
    struct Hole {
        UInt64 begin;
        UInt64 end;
        Failure failure;
    };
    // Decoded data, and what lies in it.
    struct Piece {
        UInt64 begin = 0;
        UInt64 end = 0;
        dynamic_array<UInt8> bytes{kMemLabelFileSystem};
        dynamic_array<PieceFile> files{kMemLabelFileSystem};
        dynamic_array<Hole> holes{kMemLabelFileSystem};
    };
    struct Unit {
        UInt64 begin = 0;
        UInt64 end = 0;
        UInt32 firstBlock = 0;
        bool isStream = false;
        bool isMissing = false;
        size_t firstFile = 0; // [firstFile, endFile) begin in it
        size_t endFile = 0;
        dynamic_array<PieceFile> carried{kMemLabelFileSystem}; // begin before it
        dynamic_array<PieceFile> leaving{kMemLabelFileSystem}; // begin in it and end after it, in order
    };

    static constexpr UInt64 kMaxUnitSize = 1'048'576;
    static constexpr UInt64 kAllUnits = 8 * kMaxUnitSize; // of all threads together, where blocks are small
    static constexpr UInt32 kMaxUnitBlocks = 1'024;       // each may have a failure of its own
    static constexpr size_t kOthersAtOnce = 64;

    // Where a file lies in the data; its end is not past that of the data.
    UInt64 BeginOf(UInt32 entry) const { return m_Nodes[entry].offset; }
    UInt64 EndOf(UInt32 entry) const {
        return BeginOf(entry) + std::min(m_Nodes[entry].size, m_DataSize - BeginOf(entry));
    }

    // With m_Lock held.
    enum UnitAnswer { kUnit, kNoUnit, kNoMemoryForUnit };
    UnitAnswer NextUnit(Unit* unit);
    UInt64 FindUnitEnd(const Unit& unit, UInt64 begin) const;
    bool ListFiles(Unit* unit);
    SharedFile* Share(UInt32 entry);

    // The steps of Work. The lock is held before and after, and not while bytes are decoded or handed over.
    using Lock = std::unique_lock<std::mutex>;
    void DeliverPassed(UInt32 worker, Lock* lock);
    void WorkOnUnit(UInt32 worker, const Unit& unit, Piece** piece, Lock* lock);
    void TakeOthers(UInt32 worker, Lock* lock);

    void WorkOnBlocks(UInt32 worker, const Unit& unit, Piece* piece);
    void WorkOnStream(UInt32 worker, const Unit& unit, Piece** piece);
    bool PassOn(Piece** piece);
    void Decode(const Unit& unit, Piece* piece);
    void AddHole(Piece* piece, UInt64 begin, UInt64 end, const Failure& failure);
    void Deliver(UInt32 worker, const Piece& piece);
    void DeliverPart(UInt32 worker, const PieceFile& part, UInt64 offset, const UInt8* bytes, UInt64 size,
                     const Hole* hole);
    void Unshare(SharedFile* shared);
    void CountBytes(UInt64 count) { m_BytesTaken.fetch_add(count, std::memory_order_relaxed); } // for progress only

    const BlockDecoder* m_Decoder;
    const Nodes& m_Nodes;
    const UInt64 m_MaxBlockBytes;
    const UInt64 m_UnitSize;
    const UInt64 m_DataSize;
    Sink* m_Sink;
    bool m_KeepsOrder = false;
    bool m_TakesAllBlocks = false;
    dynamic_array<UInt32> m_Files{kMemLabelFileSystem}; // entries; by their beginnings, once prepared
    dynamic_array<UInt32> m_Others{kMemLabelFileSystem};
    UInt64 m_BytesTotal = 0;

    // What follows is under m_Lock, which is held to find the next unit, and never to decode or to write.
    std::mutex m_Lock;
    std::condition_variable m_HasWork;     // a piece was passed on, a stream has ended, or the run is stopped
    std::condition_variable m_HasAdvanced; // a file's inOrder, or the run is stopped
    UInt64 m_Position = 0;                 // data before it has been given out
    size_t m_NextFile = 0;
    size_t m_NextOther = 0;
    dynamic_array<PieceFile> m_Active{kMemLabelFileSystem}; // begin before m_Position and end after it
    dynamic_array<SharedFile*> m_Shared{kMemLabelFileSystem};
    dynamic_array<Piece*> m_Passed{kMemLabelFileSystem}; // never more than workers that wait
    dynamic_array<Piece*> m_Spare{kMemLabelFileSystem};
    size_t m_Streams = 0; // being decoded
    size_t m_Waiting = 0; // workers
    Failure m_Fatal;

    std::atomic<bool> m_IsStopped{false};
    std::atomic<UInt64> m_BytesTaken{0};
};
