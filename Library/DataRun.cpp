#include "Library/DataRun.h"

#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cerrno>

using Block = BlockDecoder::Block;

DataRun::DataRun(const BlockDecoder* decoder, const Nodes& nodes, UInt64 maxBlockBytes, UInt32 threads, Sink* sink)
    : m_Decoder(decoder),
      m_Nodes(nodes),
      m_MaxBlockBytes(maxBlockBytes),
      m_UnitSize(std::min(kMaxUnitSize, kAllUnits / threads)),
      m_DataSize(decoder->DataSize()),
      m_Sink(sink) {}

DataRun::~DataRun() {
    for (Piece* piece : m_Passed)
        Delete(piece, kMemLabelFileSystem);
    for (Piece* piece : m_Spare)
        Delete(piece, kMemLabelFileSystem);
}

void DataRun::DropUnended() {
    for (SharedFile* shared : m_Shared)
        m_Sink->DropFile(shared);
    m_Shared.clear();
}

template <typename T>
static bool Append(dynamic_array<T>* array, const T& value) {
    const size_t size = array->size();
    if (!array->resize_uninitialized(size + 1)) return false;
    (*array)[size] = value;
    return true;
}

bool DataRun::AddFile(UInt32 entry) {
    const ArchiveStorageHeader::Node& node = m_Nodes[entry];
    const UInt64 size = std::min(node.size, m_DataSize - node.offset);
    m_BytesTotal += size;
    return Append(&m_Files, {node.offset, node.offset + size, entry});
}

bool DataRun::AddOther(UInt32 entry) { return Append(&m_Others, entry); }

void DataRun::Prepare() {
    std::sort(m_Files.begin(), m_Files.end(),
              [](const File& a, const File& b) { return a.begin != b.begin ? a.begin < b.begin : a.entry < b.entry; });
    if (m_TakesAllBlocks) m_BytesTotal = m_DataSize;
}

void DataRun::Stop() {
    std::lock_guard lock(m_Lock);
    m_IsStopped.store(true, std::memory_order_relaxed);
    m_HasWork.notify_all();
    m_HasAdvanced.notify_all();
}

void DataRun::StopFor(const Failure& failure) {
    {
        std::lock_guard lock(m_Lock);
        if (m_Fatal.code == ZARVO_OK) m_Fatal = failure;
    }
    Stop();
}

void DataRun::StopWithoutMemory() {
    Failure failure;
    (void)failure.SetMemory();
    StopFor(failure);
}

SharedFile* DataRun::Share(const File& file) {
    SharedFile* shared = m_Sink->ShareFile(file.entry, file.end - file.begin);
    if (shared == nullptr) return nullptr;
    shared->liveIndex = m_Shared.size();
    if (Append(&m_Shared, shared)) return shared;
    m_Sink->DropFile(shared);
    return nullptr;
}

// All parts of the file have been handed over.
void DataRun::Unshare(SharedFile* shared) {
    std::lock_guard lock(m_Lock);
    SharedFile* const last = m_Shared[m_Shared.size() - 1];
    m_Shared[shared->liveIndex] = last;
    last->liveIndex = shared->liveIndex;
    (void)m_Shared.resize_uninitialized(m_Shared.size() - 1); // never grows
}

// Where the unit that begins at a place ends: after about m_UnitSize bytes, or before a block that no file needs.
UInt64 DataRun::FindUnitEnd(const Unit& unit, UInt64 begin) const {
    UInt64 reach = 0; // of the files that begin before the place looked at
    for (const PieceFile& active : m_Active)
        reach = std::max(reach, active.file->end);
    size_t file = m_NextFile;
    UInt64 end = begin;
    UInt32 count = 0; // of blocks with bytes
    for (UInt32 index = unit.firstBlock; index < m_Decoder->BlockCount() && count < kMaxUnitBlocks; ++index) {
        const Block block = m_Decoder->GetBlock(index);
        const bool isFirst = index == unit.firstBlock;
        const UInt64 blockEnd = block.position + block.size;
        for (; file < m_Files.size() && m_Files[file].begin < blockEnd; ++file)
            reach = std::max(reach, m_Files[file].end);
        if (!isFirst && BlockDecoder::IsReadInPieces(block, m_MaxBlockBytes)) break;
        if (!isFirst && reach <= block.position && !m_TakesAllBlocks) break;
        if (block.size != 0) ++count;
        if (BlockDecoder::IsStoredAsIs(block)) {
            if (!m_Decoder->IsThere(block, std::max(begin, block.position) - block.position))
                return isFirst ? blockEnd : end;
            end = std::min(blockEnd, begin + m_UnitSize);
            if (end < blockEnd) break;
        } else {
            if (!isFirst && blockEnd - begin > m_UnitSize) break;
            end = blockEnd;
        }
        if (end - begin >= m_UnitSize) break;
    }
    return end;
}

