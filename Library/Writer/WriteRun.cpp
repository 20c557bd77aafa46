#include "Library/Writer/WriteRun.h"

#include "Library/Resources.h"
#include "PlatformDependent/Linux/LargePages.h"
#include "Runtime/VirtualFileSystem/ArchiveFileSystem/ArchiveStorageHeader.h"

#include <algorithm>
#include <climits>

namespace {

constexpr UInt64 kSpareSlotBytes = 8'388'608; // of all threads together
constexpr size_t kEmptyFilesAtOnce = 256;     // that a thread takes, so that others check those of other folders

// What a block takes while it is worked on.
UInt64 SlotBytes(const WritePlan& plan) {
    return plan.BlockSize() * (plan.BlockEncoding().type == kCompressionNone ? 1 : 2);
}

} // namespace

zarvo_code WriteRun::CheckMemory(const WritePlan& plan, const zarvo_run_options& options, UInt64* threads,
                                 Failure* failure) {
    const UInt64 memory = MemoryBudget(options.memory);
    const bool isStream = plan.Layout() == ZARVO_LAYOUT_WEB;
    const EncoderSettings encoding = plan.BlockEncoding();
    const UInt64 needed = isStream ? StreamEncoderMemory(encoding) : SlotBytes(plan) + BlockEncoderMemory(encoding);
    *threads = memory / needed;
    if (*threads != 0) return ZARVO_OK;
    return failure->Set(ZARVO_ERROR_LIMIT, "to compress takes %llu bytes of memory, and the limit is %llu",
                        static_cast<unsigned long long>(needed), static_cast<unsigned long long>(memory));
}

zarvo_code WriteRun::ChooseThreads(UInt32* threads, Failure* failure) const {
    constexpr UInt64 kOtherDescriptors = 16;   // the program's, and the archive
    constexpr UInt64 kDescriptorsOfThread = 3; // a file, its folder, and one more on the way to it
    UInt64 affordable = 0;
    if (const zarvo_code code = CheckMemory(m_Plan, m_Options, &affordable, failure); code != ZARVO_OK) return code;
    const UInt64 pieces = std::max<UInt64>(m_Plan.BlockCount(), m_EmptyFiles.size() / kEmptyFilesAtOnce);
    const UInt64 descriptors = FreeDescriptors(kOtherDescriptors) / kDescriptorsOfThread;
    *threads = ChooseThreadCount(m_Options.threads, std::min({affordable, pieces, descriptors}));
    return ZARVO_OK;
}

// False when memory is refused.
bool WriteRun::FindEmptyFiles() {
    for (size_t index = 0; index < m_List.size(); ++index) {
        const EntryList::Entry& entry = m_List[index];
        if (entry.size != 0 || EntryList::IsFolder(entry)) continue;
        if (!m_EmptyFiles.try_push_back(static_cast<UInt32>(index))) return false;
    }
    return true;
}

bool WriteRun::PrepareSlots(UInt32 threads) {
    const bool isCoded = m_Plan.BlockEncoding().type != kCompressionNone;
    const UInt64 size = m_Plan.BlockSize();
    const UInt64 spare = std::min<UInt64>(2 * threads, kSpareSlotBytes / SlotBytes(m_Plan));
    const UInt64 count = std::min(threads + spare, m_Plan.BlockCount());
    if (!m_Slots.resize_initialized(count, kResizeExact) || !m_Free.reserve(count)) return false;
    for (Slot& slot : m_Slots) {
        if (!slot.plain.resize_uninitialized(size, kResizeExact)) return false;
        PreferLargePages(slot.plain.data(), size); // encoders look back at it
        if (isCoded && !slot.coded.resize_uninitialized(size, kResizeExact)) return false;
        m_Free.push_back(&slot);
    }
    return m_Records.resize_uninitialized(m_Plan.BlockCount(), kResizeExact);
}

zarvo_code WriteRun::Write(NewArchive* file, Failure* failure) {
    m_File = file;
    if (!FindEmptyFiles()) return failure->SetMemory();
    UInt32 threads = 0;
    if (const zarvo_code code = ChooseThreads(&threads, failure); code != ZARVO_OK) return code;
    if (!m_Data.IsReady() || !m_Source->PrepareToRead(threads)) return failure->SetMemory();
    const bool isStream = m_Plan.Layout() == ZARVO_LAYOUT_WEB;
    if (!isStream && !PrepareSlots(threads)) return failure->SetMemory();
    m_End = m_DataPlace = HeadSize();
    Look();
    if (m_Fatal.code == ZARVO_OK) RunOnThreads(threads, [this](UInt32 thread) { Work(thread); });
    if (m_Fatal.code != ZARVO_ERROR_STOPPED) Look();
    if (m_Fatal.code == ZARVO_OK) return WriteFrame(failure);
    *failure = m_Fatal;
    return failure->code;
}

