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

void DataRun::AddFile(UInt32 entry) {
    m_BytesTotal += EndOf(entry) - BeginOf(entry);
    m_Files.push_back(entry); // never grows
}

bool DataRun::AddOther(UInt32 entry) { return m_Others.try_push_back(entry); }

void DataRun::Prepare() {
    const auto isBefore = [this](UInt32 a, UInt32 b) {
        return BeginOf(a) != BeginOf(b) ? BeginOf(a) < BeginOf(b) : a < b;
    };
    // In most archives, the directory has that order.
    if (!std::is_sorted(m_Files.begin(), m_Files.end(), isBefore)) std::sort(m_Files.begin(), m_Files.end(), isBefore);
    if (m_TakesAllBlocks) m_BytesTotal = m_DataSize;
}

void DataRun::StopFor(const Failure& failure) {
    std::lock_guard lock(m_Lock);
    if (m_Fatal.code == ZARVO_OK) m_Fatal = failure;
    m_IsStopped.store(true, std::memory_order_relaxed);
    m_HasWork.notify_all();
    m_HasAdvanced.notify_all();
}

void DataRun::StopWithoutMemory() {
    Failure failure;
    (void)failure.SetMemory();
    StopFor(failure);
}

SharedFile* DataRun::Share(UInt32 entry) {
    SharedFile* shared = m_Sink->ShareFile(entry, EndOf(entry) - BeginOf(entry));
    if (shared == nullptr) return nullptr;
    shared->liveIndex = m_Shared.size();
    if (m_Shared.try_push_back(shared)) return shared;
    m_Sink->DropFile(shared);
    return nullptr;
}

// All parts of the file have been handed over.
void DataRun::Unshare(SharedFile* shared) {
    std::lock_guard lock(m_Lock);
    SharedFile* const last = m_Shared.back();
    m_Shared[shared->liveIndex] = last;
    last->liveIndex = shared->liveIndex;
    m_Shared.pop_back();
}

// Where the unit that begins at a place ends: after about m_UnitSize bytes, or before a block that no file needs.
UInt64 DataRun::FindUnitEnd(const Unit& unit, UInt64 begin) const {
    UInt64 reach = 0; // of the files that begin before the place looked at
    for (const PieceFile& active : m_Active)
        reach = std::max(reach, EndOf(active.entry));
    size_t file = m_NextFile;
    UInt64 end = begin;
    UInt32 count = 0; // of blocks with bytes
    for (UInt32 index = unit.firstBlock; index < m_Decoder->BlockCount() && count < kMaxUnitBlocks; ++index) {
        const Block block = m_Decoder->GetBlock(index);
        const bool isFirst = index == unit.firstBlock;
        const UInt64 blockEnd = block.position + block.size;
        for (; file < m_Files.size() && BeginOf(m_Files[file]) < blockEnd; ++file)
            reach = std::max(reach, EndOf(m_Files[file]));
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
        if (!unit->carried.try_push_back(active)) return false;
        if (EndOf(active.entry) > unit->end) m_Active[kept++] = active;
    }
    m_Active.truncate(kept);
    unit->firstFile = m_NextFile;
    for (; m_NextFile < m_Files.size() && BeginOf(m_Files[m_NextFile]) < unit->end; ++m_NextFile) {
        const UInt32 entry = m_Files[m_NextFile];
        if (EndOf(entry) <= unit->end) continue;
        const PieceFile leaving = {entry, Share(entry)};
        if (leaving.shared == nullptr || !unit->leaving.try_push_back(leaving) || !m_Active.try_push_back(leaving))
            return false;
    }
    unit->endFile = m_NextFile;
    return true;
}