// The files that begin in a unit, and those that go on in it or after it.
bool DataRun::ListFiles(Unit* unit) {
    unit->carried.clear();
    unit->leaving.clear();
    size_t kept = 0;
    for (const PieceFile& active : m_Active) {
        if (!Append(&unit->carried, active)) return false;
        if (active.file->end > unit->end) m_Active[kept++] = active;
    }
    (void)m_Active.resize_uninitialized(kept); // never grows
    unit->firstFile = m_NextFile;
    for (; m_NextFile < m_Files.size() && m_Files[m_NextFile].begin < unit->end; ++m_NextFile) {
        const File& file = m_Files[m_NextFile];
        if (file.end <= unit->end) continue;
        const PieceFile leaving = {&file, Share(file)};
        if (leaving.shared == nullptr || !Append(&unit->leaving, leaving) || !Append(&m_Active, leaving)) return false;
    }
    unit->endFile = m_NextFile;
    return true;
}

DataRun::UnitAnswer DataRun::NextUnit(Unit* unit) {
    UInt64 begin = m_Position;
    if (m_Active.empty() && !m_TakesAllBlocks) {
        if (m_NextFile == m_Files.size()) return kNoUnit;
        begin = std::max(begin, m_Files[m_NextFile].begin);
    }
    if (begin >= m_DataSize) return kNoUnit;
    unit->firstBlock = m_Decoder->FindBlock(begin);
    const Block block = m_Decoder->GetBlock(unit->firstBlock);
    unit->begin = BlockDecoder::IsStoredAsIs(block) ? begin : block.position;
    unit->isStream = BlockDecoder::IsReadInPieces(block, m_MaxBlockBytes);
    unit->end = unit->isStream ? block.position + block.size : FindUnitEnd(*unit, unit->begin);
    unit->isMissing = BlockDecoder::IsStoredAsIs(block) && !m_Decoder->IsThere(block, unit->begin - block.position);
    m_Position = unit->end;
    return ListFiles(unit) ? kUnit : kNoMemoryForUnit;
}

void DataRun::Work(UInt32 worker) {
    Unit unit;
    Piece* piece = New<Piece>(kMemLabelFileSystem);
    if (piece == nullptr) return StopWithoutMemory();
    std::unique_lock lock(m_Lock);
    while (!IsStopped()) {
        if (!m_Passed.empty()) {
            Piece* const passed = m_Passed[0];
            std::move(m_Passed.begin() + 1, m_Passed.end(), m_Passed.begin()); // the oldest first
            (void)m_Passed.resize_uninitialized(m_Passed.size() - 1);          // never grows
            lock.unlock();
            Deliver(worker, *passed);
            lock.lock();
            if (!Append(&m_Spare, passed)) Delete(passed, kMemLabelFileSystem);
        } else if (const UnitAnswer answer = NextUnit(&unit); answer != kNoUnit) {
            if (answer == kNoMemoryForUnit) {
                lock.unlock();
                StopWithoutMemory();
                lock.lock();
                continue;
            }
            if (unit.isStream) ++m_Streams;
            lock.unlock();
            if (unit.isStream)
                WorkOnStream(worker, unit, &piece);
            else
                WorkOnUnit(worker, unit, piece);
            lock.lock();
            if (unit.isStream && --m_Streams == 0) m_HasWork.notify_all();
        } else if (m_NextOther < m_Others.size()) {
            const size_t first = m_NextOther;
            m_NextOther = std::min(m_Others.size(), first + kOthersAtOnce);
            const size_t end = m_NextOther;
            lock.unlock();
            for (size_t index = first; index < end && !IsStopped(); ++index) {
                m_Sink->TakeOther(worker, m_Others[index]);
                m_Sink->BetweenFiles();
            }
            lock.lock();
        } else if (m_Streams != 0) {
            ++m_Waiting;
            m_HasWork.wait(lock);
            --m_Waiting;
        } else {
            break;
        }
    }
    lock.unlock();
    Delete(piece, kMemLabelFileSystem);
}

void DataRun::WorkOnUnit(UInt32 worker, const Unit& unit, Piece* piece) {
    piece->begin = unit.begin;
    piece->end = unit.end;
    piece->files.clear();
    for (const PieceFile& carried : unit.carried)
        if (!Append(&piece->files, carried)) return StopWithoutMemory();
    size_t leaving = 0;
    for (size_t index = unit.firstFile; index < unit.endFile; ++index) {
        const File& file = m_Files[index];
        const PieceFile inPiece = file.end <= unit.end ? PieceFile{&file, nullptr} : unit.leaving[leaving++];
        if (!Append(&piece->files, inPiece)) return StopWithoutMemory();
    }
    Decode(unit, piece);
    Deliver(worker, *piece);
}

