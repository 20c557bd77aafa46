#include "Tools/Zarvo/MountTree.h"

#include <algorithm>
#include <vector>

static bool HasLongName(const zarvo::entry& entry) {
    if (entry.path().size() <= MountTree::kMaxName) return false;
    const std::string path = zarvo::normalize_path(entry.path());
    for (size_t from = 0; from < path.size();) {
        const size_t end = std::min(path.find('/', from), path.size());
        if (end - from > MountTree::kMaxName) return true;
        from = end + 1;
    }
    return false;
}

zarvo::error MountTree::Build() {
    if (zarvo::result<uint64_t> root = m_Archive.find(""); !root) return std::move(root).error();
    const uint64_t count = m_Archive.item_count();
    std::vector<uint64_t> parents(count, ZARVO_ROOT);
    for (uint64_t item = 0; item < count; ++item)
        for (uint64_t child = m_Archive.item(item)->first_child; child != ZARVO_NO_ITEM;
             child = m_Archive.item(child)->next_sibling)
            parents[child] = item;

    // A path belongs to the entry that comes first: what it is, file or folder, it stays.
    enum Kind : uint8_t { kNothing, kFile, kFolder };
    std::vector<Kind> kinds(count, kNothing); // by item, from the entries so far
    for (const zarvo::entry entry : m_Archive.entries()) {
        if (entry.problem() != ZARVO_PROBLEM_NONE) {
            ++m_Hidden;
            continue;
        }
        zarvo::result<uint64_t> found = m_Archive.find(entry.path());
        if (!found) return std::move(found).error();
        const uint64_t item = *found;
        // Of what is above it, only the innermost that is there already can be a file.
        uint64_t folder = parents[item];
        while (folder != ZARVO_ROOT && kinds[folder] == kNothing)
            folder = parents[folder];
        const Kind kind = entry.is_folder() ? kFolder : kFile;
        const bool isClash =
            (folder != ZARVO_ROOT && kinds[folder] == kFile) || (kinds[item] != kNothing && kinds[item] != kind);
        if (isClash || HasLongName(entry)) ++m_Hidden;

        // The item is one of the entries of its path.
        const bool isItem = item == entry.index();
        if (isClash) {
            if (isItem) m_Replaced.try_emplace(item, ZARVO_NO_ITEM);
            continue;
        }
        if (isItem)
            m_Replaced.erase(item);
        else
            m_Replaced[item] = entry.index();
        kinds[item] = kind;
        for (uint64_t above = parents[item]; above != folder; above = parents[above])
            kinds[above] = kFolder;
    }
    return {};
}

std::optional<MountTree::Node> MountTree::Get(uint64_t number) const {
    const uint64_t index = ItemOf(number);
    zarvo::result<zarvo_item> item = m_Archive.item(index);
    if (!item) return std::nullopt;
    Node node = {.number = number, .entry = index, .isFolder = item->kind == ZARVO_FOLDER};
    node.name = {item->name, item->name_length};
    if (const auto replaced = m_Replaced.find(index); replaced != m_Replaced.end()) {
        node.entry = replaced->second;
        node.isFolder = node.entry == ZARVO_NO_ITEM || m_Archive.entries()[node.entry].is_folder();
    }
    // A larger size would be a negative one, and can't be in any archive.
    if (!node.isFolder) node.size = std::min<uint64_t>(m_Archive.entries()[node.entry].size(), INT64_MAX);
    return node;
}

std::string MountTree::GetPath(uint64_t number) const {
    zarvo::result<std::string> path = m_Archive.item_path(ItemOf(number));
    return path ? *std::move(path) : "";
}

std::optional<MountTree::Node> MountTree::FindPath(std::string_view path) const {
    const zarvo::result<uint64_t> item = m_Archive.find(path);
    return item ? Get(NumberOf(*item)) : std::nullopt;
}

std::optional<MountTree::Node> MountTree::Find(uint64_t folder, std::string_view name) const {
    if (name.find('\\') != std::string_view::npos) return std::nullopt; // it would be a separator
    std::string path = GetPath(folder);
    if (!path.empty()) path += '/';
    return FindPath(path += name);
}

std::optional<MountTree::Node> MountTree::GetParent(uint64_t number) const {
    const std::string path = GetPath(number);
    const size_t separator = path.rfind('/');
    return FindPath(std::string_view(path).substr(0, separator == std::string::npos ? 0 : separator));
}

// The item, or the next one beside it that is shown.
std::optional<MountTree::Node> MountTree::SkipHidden(uint64_t item) const {
    while (item != ZARVO_NO_ITEM) {
        std::optional<Node> node = Get(NumberOf(item));
        if (!node || node->name.size() <= kMaxName) return node;
        item = m_Archive.item(item)->next_sibling;
    }
    return std::nullopt;
}

std::optional<MountTree::Node> MountTree::GetFirstChild(uint64_t folder) const {
    const zarvo::result<zarvo_item> item = m_Archive.item(ItemOf(folder));
    return item ? SkipHidden(item->first_child) : std::nullopt;
}

std::optional<MountTree::Node> MountTree::GetNextSibling(uint64_t number) const {
    const zarvo::result<zarvo_item> item = m_Archive.item(ItemOf(number));
    return item ? SkipHidden(item->next_sibling) : std::nullopt;
}
