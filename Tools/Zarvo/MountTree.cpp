#include "Tools/Zarvo/MountTree.h"

#include <algorithm>

zarvo::error MountTree::Build() {
    if (zarvo::result<uint64_t> root = m_Archive.find(""); !root) return std::move(root).error();
    zarvo::run_options options;
    options.threads = 1;
    zarvo::extract_options how;
    how.dry_run = true;
    how.report = [&](const zarvo_report& report) {
        if (report.code != ZARVO_ERROR_REFUSED) return;
        ++m_Hidden;
        if (m_Archive.entries()[report.index].problem() == ZARVO_PROBLEM_NONE) m_Replaced[report.index] = ZARVO_NO_ITEM;
    };
    zarvo::run_result result = m_Archive.extract("/", options, how);
    if (result.error) return std::move(result.error);

    // An item is the last entry of its path. The one that is shown may come before it.
    if (!m_Replaced.empty())
        for (const zarvo::entry entry : m_Archive.entries()) {
            if (entry.problem() != ZARVO_PROBLEM_NONE || m_Replaced.contains(entry.index())) continue;
            zarvo::result<uint64_t> item = m_Archive.find(entry.path());
            if (!item) return std::move(item).error();
            if (const auto replaced = m_Replaced.find(*item); replaced != m_Replaced.end())
                replaced->second = entry.index();
        }
    CountLongNames();
    return {};
}

void MountTree::CountLongNames() {
    for (const zarvo::entry entry : m_Archive.entries()) {
        if (entry.path().size() <= kMaxName || entry.problem() != ZARVO_PROBLEM_NONE) continue;
        const std::string path = zarvo::normalize_path(entry.path());
        size_t longest = 0;
        for (size_t from = 0; from < path.size();) {
            const size_t end = std::min(path.find('/', from), path.size());
            longest = std::max(longest, end - from);
            from = end + 1;
        }
        if (longest > kMaxName) ++m_Hidden;
    }
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
    const uint64_t item = ItemOf(number);
    const zarvo::result<zarvo_item> found = m_Archive.item(item);
    if (!found) return "";
    std::string path(found->path_length + 1, '\0');
    (void)zarvo_get_item_path(m_Archive.get(), item, path.data(), nullptr); // the item is there
    path.pop_back();
    return path;
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