DataRun::UnitAnswer DataRun::NextUnit(Unit* unit) {
    UInt64 begin = m_Position;
    if (m_Active.empty() && !m_TakesAllBlocks) {
        if (m_NextFile == m_Files.size()) return kNoUnit;
        begin = std::max(begin, BeginOf(m_Files[m_NextFile]));
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
    Lock lock(m_Lock);
    while (!IsStopped()) {
        if (!m_Passed.empty()) {
            DeliverPassed(worker, &lock);
        } else if (const UnitAnswer answer = NextUnit(&unit); answer == kUnit) {
            WorkOnUnit(worker, unit, &piece, &lock);
        } else if (answer == kNoMemoryForUnit) {
            lock.unlock();
            StopWithoutMemory();
            lock.lock();
        } else if (m_NextOther < m_Others.size()) {
            TakeOthers(worker, &lock);
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

// The oldest first.
void DataRun::DeliverPassed(UInt32 worker, Lock* lock) {
    Piece* const passed = m_Passed[0];
    std::move(m_Passed.begin() + 1, m_Passed.end(), m_Passed.begin());
    m_Passed.pop_back();
    lock->unlock();
    Deliver(worker, *passed);
    lock->lock();
    if (!m_Spare.try_push_back(passed)) Delete(passed, kMemLabelFileSystem);
}

void DataRun::WorkOnUnit(UInt32 worker, const Unit& unit, Piece** piece, Lock* lock) {
    if (unit.isStream) ++m_Streams;
    lock->unlock();
    if (unit.isStream)
        WorkOnStream(worker, unit, piece);
    else
        WorkOnBlocks(worker, unit, *piece);
    lock->lock();
    if (unit.isStream && --m_Streams == 0) m_HasWork.notify_all();
}

void DataRun::TakeOthers(UInt32 worker, Lock* lock) {
    const size_t first = m_NextOther;
    const size_t end = std::min(m_Others.size(), first + kOthersAtOnce);
    m_NextOther = end;
    lock->unlock();
    for (size_t index = first; index < end && !IsStopped(); ++index) {
        m_Sink->TakeOther(worker, m_Others[index]);
        m_Sink->BetweenFiles();
    }
    lock->lock();
}

void DataRun::WorkOnBlocks(UInt32 worker, const Unit& unit, Piece* piece) {
    piece->begin = unit.begin;
    piece->end = unit.end;
    piece->files.clear();
    for (const PieceFile& carried : unit.carried)
        if (!piece->files.try_push_back(carried)) return StopWithoutMemory();
    size_t leaving = 0;
    for (size_t index = unit.firstFile; index < unit.endFile; ++index) {
        const UInt32 entry = m_Files[index];
        const PieceFile inPiece = EndOf(entry) <= unit.end ? PieceFile{entry, nullptr} : unit.leaving[leaving++];
        if (!piece->files.try_push_back(inPiece)) return StopWithoutMemory();
    }
    Decode(unit, piece);
    Deliver(worker, *piece);
}

void DataRun::AddHole(Piece* piece, UInt64 begin, UInt64 end, const Failure& failure) {
    if (failure.code == ZARVO_ERROR_MEMORY || failure.code == ZARVO_ERROR_CHANGED) return StopFor(failure);
    if (!piece->holes.try_push_back({begin, end, failure})) StopWithoutMemory();
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
        end = std::max(end, std::min(unit.end, EndOf(carried.entry)));
        if (!active.try_push_back(carried)) return StopWithoutMemory();
    }
    for (size_t index = unit.firstFile; index < unit.endFile; ++index)
        end = std::max(end, std::min(unit.end, EndOf(m_Files[index])));
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
            isOk = isOk && (*piece)->files.try_push_back(going);
            if (EndOf(going.entry) > (*piece)->end) active[kept++] = going;
        }
        active.truncate(kept);
        for (; isOk && file < unit.endFile && BeginOf(m_Files[file]) < (*piece)->end; ++file) {
            const UInt32 entry = m_Files[file];
            PieceFile inPiece = {entry, nullptr};
            if (EndOf(entry) > unit.end) {
                inPiece = unit.leaving[leaving++];
            } else if (EndOf(entry) > (*piece)->end) {
                std::lock_guard lock(m_Lock);
                inPiece.shared = Share(entry);
                isOk = inPiece.shared != nullptr;
            }
            isOk = isOk && (*piece)->files.try_push_back(inPiece);
            if (EndOf(entry) > (*piece)->end) isOk = isOk && active.try_push_back(inPiece);
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
        next = m_Spare.back();
        m_Spare.pop_back();
    } else {
        next = New<Piece>(kMemLabelFileSystem);
    }
    if (next == nullptr) return false;
    if (!m_Passed.try_push_back(*piece)) {
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
        const UInt64 fileBegin = BeginOf(part.entry);
        const UInt64 begin = std::max(fileBegin, piece.begin);
        const UInt64 end = std::min(EndOf(part.entry), piece.end);
        // Holes are in the order of their places.
        const Hole* hole = std::lower_bound(piece.holes.begin(), piece.holes.end(), begin,
                                            [](const Hole& at, UInt64 place) { return at.end <= place; });
        if (hole == piece.holes.end() || hole->begin >= end) hole = nullptr;
        // A piece that has no bytes is all hole.
        const UInt8* const bytes = piece.bytes.empty() ? nullptr : piece.bytes.data() + (begin - piece.begin);
        DeliverPart(worker, part, begin - fileBegin, bytes, end - begin, hole);
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
    const UInt64 partBegin = BeginOf(part.entry) + offset;
    const UInt64 readable = hole != nullptr ? std::max(hole->begin, partBegin) - partBegin : size;
    if (part.shared == nullptr) {
        Failure outside;
        const Failure* damage = hole != nullptr ? &hole->failure : nullptr;
        if (damage == nullptr && size < m_Nodes[part.entry].size) {
            (void)SetOutsideData(&outside);
            damage = &outside;
        }
        m_Sink->TakeFile(worker, part.entry, bytes, readable, damage);
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
        const UInt64 sizeInData = EndOf(part.entry) - BeginOf(part.entry);
        if (sizeInData < m_Nodes[part.entry].size && shared->damage.Get() == nullptr) {
            shared->readable = sizeInData;
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