void DataRun::AddHole(Piece* piece, UInt64 begin, UInt64 end, const Failure& failure) {
    if (failure.code == ZARVO_ERROR_MEMORY || failure.code == ZARVO_ERROR_CHANGED) return StopFor(failure);
    if (!Append(&piece->holes, {begin, end, failure})) StopWithoutMemory();
}

void DataRun::Decode(const Unit& unit, Piece* piece) {
    piece->holes.clear();
    UInt64 room = piece->end - piece->begin;
    if (unit.isMissing || room > std::max(m_MaxBlockBytes, m_UnitSize)) room = 0; // one block, which fails below
    if (!piece->bytes.resize_uninitialized(static_cast<size_t>(room), kResizeExact)) return StopWithoutMemory();
    UInt64 position = unit.begin;
    UInt32 index = unit.firstBlock;
    while (position < unit.end && !IsStopped()) {
        const Block block = m_Decoder->GetBlock(index);
        const UInt64 offset = position - block.position;
        const size_t size = static_cast<size_t>(std::min<UInt64>(block.size - offset, unit.end - position));
        if (size == 0) {
            ++index;
            continue;
        }
        Failure failure;
        size_t count = 0;
        UInt64 lost = 0;
        zarvo_code code;
        if (BlockDecoder::IsStoredAsIs(block))
            code = m_Decoder->ReadStoredAsIs(index, offset, piece->bytes.data() + (position - unit.begin), size, &count,
                                             &failure);
        else if (m_Decoder->BytesToHold(block) > m_MaxBlockBytes)
            code = SetTooLarge(index, m_Decoder->BytesToHold(block), &failure);
        else
            code = m_Decoder->DecodeWhole(index, piece->bytes.data() + (position - unit.begin), &count, &failure);
        if (code != ZARVO_OK) {
            lost = size - count;
            if (BlockDecoder::IsStoredAsIs(block) && failure.systemCode == EIO)
                lost = m_Decoder->FindEndOfDamage(index, offset + count, offset + size) - (offset + count);
            AddHole(piece, position + count, position + count + lost, failure);
            m_Sink->TakeDamage(index, position + count, position + count + lost, failure);
        }
        position += count + lost;
    }
}

// Decodes a block piece by piece, as far as its files need it, and passes pieces on to whoever has nothing to do.
void DataRun::WorkOnStream(UInt32 worker, const Unit& unit, Piece** piece) {
    StreamCursor cursor(m_Decoder, unit.firstBlock);
    dynamic_array<PieceFile> active(kMemLabelFileSystem);
    UInt64 end = m_TakesAllBlocks ? unit.end : unit.begin;
    for (const PieceFile& carried : unit.carried) {
        end = std::max(end, std::min(unit.end, carried.file->end));
        if (!Append(&active, carried)) return StopWithoutMemory();
    }
    for (size_t index = unit.firstFile; index < unit.endFile; ++index)
        end = std::max(end, std::min(unit.end, m_Files[index].end));
    size_t file = unit.firstFile;
    size_t leaving = 0;
    bool isBroken = false; // nothing from here on can be read
    Failure failure;
    for (UInt64 begin = unit.begin; begin < end && !IsStopped(); begin += m_UnitSize) {
        (*piece)->begin = begin;
        (*piece)->end = std::min(end, begin + m_UnitSize);
        (*piece)->files.clear();
        (*piece)->holes.clear();
        const size_t size = static_cast<size_t>((*piece)->end - begin);
        bool isOk = (*piece)->bytes.resize_uninitialized(size, kResizeExact);

        size_t kept = 0;
        for (const PieceFile& going : active) {
            isOk = isOk && Append(&(*piece)->files, going);
            if (going.file->end > (*piece)->end) active[kept++] = going;
        }
        (void)active.resize_uninitialized(kept); // never grows
        for (; isOk && file < unit.endFile && m_Files[file].begin < (*piece)->end; ++file) {
            PieceFile inPiece = {&m_Files[file], nullptr};
            if (m_Files[file].end > unit.end) {
                inPiece = unit.leaving[leaving++];
            } else if (m_Files[file].end > (*piece)->end) {
                std::lock_guard lock(m_Lock);
                inPiece.shared = Share(m_Files[file]);
                isOk = inPiece.shared != nullptr;
            }
            isOk = isOk && Append(&(*piece)->files, inPiece);
            if (m_Files[file].end > (*piece)->end) isOk = isOk && Append(&active, inPiece);
        }
        if (!isOk) return StopWithoutMemory();

        size_t count = 0;
        if (!isBroken) {
            isBroken = cursor.Read(begin - unit.begin, (*piece)->bytes.data(), size, &count, &failure) != ZARVO_OK;
            if (isBroken) m_Sink->TakeDamage(unit.firstBlock, begin + count, unit.end, failure);
        }
        if (isBroken) AddHole(*piece, begin + count, (*piece)->end, failure);
        if (!PassOn(piece)) Deliver(worker, **piece);
    }
}

