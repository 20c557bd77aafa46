#include "Library/OutputPlan.h"

using ArchiveStorageHeader::kNodeDirectory;

core::string_ref OutputPlan::Strip(core::string_ref path) const {
    PathComponents at(path);
    size_t start = 0;
    for (UInt64 count = 0; count < m_Strip; ++count) {
        if (!at.Next()) return {};
        start = at.End();
    }
    return path.substr(start);
}

core::string_ref OutputPlan::PathOfItem(UInt32 item) const {
    if (item < m_Nodes.size()) return PathOnDisk(item);
    const ImpliedFolder& folder = m_Implied[item - m_Nodes.size()];
    return PathOnDisk(folder.entry).substr(0, folder.length);
}

bool OutputPlan::IsFolderItem(UInt32 item) const {
    return item >= m_Nodes.size() || (m_Nodes[item].flags & kNodeDirectory) != 0;
}

UInt32* OutputPlan::Find(UInt64 hash, core::string_ref path) {
    return m_Table.Find(hash, path, [this](UInt32 item) { return PathOfItem(item); });
}

zarvo_code OutputPlan::Build(zarvo_patterns* wanted, zarvo_patterns* excluded, Failure* failure) {
    const UInt32 count = static_cast<UInt32>(m_Nodes.size());
    if (m_Nodes.size() > PathTable::kNoItem / 2 || !m_Verdicts.resize_uninitialized(count, kResizeExact) ||
        !m_Table.Reserve(size_t{count} + count / 64))
        return failure->SetMemory();
    m_Seed = RandomHashSeed();
    dynamic_array<UInt64> hashes(kMemLabelGeneral);
    for (UInt32 entry = 0; entry < count; ++entry) {
        const core::string& path = m_Nodes[entry].path;
        m_Verdicts[entry] = kUnwanted;
        const int isWanted = wanted != nullptr ? wanted->Match(path) : 1;
        const int isExcluded = isWanted == 1 && excluded != nullptr ? excluded->Match(path) : 0;
        if (isWanted < 0 || isExcluded < 0) return failure->SetMemory();
        if (isWanted == 0 || isExcluded == 1) continue;
        if (GetPathProblem(path, !IsFolderItem(entry)) != ZARVO_PROBLEM_NONE)
            m_Verdicts[entry] = kRefused;
        else if (!Settle(entry, &hashes))
            return failure->SetMemory();
    }
    m_Table.Clear();
    m_Implied = dynamic_array<ImpliedFolder>(kMemLabelFileSystem);
    return ZARVO_OK;
}

void OutputPlan::SetRefusal(size_t entry, Failure* failure) const {
    const bool isFile = (m_Nodes[entry].flags & kNodeDirectory) == 0;
    if (m_Verdicts[entry] == kClash) {
        (void)failure->Set(ZARVO_ERROR_REFUSED, "an entry before it in the archive has its place");
        return;
    }
    switch (GetPathProblem(m_Nodes[entry].path, isFile)) {
    case ZARVO_PROBLEM_PARENT: (void)failure->Set(ZARVO_ERROR_REFUSED, "the path has a component \"..\""); break;
    case ZARVO_PROBLEM_SEPARATOR:
        (void)failure->Set(ZARVO_ERROR_REFUSED, "the path of a file ends with a separator");
        break;
    default: (void)failure->Set(ZARVO_ERROR_REFUSED, "the path is empty"); break;
    }
}

// Gives the entry its path, and those of the folders above it, unless they belong to somebody else, or no path is left.
bool OutputPlan::Settle(UInt32 entry, dynamic_array<UInt64>* hashes) {
    const core::string_ref path = PathOnDisk(entry);
    const bool isFolder = IsFolderItem(entry);
    if (!HashFolders(path, m_Seed, hashes)) return false;
    const size_t depth = hashes->size();
    if (depth == 0) return true;
    if (!m_Table.Reserve(m_Settled + m_Implied.size() + depth)) return false;

    // The innermost folder that is there already decides: those around it are folders, as it would not be there else.
    size_t there = depth - 1;
    core::string_ref folder = path;
    for (; there != 0; --there) {
        folder = WithoutLastComponent(folder);
        const UInt32 item = *Find((*hashes)[there - 1], folder);
        if (item == PathTable::kNoItem) continue;
        if (IsFolderItem(item)) break;
        m_Verdicts[entry] = kClash;
        return true;
    }
    UInt32* const own = Find((*hashes)[depth - 1], path);
    if (*own != PathTable::kNoItem && IsFolderItem(*own) != isFolder) {
        m_Verdicts[entry] = kClash;
        return true;
    }
    if (*own == PathTable::kNoItem)
        ++m_Settled;
    else if (*own < m_Nodes.size())
        m_Verdicts[*own] = kReplaced;
    *own = entry;
    m_Verdicts[entry] = isFolder ? kFolder : kFile;

    // The folders between are implied from now on.
    if (there + 1 == depth) return true;
    PathComponents at(path);
    for (size_t level = 0; level + 1 < depth; ++level) {
        (void)at.Next();
        if (level < there) continue;
        const size_t index = m_Implied.size();
        if (at.End() > ~UInt32{0} || !m_Implied.try_push_back({entry, static_cast<UInt32>(at.End())})) return false;
        *Find((*hashes)[level], path.substr(0, at.End())) = static_cast<UInt32>(m_Nodes.size() + index);
    }
    return true;
}
