#include "Library/EntryIndex.h"

#include "Library/PathRules.h"

using ArchiveStorageHeader::Node;

// Hashes paths, and remembers the hash of the last folder: most paths lie in the folder of the path before them.
class EntryIndex::PathHasher {
public:
    explicit PathHasher(UInt64 seed) : m_Seed(seed), m_FolderHash(seed) {}

    UInt64 Hash(core::string_ref path) {
        const core::string_ref folder = WithoutLastComponent(path);
        if (!(folder == m_Folder)) {
            m_Folder = folder;
            m_FolderHash = HashPath(folder, m_Seed);
        }
        return HashComponent(m_FolderHash, LastComponent(path));
    }

    // The folder of the path that was hashed last.
    core::string_ref Folder() const { return m_Folder; }
    UInt64 FolderHash() const { return m_FolderHash; }

private:
    const UInt64 m_Seed;
    core::string_ref m_Folder;
    UInt64 m_FolderHash;
};

static bool IsFolder(const Node& node) { return (node.flags & ArchiveStorageHeader::kNodeDirectory) != 0; }

EntryIndex::EntryIndex(const Nodes& nodes)
    : m_Nodes(nodes),
      m_Implied(kMemLabelFileSystem),
      m_FirstChild(kMemLabelFileSystem),
      m_NextSibling(kMemLabelFileSystem),
      m_Seed(RandomHashSeed()) {}

core::string_ref EntryIndex::Path(UInt32 item) const {
    if (item == kRoot) return {};
    if (!IsImplied(item)) return m_Nodes[item].path;
    const ImpliedFolder& folder = m_Implied[item - m_Nodes.size()];
    return core::string_ref(m_Nodes[folder.entry].path).substr(0, folder.length);
}

static size_t MeasureNormalForm(core::string_ref path) {
    size_t length = 0;
    for (PathComponents at(path); at.Next();)
        length += at.Name().size() + (length != 0 ? 1 : 0);
    return length;
}

size_t EntryIndex::NormalLength(UInt32 item) const {
    if (item != kRoot && IsImplied(item)) return m_Implied[item - m_Nodes.size()].normalLength;
    return MeasureNormalForm(Path(item));
}

// The slot of the item with that path, or the empty one where it belongs.
UInt32* EntryIndex::FindSlot(UInt64 hash, core::string_ref path) {
    return m_Table.Find(hash, path, [this](UInt32 item) { return Path(item); });
}

UInt32 EntryIndex::Find(core::string_ref path) const {
    if (LastComponent(path).empty()) return kRoot;
    return m_Table.Get(HashPath(path, m_Seed), path, [this](UInt32 item) { return Path(item); });
}

zarvo_code EntryIndex::Build(Failure* failure) {
    const UInt32 count = static_cast<UInt32>(m_Nodes.size());
    // What an attempt that found no memory has left.
    m_Implied.clear();
    m_Table.Clear();
    m_FirstInRoot = kNoItem;
    if (m_Nodes.size() >= kRoot || !m_Table.Reserve(size_t{count} + count / 16) ||
        !m_NextSibling.resize_uninitialized(count, kResizeExact) ||
        !m_FirstChild.resize_uninitialized(count, kResizeExact))
        return failure->SetMemory();
    std::fill(m_NextSibling.begin(), m_NextSibling.end(), kNoItem);
    std::fill(m_FirstChild.begin(), m_FirstChild.end(), kNoItem);

    PathHasher hasher(m_Seed);
    // From the last to the first: the first that is met of equal paths is the one that counts, but for folders, which
    // give way to files.
    for (UInt32 item = count; item-- > 0;) {
        const core::string_ref path = m_Nodes[item].path;
        if (GetPathProblem(path, !IsFolder(m_Nodes[item])) != ZARVO_PROBLEM_NONE) continue;
        UInt32* const slot = FindSlot(hasher.Hash(path), path);
        const bool isFree = *slot == kNoItem || (IsFolder(m_Nodes[*slot]) && !IsFolder(m_Nodes[item]));
        if (isFree) *slot = item;
    }
    // In the same order, so that putting each in front of its folder's list leaves the list in the archive's order.
    dynamic_array<UInt64> hashes(kMemLabelGeneral);
    for (UInt32 item = count; item-- > 0;) {
        const core::string_ref path = m_Nodes[item].path;
        if (GetPathProblem(path, !IsFolder(m_Nodes[item])) != ZARVO_PROBLEM_NONE) continue;
        if (!LinkIntoFolders(item, &hasher, &hashes)) return failure->SetMemory();
    }
    return ZARVO_OK;
}

// Puts an entry into its folder, and implied folders that are met for the first time into theirs.
bool EntryIndex::LinkIntoFolders(UInt32 entry, PathHasher* hasher, dynamic_array<UInt64>* hashes) {
    const core::string_ref path = m_Nodes[entry].path;
    if (*FindSlot(hasher->Hash(path), path) != entry) return true; // another one counts
    const UInt32 above = *FindSlot(hasher->FolderHash(), hasher->Folder());
    if (above != kNoItem) {
        PutInFront(entry, &m_FirstChild[above]);
        return true;
    }

    // In the root, or in a folder that is met for the first time.
    if (!HashFolders(path, m_Seed, hashes)) return false;
    UInt32 item = entry;
    core::string_ref rest = path;
    size_t normalLength = MeasureNormalForm(path);
    for (size_t depth = hashes->size() - 1; depth != 0; --depth) {
        normalLength -= LastComponent(rest).size() + 1;
        rest = WithoutLastComponent(rest);
        if (!m_Table.Reserve(size_t{ItemCount()} + 1)) return false;
        UInt32* const slot = FindSlot((*hashes)[depth - 1], rest);
        const bool isNew = *slot == kNoItem;
        if (isNew && !AddImpliedFolder(entry, rest.size(), normalLength, slot)) return false;
        const UInt32 folder = *slot;
        PutInFront(item, &m_FirstChild[folder]);
        if (!isNew) return true;
        item = folder;
    }
    PutInFront(item, &m_FirstInRoot);
    return true;
}

// By an eighth at a time: most archives imply few folders, or none.
template <typename T>
static bool MakeRoomForOne(dynamic_array<T>* array) {
    const size_t size = array->size();
    return size < array->capacity() || array->reserve(size + size / 8 + 16);
}

bool EntryIndex::AddImpliedFolder(UInt32 entry, size_t length, size_t normalLength, UInt32* slot) {
    const UInt32 item = ItemCount();
    if (item >= kRoot - 1 || length > ~UInt32{0}) return false;
    if (!MakeRoomForOne(&m_Implied) || !MakeRoomForOne(&m_FirstChild) || !MakeRoomForOne(&m_NextSibling)) return false;
    m_Implied.push_back({entry, static_cast<UInt32>(length), static_cast<UInt32>(normalLength)});
    m_FirstChild.push_back(kNoItem);
    m_NextSibling.push_back(kNoItem);
    *slot = item;
    return true;
}

void EntryIndex::PutInFront(UInt32 item, UInt32* first) {
    m_NextSibling[item] = *first;
    *first = item;
}
