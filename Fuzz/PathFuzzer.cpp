// Properties: a normal form is what splitting a path and joining its components gives, and its own normal form; entries
// and implied folders are found, and hang in the tree, as a map of normal forms says.
#include "Fuzz/FuzzSupport.h"
#include "Library/include/zarvo.h"
#include "Tests/Support/ArchiveBuilder.h"

#include <algorithm>
#include <map>
#include <set>
#include <string>

namespace {

using Components = std::vector<std::string>;

Components Split(const std::string& path) {
    Components components(1);
    for (char character : path) {
        if (character == '/' || character == '\\')
            components.emplace_back();
        else
            components.back() += character;
    }
    std::erase_if(components, [](const std::string& name) { return name.empty() || name == "."; });
    return components;
}

std::string Join(const Components& components) {
    std::string path;
    for (const std::string& name : components)
        path += (path.empty() ? "" : "/") + name;
    return path;
}

int32_t ProblemOf(const ArchiveEntry& entry) {
    const Components components = Split(entry.path);
    for (const std::string& name : components)
        if (name == "..") return ZARVO_PROBLEM_PARENT;
    if (components.empty()) return ZARVO_PROBLEM_EMPTY;
    const bool endsInSeparator = entry.path.back() == '/' || entry.path.back() == '\\';
    return entry.flags != kFolderEntry && endsInSeparator ? ZARVO_PROBLEM_SEPARATOR : ZARVO_PROBLEM_NONE;
}

// By normal form: the entry that counts, which is the last file or, where there is none, the last folder; or none for
// an implied folder.
constexpr UInt64 kImplied = ~UInt64{0};
using Items = std::map<std::string, UInt64>;

Items ItemsOf(const std::vector<ArchiveEntry>& entries) {
    Items items;
    for (const bool areFolders : {true, false})
        for (UInt64 index = 0; index < entries.size(); ++index) {
            const ArchiveEntry& entry = entries[index];
            const bool isFolder = entry.flags == kFolderEntry;
            if (isFolder == areFolders && ProblemOf(entry) == ZARVO_PROBLEM_NONE)
                items[Join(Split(entry.path))] = index;
        }
    for (const ArchiveEntry& entry : entries) {
        if (ProblemOf(entry) != ZARVO_PROBLEM_NONE) continue;
        Components folder = Split(entry.path);
        while (folder.pop_back(), !folder.empty())
            items.try_emplace(Join(folder), kImplied);
    }
    return items;
}

void CheckNormalForm(const std::string& path) {
    const std::string expected = Join(Split(path));
    std::string normal(path.size() + 1, '?');
    normal.resize(zarvo_normalize_path(path.data(), path.size(), normal.data()));
    FuzzCheck(normal == expected);
    normal.resize(zarvo_normalize_path(normal.data(), normal.size(), normal.data()));
    FuzzCheck(normal == expected);
}

void CheckFind(zarvo_archive* archive, const Items& items, const std::string& path) {
    uint64_t found = ZARVO_NO_ITEM;
    const zarvo_code code = zarvo_find(archive, path.data(), path.size(), &found, nullptr);
    const std::string normal = Join(Split(path));
    const auto expected = items.find(normal);
    if (normal.empty()) {
        FuzzCheck(code == ZARVO_OK && found == ZARVO_ROOT);
    } else if (expected == items.end()) {
        FuzzCheck(code == ZARVO_ERROR_NOT_FOUND && found == ZARVO_NO_ITEM);
    } else {
        FuzzCheck(code == ZARVO_OK);
        if (expected->second == kImplied)
            FuzzCheck(found >= zarvo_entry_count(archive) && found < zarvo_item_count(archive));
        else
            FuzzCheck(found == expected->second);
    }
}

// Adds the paths of all items below a folder. Siblings are in the order of their places: an entry's is its number, an
// implied folder's that of the last item in it. Returns the place of the last item in the folder.
UInt64 Walk(zarvo_archive* archive, UInt64 folder, const std::string& folderPath, std::set<std::string>* met) {
    zarvo_item item = ZARVO_ITEM_INIT;
    FuzzCheck(zarvo_get_item(archive, folder, &item, nullptr) == ZARVO_OK);
    UInt64 lastPlace = kImplied;
    for (UInt64 child = item.first_child; child != ZARVO_NO_ITEM; child = item.next_sibling) {
        FuzzCheck(zarvo_get_item(archive, child, &item, nullptr) == ZARVO_OK);
        const std::string path =
            folderPath + (folderPath.empty() ? "" : "/") + std::string(item.name, item.name_length);
        FuzzCheck(met->insert(path).second && item.path_length == path.size());
        FuzzCheck((item.is_implied == 1) == (child >= zarvo_entry_count(archive)));
        const UInt64 lastInChild = Walk(archive, child, path, met);
        const UInt64 place = item.is_implied == 1 ? lastInChild : child;
        FuzzCheck(lastPlace == kImplied || place > lastPlace);
        lastPlace = place;
    }
    return lastPlace;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    constexpr UInt64 kMaxEntries = 24;
    constexpr UInt64 kMaxLength = 9;
    constexpr char kAlphabet[] = {'a', 'b', '.', '/', '\\', 'a', '/', '.'};
    FuzzInput input(data, size);
    auto drawPath = [&] {
        std::string path(static_cast<size_t>(input.TakeByteBelow(kMaxLength + 1)), '?');
        for (char& character : path)
            character = kAlphabet[input.TakeByteBelow(std::size(kAlphabet))];
        return path;
    };
    ArchiveDescription description;
    for (UInt64 count = input.TakeByteBelow(kMaxEntries + 1); count != 0; --count)
        description.entries.push_back({.path = drawPath(), .flags = input.TakeByteBelow(3) == 1 ? kFolderEntry : 0});
    const Items items = ItemsOf(description.entries);
    const std::string bytes = BuildArchive(description).bytes;

    zarvo_archive* archive = nullptr;
    FuzzCheck(zarvo_open_memory(bytes.data(), bytes.size(), nullptr, &archive, nullptr) == ZARVO_OK);
    UInt64 impliedCount = 0;
    for (const auto& [path, entry] : items) {
        CheckFind(archive, items, path);
        impliedCount += entry == kImplied ? 1 : 0;
    }
    for (UInt64 index = 0; index < description.entries.size(); ++index) {
        zarvo_entry entry = ZARVO_ENTRY_INIT;
        FuzzCheck(zarvo_get_entry(archive, index, &entry) == ZARVO_OK);
        FuzzCheck(entry.problem == ProblemOf(description.entries[index]));
        CheckNormalForm(entry.path);
        CheckFind(archive, items, entry.path);
    }
    for (int round = 0; round < 8; ++round)
        CheckFind(archive, items, drawPath());

    FuzzCheck(zarvo_item_count(archive) == description.entries.size() + impliedCount);
    std::set<std::string> met;
    Walk(archive, ZARVO_ROOT, "", &met);
    std::set<std::string> expected;
    for (const auto& [path, entry] : items)
        expected.insert(path);
    FuzzCheck(met == expected);
    zarvo_close(archive);
    return 0;
}