void WriteRun::Work(UInt32 thread) {
    CheckEmptyFiles(thread);
    if (m_Plan.Layout() != ZARVO_LAYOUT_WEB)
        WorkOnBlocks(thread);
    else if (thread == 0)
        WorkOnStream();
}

void WriteRun::Look() {
    const UInt64 bytes = m_BytesDone.load(std::memory_order_relaxed); // nothing else goes by it
    if (TellProgress(
            m_Options,
            {.bytes = bytes, .bytesTotal = m_Data.Size(), .files = CountDone(bytes), .filesTotal = m_List.size()}))
        return;
    Failure stopped;
    (void)stopped.SetStopped();
    Fail(stopped, kNoOrder);
}

// Of the entries before a position, and of the empty files wherever they are.
UInt64 WriteRun::CountDone(UInt64 position) const {
    const size_t passed = m_Data.CountUpTo(position);
    const auto emptyPassed = std::lower_bound(m_EmptyFiles.begin(), m_EmptyFiles.end(), passed) - m_EmptyFiles.begin();
    return passed - static_cast<UInt64>(emptyPassed) + m_EmptyFilesDone.load(std::memory_order_relaxed);
}

// A failure ends the run. What was taken before is still read, so of several failures the one that counts is that which
// a single thread would have met.
void WriteRun::Fail(const Failure& failure, UInt64 order, size_t entry) {
    std::lock_guard lock(m_Lock);
    if (m_Fatal.code == ZARVO_OK || (m_Fatal.code != ZARVO_ERROR_STOPPED && order < m_FatalOrder)) {
        m_Fatal = failure;
        m_FatalOrder = order;
        m_FailedEntry = entry;
    }
    m_IsStopped.store(true, std::memory_order_relaxed);
    m_HasFreeSlot.notify_all();
}

// Whether they can be read, and are still empty.
void WriteRun::CheckEmptyFiles(UInt32 thread) {
    while (!m_IsStopped.load(std::memory_order_relaxed)) {
        const size_t begin = m_NextEmptyFile.fetch_add(kEmptyFilesAtOnce, std::memory_order_relaxed);
        if (begin >= m_EmptyFiles.size()) return;
        const size_t end = std::min(begin + kEmptyFilesAtOnce, m_EmptyFiles.size());
        for (size_t at = begin; at < end; ++at) {
            const UInt32 index = m_EmptyFiles[at];
            Failure failure;
            if (m_Source->Read(thread, m_List, m_List[index], 0, nullptr, 0, &failure) != ZARVO_OK)
                return Fail(failure, at, index);
        }
        m_EmptyFilesDone.fetch_add(end - begin, std::memory_order_relaxed);
        LookIfAlone();
    }
}

void WriteRun::WorkOnBlocks(UInt32 thread) {
    BlockEncoder encoder;
    if (!encoder.Prepare(m_Plan.BlockEncoding())) {
        Failure failure;
        (void)failure.SetMemory();
        return Fail(failure, kNoOrder);
    }
    while (Slot* const slot = TakeSlot()) {
        if (!FillSlot(thread, &encoder, slot) || !Commit(slot)) return;
        LookIfAlone();
    }
}

// A slot with the number of the block to work on; null when there is nothing left to do. The block whose turn it is to
// be written has a slot always, as numbers and slots are taken together.
WriteRun::Slot* WriteRun::TakeSlot() {
    std::unique_lock lock(m_Lock);
    const auto isOver = [&] { return m_IsStopped.load(std::memory_order_relaxed) || m_NextNumber == m_Records.size(); };
    m_HasFreeSlot.wait(lock, [&] { return isOver() || !m_Free.empty(); });
    if (isOver()) return nullptr;
    Slot* const slot = m_Free.back();
    m_Free.pop_back();
    slot->number = m_NextNumber++;
    slot->isFilled = false;
    if (m_NextNumber == m_Records.size()) m_HasFreeSlot.notify_all();
    return slot;
}