// Hands the piece to a worker that waits, and takes another one in its place; false when none does.
bool DataRun::PassOn(Piece** piece) {
    std::lock_guard lock(m_Lock);
    if (m_Waiting <= m_Passed.size()) return false;
    Piece* next = nullptr;
    if (!m_Spare.empty()) {
        next = m_Spare[m_Spare.size() - 1];
        (void)m_Spare.resize_uninitialized(m_Spare.size() - 1); // never grows
    } else {
        next = New<Piece>(kMemLabelFileSystem);
    }
    if (next == nullptr) return false;
    if (!Append(&m_Passed, *piece)) {
        Delete(next, kMemLabelFileSystem);
        return false;
    }
    *piece = next;
    m_HasWork.notify_one();
    return true;
}

void DataRun::Deliver(UInt32 worker, const Piece& piece) {
    for (const PieceFile& part : piece.files) {
        if (IsStopped()) return;
        const UInt64 begin = std::max(part.file->begin, piece.begin);
        const UInt64 end = std::min(part.file->end, piece.end);
        // Holes are in the order of their places.
        const Hole* hole = std::lower_bound(piece.holes.begin(), piece.holes.end(), begin,
                                            [](const Hole& at, UInt64 place) { return at.end <= place; });
        if (hole == piece.holes.end() || hole->begin >= end) hole = nullptr;
        // A piece that has no bytes is all hole.
        const UInt8* const bytes = piece.bytes.empty() ? nullptr : piece.bytes.data() + (begin - piece.begin);
        DeliverPart(worker, part, begin - part.file->begin, bytes, end - begin, hole);
        if (!m_TakesAllBlocks) CountBytes(end - begin);
        m_Sink->BetweenFiles();
    }
    if (!m_TakesAllBlocks) return;
    m_Sink->TakeData(piece.begin, piece.end);
    CountBytes(piece.end - piece.begin);
    m_Sink->BetweenFiles();
}

// offset: of the part, in its file. hole: the first in the part, or null.
void DataRun::DeliverPart(UInt32 worker, const PieceFile& part, UInt64 offset, const UInt8* bytes, UInt64 size,
                          const Hole* hole) {
    const UInt64 partBegin = part.file->begin + offset;
    const UInt64 readable = hole != nullptr ? std::max(hole->begin, partBegin) - partBegin : size;
    if (part.shared == nullptr) {
        Failure outside;
        const Failure* damage = hole != nullptr ? &hole->failure : nullptr;
        if (damage == nullptr && size < m_Nodes[part.file->entry].size) {
            (void)SetOutsideData(&outside);
            damage = &outside;
        }
        m_Sink->TakeFile(worker, part.file->entry, bytes, readable, damage);
        return;
    }

    SharedFile* const shared = part.shared;
    if (m_KeepsOrder) {
        std::unique_lock lock(m_Lock);
        m_HasAdvanced.wait(lock, [&] { return shared->inOrder == offset || IsStopped(); });
        if (IsStopped()) return;
    }
    bool isWanted;
    {
        Mutex::AutoLock lock(shared->lock);
        isWanted = offset < shared->readable;
        if (hole != nullptr && offset + readable < shared->readable) {
            shared->readable = offset + readable;
            shared->damage.Set(hole->failure);
        }
        const UInt64 wholeSize = m_Nodes[shared->entry].size;
        if (part.file->end - part.file->begin < wholeSize && shared->damage.Get() == nullptr) {
            shared->readable = part.file->end - part.file->begin;
            Failure outside;
            (void)SetOutsideData(&outside);
            shared->damage.Set(outside);
        }
    }
    if (isWanted && readable != 0) m_Sink->TakePart(worker, shared, offset, bytes, readable);
    if (m_KeepsOrder) {
        std::lock_guard lock(m_Lock);
        shared->inOrder = offset + size;
        m_HasAdvanced.notify_all();
    }
    // Each part's work comes before the last part's end of the file.
    if (shared->left.fetch_sub(size, std::memory_order_acq_rel) != size) return;
    Unshare(shared);
    m_Sink->EndFile(worker, shared);
}
