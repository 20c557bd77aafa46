#include "Library/Writer/EntryList.h"

#include <algorithm>
#include <cstring>

bool EntryList::Add(core::string_ref path, UInt32 flags, UInt64 size, UInt32 source) {
    const size_t begin = m_Paths.size();
    if (path.size() >= ~UInt32{0} || !m_Paths.resize_uninitialized(begin + path.size() + 1)) return false;
    if (!m_Entries.try_push_back({begin, 0, size, static_cast<UInt32>(path.size()), flags, source})) return false;
    memcpy(m_Paths.data() + begin, path.data(), path.size());
    m_Paths[begin + path.size()] = '\0';
    return true;
}

bool EntryList::CopyFrom(const EntryList& other) {
    if (!m_Paths.resize_uninitialized(other.m_Paths.size(), kResizeExact)) return false;
    if (!m_Entries.resize_uninitialized(other.size(), kResizeExact)) return false;
    if (other.size() == 0) return true;
    memcpy(m_Paths.data(), other.m_Paths.data(), m_Paths.size());
    memcpy(m_Entries.data(), other.m_Entries.data(), size() * sizeof(Entry));
    return true;
}

static int Compare(core::string_ref a, core::string_ref b) {
    const int order = memcmp(a.data(), b.data(), std::min(a.size(), b.size()));
    if (order != 0 || a.size() == b.size()) return order;
    return a.size() < b.size() ? -1 : 1;
}

void EntryList::Sort() {
    std::sort(m_Entries.begin(), m_Entries.end(),
              [&](const Entry& a, const Entry& b) { return Compare(PathOf(a), PathOf(b)) < 0; });
}

size_t EntryList::Find(core::string_ref path) const {
    const Entry* const found =
        std::lower_bound(m_Entries.begin(), m_Entries.end(), path, [&](const Entry& entry, core::string_ref wanted) {
            return Compare(PathOf(entry), wanted) < 0;
        });
    const bool isThere = found != m_Entries.end() && PathOf(*found) == path;
    return isThere ? static_cast<size_t>(found - m_Entries.begin()) : size();
}

size_t EntryList::FindClash() const {
    for (size_t index = 0; index < size(); ++index) {
        const core::string_ref path = PathOf(index);
        if (index != 0 && path == PathOf(index - 1)) return index;
        for (size_t end = path.find('/'); end < path.size(); end = path.find('/', end + 1)) {
            const size_t folder = Find(path.substr(0, end));
            if (folder != size() && !IsFolder(m_Entries[folder])) return folder;
        }
    }
    return size();
}