bool WriteRun::FillSlot(UInt32 thread, BlockEncoder* encoder, Slot* slot) {
    const UInt64 position = slot->number * m_Plan.BlockSize();
    const UInt64 size = std::min(m_Plan.BlockSize(), m_Data.Size() - position);
    Failure failure;
    size_t failed = PlannedData::kNoEntry;
    if (m_Data.Read(thread, position, slot->plain.data(), size, &failed, &failure) != ZARVO_OK) {
        Fail(failure, OrderOf(slot->number), failed);
        return false;
    }
    // What does not become smaller is stored as it is.
    size_t coded = 0;
    const EncodeResult result =
        encoder->Encode(slot->plain.data(), size, slot->coded.data(), size - 1, &coded, &m_IsStopped);
    if (result == EncodeResult::kStopped) return false; // whoever stopped the run has said why
    if (result != EncodeResult::kOk && result != EncodeResult::kNoRoom) {
        (void)failure.SetMemory();
        Fail(failure, OrderOf(slot->number));
        return false;
    }
    const bool isCoded = result == EncodeResult::kOk;
    const UInt32 type = isCoded ? m_Plan.BlockEncoding().type : kCompressionNone;
    const UInt32 streamed = m_Plan.IsStreamed() ? ArchiveStorageHeader::kStorageBlockStreamed : 0;
    slot->stored = isCoded ? slot->coded.data() : slot->plain.data();
    slot->record = {static_cast<UInt32>(size), static_cast<UInt32>(isCoded ? coded : size),
                    static_cast<UInt16>(type | streamed)};
    return true;
}

// Writes the blocks whose turn it is, if this one is the first of them. False when the run is to end.
bool WriteRun::Commit(Slot* slot) {
    {
        std::lock_guard lock(m_Lock);
        slot->isFilled = true;
    }
    for (Slot* next = nullptr; (next = TakeNextFilled(next)) != nullptr;) {
        Failure failure;
        if (m_File->Write(next->place, next->stored, next->record.storedSize, &failure) != ZARVO_OK) {
            Fail(failure, OrderOf(next->number));
            return false;
        }
        m_BytesDone.fetch_add(next->record.size, std::memory_order_relaxed);
    }
    return !m_IsStopped.load(std::memory_order_relaxed);
}

// Frees a slot that has been written (null: none), and gives the next block its place if it is filled.
WriteRun::Slot* WriteRun::TakeNextFilled(Slot* written) {
    std::lock_guard lock(m_Lock);
    if (written != nullptr) {
        m_Free.push_back(written);
        m_HasFreeSlot.notify_one();
    }
    for (Slot& slot : m_Slots) {
        if (!slot.isFilled || slot.number != m_NextPlaced) continue;
        slot.isFilled = false;
        slot.place = m_End;
        m_End += slot.record.storedSize;
        m_Records[m_NextPlaced++] = slot.record;
        return &slot;
    }
    return nullptr;
}

// The ends of the one stream of ZARVO_LAYOUT_WEB, whose decoded size lies between the properties and the coded bytes.
class WriteRun::StreamWriter final : public StreamEnds {
public:
    explicit StreamWriter(WriteRun* run) : m_Run(run) {
        for (size_t index = 0; index < sizeof(m_SizeField); ++index)
            m_SizeField[index] = static_cast<UInt8>(run->m_Data.Size() >> (8 * index));
    }

    bool Read(UInt8* buffer, size_t* size) override {
        *size = static_cast<size_t>(std::min<UInt64>(*size, m_Run->m_Data.Size() - m_Position));
        if (m_Run->m_Data.Read(0, m_Position, buffer, *size, &m_FailedEntry, &m_Failure) != ZARVO_OK) return false;
        m_Position += *size;
        m_Run->m_BytesDone.store(m_Position, std::memory_order_relaxed);
        m_Run->LookIfAlone();
        return true;
    }

    bool Write(const UInt8* bytes, size_t size) override {
        const bool isFirst = m_Run->m_End == m_Run->m_DataPlace;
        if (!Append(bytes, size)) return false;
        return !isFirst || Append(m_SizeField, sizeof(m_SizeField));
    }

    const Failure& GetFailure() const { return m_Failure; }
    size_t FailedEntry() const { return m_FailedEntry; }

private:
    bool Append(const UInt8* bytes, size_t size) {
        const UInt64 end = m_Run->m_End + size;
        if (end > UINT_MAX)
            (void)m_Failure.Set(ZARVO_ERROR_LIMIT, "the archive has %llu bytes and more, and the limit is %u",
                                static_cast<unsigned long long>(end), UINT_MAX);
        else
            (void)m_Run->m_File->Write(m_Run->m_End, bytes, size, &m_Failure);
        m_Run->m_End = end;
        return m_Failure.code == ZARVO_OK;
    }

    WriteRun* m_Run;
    UInt8 m_SizeField[8] = {};
    UInt64 m_Position = 0;
    size_t m_FailedEntry = PlannedData::kNoEntry;
    Failure m_Failure;
};

void WriteRun::WorkOnStream() {
    StreamWriter writer(this);
    const EncodeResult result = EncodeLzmaStream(m_Plan.BlockEncoding(), &writer, &m_IsStopped);
    if (result == EncodeResult::kOk || result == EncodeResult::kStopped) return; // whoever stopped the run has said why
    Failure failure = writer.GetFailure();
    if (failure.code == ZARVO_OK) (void)failure.SetMemory();
    Fail(failure, OrderOf(0), result == EncodeResult::kInputFailed ? writer.FailedEntry() : PlannedData::kNoEntry);
}

