#include "Library/Inspection.h"

#include "Runtime/Allocator/Allocator.h"

#include <algorithm>
#include <cerrno>
#include <climits>

zarvo_code TestRun::Test(const zarvo_test_options& what, zarvo_summary* summary, Failure* failure) {
    Data().AddAllBlocks();
    if (!ListEnds()) return failure->SetMemory();
    if (const zarvo_code code = Run(failure); code != ZARVO_OK) return code;
    std::sort(m_Damages.begin(), m_Damages.end(), [](const Damage& a, const Damage& b) { return a.begin < b.begin; });
    // A block that is cut into units is told once, with its first damage.
    UInt32 last = ~UInt32{0};
    for (const Damage& damage : m_Damages) {
        if (damage.blockIndex == last) continue;
        last = damage.blockIndex;
        ++summary->damaged_blocks;
        if (what.block != nullptr)
            what.block(Options().context, damage.blockIndex, m_Failures.Get(damage.failure).text);
    }
    for (size_t entry = 0; entry < Nodes().size(); ++entry) {
        const UInt64 size = zarvo_archive::SizeOf(Nodes()[entry]);
        const UInt64 readable = ReadableBytes(Nodes()[entry]);
        ++(zarvo_archive::IsFolder(Nodes()[entry]) ? summary->folders : summary->files);
        summary->bytes += size;
        if (readable == size) continue;
        ++summary->failures;
        if (what.entry != nullptr) what.entry(Options().context, entry, readable);
    }
    return ZARVO_OK;
}

// For progress: the entries that end in a piece of data are counted with it, and those that end nowhere in it at once.
bool TestRun::ListEnds() {
    if (!m_Ends.resize_uninitialized(Nodes().size(), kResizeExact)) return false;
    size_t count = 0;
    for (const Node& node : Nodes())
        if (zarvo_archive::SizeOf(node) != 0 && !IsOutsideData(node))
            m_Ends[count++] = node.offset + std::min<UInt64>(node.size, Archive()->Info().data_size - node.offset);
    m_Ends.truncate(count);
    std::sort(m_Ends.begin(), m_Ends.end());
    Expect(Nodes().size());
    Count(Nodes().size() - count);
    return true;
}

void TestRun::TakeData(UInt64 begin, UInt64 end) {
    UInt64* const first = std::upper_bound(m_Ends.begin(), m_Ends.end(), begin);
    Count(static_cast<UInt64>(std::upper_bound(first, m_Ends.end(), end) - first));
}

UInt64 TestRun::ReadableBytes(const Node& node) const {
    const UInt64 size = zarvo_archive::SizeOf(node);
    if (size == 0) return 0;
    if (IsOutsideData(node)) return 0;
    UInt64 end = node.offset + std::min(size, Archive()->Info().data_size - node.offset);
    // Of those that end after the file's beginning, the first.
    const Damage* const damage = std::lower_bound(m_Damages.begin(), m_Damages.end(), node.offset,
                                                  [](const Damage& at, UInt64 place) { return at.end <= place; });
    if (damage != m_Damages.end()) end = std::min(end, std::max(damage->begin, UInt64{node.offset}));
    return end - node.offset;
}

void TestRun::TakeDamage(UInt32 blockIndex, UInt64 begin, UInt64 end, const Failure& damage) {
    UInt32 place = 0;
    Mutex::AutoLock lock(m_DamageLock);
    if (!m_Failures.Add(damage, &place) || !m_Damages.try_push_back({blockIndex, place, begin, end}))
        Data().StopWithoutMemory();
}

zarvo_code VisitRun::Visit(Failure* failure) {
    Data().KeepOrder();
    UInt64 bytes = 0;
    if (const zarvo_code code = Plan(&m_Plan, &bytes, failure); code != ZARVO_OK) return code;
    if (const zarvo_code code = AddPlanned(m_Plan, failure); code != ZARVO_OK) return code;
    return Run(failure);
}

// Whatever has no bytes to hand over. If its turn came after all data, the results of most other entries would have to
// wait for it.
bool VisitRun::IsSettledBefore(UInt32 entry) {
    const Node& node = Nodes()[entry];
    Failure failure;
    if (!zarvo_archive::IsFolder(node)) {
        if (!HasNameForDisk(entry))
            (void)failure.SetSystem(ENAMETOOLONG);
        else if (node.size != 0 && IsOutsideData(node))
            (void)SetOutsideData(&failure);
        else if (node.size != 0)
            return false;
    }
    if (failure.code == ZARVO_OK)
        SetDone(entry);
    else
        SetFailed(entry, failure);
    return true;
}

// Whether there are file systems that take the path.
bool VisitRun::HasNameForDisk(UInt32 entry) const {
    for (PathComponents at(m_Plan.PathOnDisk(entry)); at.Next();)
        if (at.Name().size() > NAME_MAX) return false;
    return true;
}

void VisitRun::HandOver(UInt32 entry, UInt64 offset, const UInt8* bytes, UInt64 size) {
    if (size != 0 && m_What.bytes != nullptr)
        m_What.bytes(Options().context, entry, offset, bytes, static_cast<size_t>(size));
}

void VisitRun::TakeFile(UInt32, UInt32 entry, const UInt8* bytes, UInt64 readable, const Failure* damage) {
    HandOver(entry, 0, bytes, readable);
    if (damage != nullptr)
        SetFailed(entry, *damage);
    else
        SetDone(entry);
}

SharedFile* VisitRun::ShareFile(UInt32 entry, UInt64 size) { return New<SharedFile>(kMemLabelFileSystem, entry, size); }

void VisitRun::TakePart(UInt32, SharedFile* file, UInt64 offset, const UInt8* bytes, UInt64 size) {
    HandOver(file->entry, offset, bytes, size);
}

void VisitRun::EndFile(UInt32, SharedFile* file) {
    {
        Mutex::AutoLock lock(file->lock);
        if (const Failure* const damage = file->damage.Get())
            SetFailed(file->entry, *damage);
        else
            SetDone(file->entry);
    }
    Delete(file, kMemLabelFileSystem);
}

void VisitRun::DropFile(SharedFile* file) { Delete(file, kMemLabelFileSystem); }

void VisitRun::Report(const zarvo_report& report) {
    if (m_What.report != nullptr) m_What.report(Options().context, &report);
}
