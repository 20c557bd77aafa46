#include "Library/EntryIndex.h"

#include <sys/random.h>

using ArchiveStorageHeader::Node;

static bool IsFolder(const Node& node) { return (node.flags & ArchiveStorageHeader::kNodeDirectory) != 0; }

EntryIndex::EntryIndex(const Nodes& nodes)
    : m_Nodes(nodes),
      m_Implied(kMemLabelFileSystem),
      m_Slots(kMemLabelFileSystem),
      m_FirstChild(kMemLabelFileSystem),
      m_NextSibling(kMemLabelFileSystem) {
    // Without a random number the addresses of this process are the seed.
    if (getrandom(&m_Seed, sizeof(m_Seed), GRND_NONBLOCK) != static_cast<ssize_t>(sizeof(m_Seed)))
        m_Seed = reinterpret_cast<UInt64>(this);
}

core::string_ref EntryIndex::Path(UInt32 item) const {
    if (item == kRoot) return {};
    if (!IsImplied(item)) return m_Nodes[item].path;
    const ImpliedFolder& folder = m_Implied[item - m_Nodes.size()];
    return core::string_ref(m_Nodes[folder.entry].path).substr(0, folder.length);
}

UInt64 EntryIndex::HashOf(core::string_ref path) const {
    UInt64 hash = m_Seed;
    for (PathComponents at(path); at.Next();)
        hash = HashComponent(hash, at.Name());
    return hash;
}

// The slot of the item with that path, or the empty one where it belongs.
EntryIndex::Slot& EntryIndex::FindSlot(UInt64 hash, core::string_ref path) {
    const UInt32 shortHash = static_cast<UInt32>(hash);
    size_t index = StartOf(shortHash);
    while (m_Slots[index].item != kNoItem) {
        if (m_Slots[index].hash == shortHash && IsSamePath(Path(m_Slots[index].item), path)) break;
        if (++index == m_Slots.size()) index = 0;
    }
    return m_Slots[index];
}

UInt32 EntryIndex::Find(core::string_ref path) const {
    if (LastComponent(path).empty()) return kRoot;
    if (m_Slots.empty()) return kNoItem;
    return const_cast<EntryIndex*>(this)->FindSlot(HashOf(path), path).item;
}

// Makes room for count items.
bool EntryIndex::ReserveSlots(size_t count) {
    const size_t wanted = count + count / 4 + 8;
    if (wanted <= m_Slots.size()) return true;
    dynamic_array<Slot> old = std::move(m_Slots);
    // An index that outgrew its table once has many folders: leave room for as many again.
    const size_t roomy = old.empty() ? wanted : wanted + count / 4;
    if (!m_Slots.resize_uninitialized(roomy, kResizeExact)) return false;
    for (Slot& slot : m_Slots)
        slot.item = kNoItem;
    for (const Slot& slot : old) {
        if (slot.item == kNoItem) continue;
        size_t index = StartOf(slot.hash);
        while (m_Slots[index].item != kNoItem)
            if (++index == m_Slots.size()) index = 0;
        m_Slots[index] = slot;
    }
    return true;
}

zarvo_code EntryIndex::Build(Failure* failure) {
    const UInt32 count = static_cast<UInt32>(m_Nodes.size());
    // What an attempt that found no memory has left.
    m_Implied.clear();
    m_Slots = dynamic_array<Slot>(kMemLabelFileSystem);
    m_FirstInRoot = kNoItem;
    if (m_Nodes.size() >= kRoot || !ReserveSlots(size_t{count} + count / 16) ||
        !m_NextSibling.resize_uninitialized(count, kResizeExact) ||
        !m_FirstChild.resize_uninitialized(count, kResizeExact))
        return failure->SetMemory();
    std::fill(m_NextSibling.begin(), m_NextSibling.end(), kNoItem);
    std::fill(m_FirstChild.begin(), m_FirstChild.end(), kNoItem);

    // From the last to the first: the first that is met of equal paths is the one that counts.
    for (UInt32 item = count; item-- > 0;) {
        const core::string_ref path = m_Nodes[item].path;
        if (GetPathProblem(path, !IsFolder(m_Nodes[item])) != ZARVO_PROBLEM_NONE) continue;
        const UInt64 hash = HashOf(path);
        Slot& slot = FindSlot(hash, path);
        if (slot.item == kNoItem) slot = {static_cast<UInt32>(hash), item};
    }
    // In the same order, so that putting each in front of its folder's list leaves the list in the archive's order.
    dynamic_array<UInt64> hashes(kMemLabelGeneral);
    for (UInt32 item = count; item-- > 0;) {
        const core::string_ref path = m_Nodes[item].path;
        if (GetPathProblem(path, !IsFolder(m_Nodes[item])) != ZARVO_PROBLEM_NONE) continue;
        if (!LinkIntoFolders(item, &hashes)) return failure->SetMemory();
    }
    return ZARVO_OK;
}

// Puts an entry into its folder, and implied folders that are met for the first time into theirs.
bool EntryIndex::LinkIntoFolders(UInt32 entry, dynamic_array<UInt64>* hashes) {
    // The hashes of the path's folders, outermost first, and of the path itself.
    const core::string_ref path = m_Nodes[entry].path;
    hashes->clear();
    UInt64 hash = m_Seed;
    for (PathComponents at(path); at.Next();) {
        hash = HashComponent(hash, at.Name());
        const size_t index = hashes->size();
        if (!hashes->resize_uninitialized(index + 1)) return false;
        (*hashes)[index] = hash;
    }
    if (FindSlot(hash, path).item != entry) return true; // a later one counts

    UInt32 item = entry;
    core::string_ref rest = path;
    for (size_t depth = hashes->size() - 1; depth != 0; --depth) {
        rest = WithoutLastComponent(rest);
        const UInt64 folderHash = (*hashes)[depth - 1];
        if (!ReserveSlots(size_t{ItemCount()} + 1)) return false;
        Slot& slot = FindSlot(folderHash, rest);
        const bool isNew = slot.item == kNoItem;
        if (isNew && !AddImpliedFolder(entry, rest.size(), &slot, folderHash)) return false;
        const UInt32 folder = slot.item;
        PutInFront(item, &m_FirstChild[folder]);
        if (!isNew) return true;
        item = folder;
    }
    PutInFront(item, &m_FirstInRoot);
    return true;
}

// As resize_uninitialized, but by an eighth at a time: most archives imply few folders, or none.
template <typename T>
static bool AppendOne(dynamic_array<T>* array, T value) {
    const size_t size = array->size();
    if (size == array->capacity() && !array->reserve(size + size / 8 + 16)) return false;
    if (!array->resize_uninitialized(size + 1)) return false;
    (*array)[size] = value;
    return true;
}

bool EntryIndex::AddImpliedFolder(UInt32 entry, size_t length, Slot* slot, UInt64 hash) {
    const UInt32 item = ItemCount();
    if (item >= kRoot - 1 || length > ~UInt32{0}) return false;
    if (!AppendOne(&m_Implied, {entry, static_cast<UInt32>(length)})) return false;
    if (!AppendOne(&m_FirstChild, UInt32{kNoItem}) || !AppendOne(&m_NextSibling, UInt32{kNoItem})) return false;
    *slot = {static_cast<UInt32>(hash), item};
    return true;
}

void EntryIndex::PutInFront(UInt32 item, UInt32* first) {
    m_NextSibling[item] = *first;
    *first = item;
}