// What comes before the data always takes the same room.
UInt64 WriteRun::HeadSize() const {
    ByteSink head;
    switch (m_Plan.Layout()) {
    case ZARVO_LAYOUT_FS: PutBlockBasedHeader(head, m_Plan.Form(), {}); return RoundUp(head.Size(), kHeaderAlignment);
    case ZARVO_LAYOUT_ARCHIVE: PutArchivePrologue(head, m_Plan.Form().signature, 0); return head.Size();
    default: return LegacyHeaderSize(m_Plan.Form());
    }
}

zarvo_code WriteRun::WriteFrame(Failure* failure) {
    switch (m_Plan.Layout()) {
    case ZARVO_LAYOUT_FS: return WriteBlockBasedFrame(failure);
    case ZARVO_LAYOUT_ARCHIVE: return WriteArchiveFrame(failure);
    default: return WriteLegacyFrame(failure);
    }
}

// Encodes the section into coded, which stays empty if it does not become smaller. A large one takes a while: the
// calling thread tells progress meanwhile, and may be told to stop: LZMA stops at once, LZ4 ends what it does.
zarvo_code WriteRun::EncodeSection(const ByteSink& section, dynamic_array<UInt8>* coded, Failure* failure) {
    BlockEncoder encoder;
    if (!section.IsWhole() || !encoder.Prepare(m_Plan.SectionEncoding(section.Size())) ||
        !coded->resize_uninitialized(section.Size(), kResizeExact))
        return failure->SetMemory();
    size_t size = 0;
    EncodeResult result = EncodeResult::kNoRoom;
    RunOnThreads(1, [&](UInt32) {
        result =
            encoder.Encode(section.Bytes(), section.Size(), coded->data(), section.Size() - 1, &size, &m_IsStopped);
    });
    if (m_Fatal.code != ZARVO_OK) {
        *failure = m_Fatal;
        return failure->code;
    }
    if (result == EncodeResult::kNoMemory) return failure->SetMemory();
    coded->truncate(result == EncodeResult::kOk ? size : 0);
    return ZARVO_OK;
}

// The header, and after the data the section: its size is known last.
zarvo_code WriteRun::WriteBlockBasedFrame(Failure* failure) {
    using namespace ArchiveStorageHeader;
    ByteSink section;
    PutSection(section, m_Records, &m_List);
    dynamic_array<UInt8> coded(kMemLabelFileSystem);
    if (const zarvo_code code = EncodeSection(section, &coded, failure); code != ZARVO_OK) return code;
    const bool isCoded = !coded.empty();
    const UInt64 size = isCoded ? coded.size() : section.Size();
    const UInt64 place = m_End;
    m_End += size;

    ByteSink head;
    PutBlockBasedHeader(head, m_Plan.Form(),
                        {.archive = m_End,
                         .compressedSection = size,
                         .uncompressedSection = section.Size(),
                         .flags = UInt32{kArchiveDirectoryInBlocksInfo} | kArchiveBlocksInfoAtEnd |
                                  (isCoded ? UInt32{m_Plan.BlockEncoding().type} : kCompressionNone)});
    head.PutZeros(m_DataPlace - head.Size());
    const zarvo_code code = m_File->Write(place, isCoded ? coded.data() : section.Bytes(), size, failure);
    return code == ZARVO_OK ? WritePart(head, 0, failure) : code;
}

zarvo_code WriteRun::WriteLegacyFrame(Failure* failure) {
    ByteSink head;
    PutLegacyHeader(head, m_Plan.Form(), {.header = m_DataPlace, .stored = m_End - m_DataPlace, .data = m_Data.Size()});
    return WritePart(head, 0, failure);
}

// The header follows the data: it has the sizes of all blocks.
zarvo_code WriteRun::WriteArchiveFrame(Failure* failure) {
    ByteSink head;
    PutArchivePrologue(head, m_Plan.Form().signature, m_End);
    ByteSink header;
    PutArchiveHeader(header, m_Plan.Form(), m_DataPlace, m_Records, m_List);
    if (const zarvo_code code = WritePart(header, m_End, failure); code != ZARVO_OK) return code;
    m_End += header.Size();
    return WritePart(head, 0, failure);
}

zarvo_code WriteRun::WritePart(const ByteSink& part, UInt64 place, Failure* failure) {
    if (!part.IsWhole()) return failure->SetMemory();
    return m_File->Write(place, part.Bytes(), part.Size(), failure);
}
