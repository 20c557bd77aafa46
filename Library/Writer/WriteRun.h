// Writes an archive's bytes: encodes the data block by block on several threads, and puts the other parts around it.
// The bytes are the same for any number of threads.
//
//   WriteRun run(plan, list, source, options);
//   run.Write(&file, failure);
//
// The way of a block: a thread takes the next number and a slot (TakeSlot), reads the block into the slot and encodes
// it (FillSlot), and hands the slot over (Commit). Blocks get their places in the archive in the order of their
// numbers, and are written to them by whichever thread finds that it is their turn. There are more slots than threads,
// so that one slow block does not keep the others waiting.
//
// Before that, the threads share the check of the empty files, of which no block holds anything.
//
// One thread makes and runs it.
#pragma once

#include "Library/Threads.h"
#include "Library/Writer/NewArchive.h"
#include "Library/Writer/PlannedData.h"

#include <atomic>
#include <condition_variable>
#include <mutex>

class WriteRun final : private WatchedRun, private NonCopyable {
public:
    // All must outlive the run.
    WriteRun(const WritePlan& plan, const EntryList& list, EntrySource* source, const zarvo_run_options& options)
        : m_Plan(plan), m_List(list), m_Source(source), m_Data(plan, list, source), m_Options(options) {}

    // Finds how many threads there is memory for; a failure if there are none.
    static zarvo_code CheckMemory(const WritePlan& plan, const zarvo_run_options& options, UInt64* threads,
                                  Failure* failure);

    // Writes the whole archive, and does not finish the file.
    zarvo_code Write(NewArchive* file, Failure* failure);

    // After a failure: the entry that it is about, or PlannedData::kNoEntry.
    size_t FailedEntry() const { return m_FailedEntry; }

    UInt64 ArchiveSize() const { return m_End; }

private:
    struct Slot {
        dynamic_array<UInt8> plain{kMemLabelFileSystem};
        dynamic_array<UInt8> coded{kMemLabelFileSystem};
        const UInt8* stored = nullptr; // plain or coded
        UInt64 number = 0;
        BlockRecord record = {};
        UInt64 place = 0; // in the archive
        bool isFilled = false;
    };
    class StreamWriter;

    void Work(UInt32 thread);
    void Look() override;
    zarvo_code ChooseThreads(UInt32* threads, Failure* failure) const;
    [[nodiscard]] bool FindEmptyFiles();
    [[nodiscard]] bool PrepareSlots(UInt32 threads);

    void CheckEmptyFiles(UInt32 thread);
    void WorkOnBlocks(UInt32 thread);
    Slot* TakeSlot();
    bool FillSlot(UInt32 thread, BlockEncoder* encoder, Slot* slot);
    bool Commit(Slot* slot);
    Slot* TakeNextFilled(Slot* written);
    void WorkOnStream();

    UInt64 HeadSize() const;
    zarvo_code WriteFrame(Failure* failure); // all but the data
    zarvo_code EncodeSection(const ByteSink& section, dynamic_array<UInt8>* coded, Failure* failure);
    zarvo_code WriteBlockBasedFrame(Failure* failure);
    zarvo_code WriteLegacyFrame(Failure* failure);
    zarvo_code WriteArchiveFrame(Failure* failure);
    zarvo_code WritePart(const ByteSink& part, UInt64 place, Failure* failure);

    // The order in which a single thread does everything: first the empty files, then the blocks.
    static constexpr UInt64 kNoOrder = ~UInt64{0};
    UInt64 OrderOf(UInt64 block) const { return m_EmptyFiles.size() + block; }

    void Fail(const Failure& failure, UInt64 order, size_t entry = PlannedData::kNoEntry);
    UInt64 CountDone(UInt64 position) const;

    const WritePlan& m_Plan;
    const EntryList& m_List;
    EntrySource* m_Source;
    const PlannedData m_Data;
    const zarvo_run_options m_Options;
    NewArchive* m_File = nullptr;
    UInt64 m_DataPlace = 0;                                  // in the archive
    dynamic_array<UInt32> m_EmptyFiles{kMemLabelFileSystem}; // indices, in order
    BlockRecords m_Records{kMemLabelFileSystem};
    size_t m_FailedEntry = PlannedData::kNoEntry;

    // What follows is under m_Lock, which is held to take and hand over slots, and never to encode or to write.
    std::mutex m_Lock;
    std::condition_variable m_HasFreeSlot; // or the run is stopped
    dynamic_array<Slot> m_Slots{kMemLabelFileSystem};
    dynamic_array<Slot*> m_Free{kMemLabelFileSystem};
    UInt64 m_NextNumber = 0; // to be taken
    UInt64 m_NextPlaced = 0; // to get a place
    UInt64 m_End = 0;        // of what has got a place
    Failure m_Fatal;         // ZARVO_ERROR_STOPPED: the caller wants no more
    UInt64 m_FatalOrder = kNoOrder;

    std::atomic<bool> m_IsStopped{false};
    std::atomic<size_t> m_NextEmptyFile{0};  // to be checked, of m_EmptyFiles
    std::atomic<UInt64> m_EmptyFilesDone{0}; // for progress, and so are the bytes
    std::atomic<UInt64> m_BytesDone{0};
};
